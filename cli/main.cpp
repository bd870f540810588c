// orvalis: the voice front end on the command line.
#include <fmt/format.h>
#include <orvalis.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <csignal>
#include <string>
#include <system_error>

#include "cli/epd_command.h"
#include "cli/query_commands.h"
#include "cli/report.h"

namespace {

constexpr int kFailed = 1;
constexpr int kWrongUsage = 2;

std::string version() {
  return fmt::format("orvalis {}\nlibrary {}", ORVALIS_TOOL_VERSION, GetVersion());
}

int run(int argc, char **argv) {
  int exit_status = 0;
  CLI::App app("Finds where people speak in audio: end-point detection with the Orvalis library.",
               "orvalis");
  app.require_subcommand(1);
  app.set_version_flag("--version", version());
  app.failure_message([](const CLI::App *, const CLI::Error &error) {
    return fmt::format("orvalis: {}\nRun orvalis with --help for more.\n", error.what());
  });
  app.footer(
      "Examples:\n"
      "  orvalis epd meeting.wav      the utterances of a recording\n"
      "  orvalis energy meeting.wav   how loud every 20 ms of it are\n"
      "  orvalis epd --help           all about the command epd");
  orvalis::cli::add_epd_command(app, exit_status);
  orvalis::cli::add_query_commands(app, exit_status);
  app.add_subcommand("version", "Print the versions of the tool and of the library")->callback([] {
    orvalis::cli::print_line(version());
  });
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError &error) {
    // Help and the version arrive here too, as errors of code 0.
    return app.exit(error) == 0 ? 0 : kWrongUsage;
  }
  return exit_status;
}

}  // namespace

int main(int argc, char **argv) {
  // A reader that leaves is met where the write fails, not by the end of the process.
  std::signal(SIGPIPE, SIG_IGN);
  // So is a limit on the size of files.
  std::signal(SIGXFSZ, SIG_IGN);
  try {
    return run(argc, argv);
  } catch (const std::system_error &error) {
    if (error.code() != std::errc::broken_pipe) orvalis::cli::print_error(error.what());
  } catch (const std::exception &error) {
    orvalis::cli::print_error(error.what());
  }
  return kFailed;
}
