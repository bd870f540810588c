// orvalis: the voice front end on the command line.
#include <fcntl.h>
#include <fmt/format.h>
#include <orvalis.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <csignal>
#include <string>
#include <system_error>

#include "cli/enhance_commands.h"
#include "cli/epd_command.h"
#include "cli/query_commands.h"
#include "cli/report.h"
#include "cli/vad_command.h"

namespace {

constexpr int kFailed = 1;
constexpr int kWrongUsage = 2;

std::string version() {
  return fmt::format("orvalis {}\nlibrary {}", ORVALIS_TOOL_VERSION, GetVersion());
}

int run(int argc, char **argv) {
  int exit_status = 0;
  CLI::App app(
      "The Orvalis voice front end: finds where people speak in audio, takes noise from it,\n"
      "levels it.",
      "orvalis");
  app.require_subcommand(1);
  app.set_version_flag("--version", version());
  app.failure_message([](const CLI::App *, const CLI::Error &error) {
    return fmt::format("orvalis: {}\nRun orvalis with --help for more.\n", error.what());
  });
  app.footer(
      "Examples:\n"
      "  orvalis epd meeting.wav                 the utterances of a recording\n"
      "  orvalis vad meeting.wav                 the same by another detector\n"
      "  orvalis denoise meeting.wav clean.wav   the recording without its noise\n"
      "  orvalis process meeting.wav out.wav     all that a voice front end does to it\n"
      "  orvalis energy meeting.wav              how loud every 20 ms of it are\n"
      "  orvalis denoise --help                  all about the command denoise");
  orvalis::cli::add_epd_command(app, exit_status);
  orvalis::cli::add_vad_command(app, exit_status);
  orvalis::cli::add_enhance_commands(app, exit_status);
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

/// Else a file that is opened would take the place of a closed stream, and what is printed there.
void hold_standard_streams() {
  int descriptor = open("/dev/null", O_RDONLY);
  while (descriptor >= 0 && descriptor <= STDERR_FILENO) descriptor = open("/dev/null", O_RDONLY);
  if (descriptor >= 0) close(descriptor);
}

}  // namespace

int main(int argc, char **argv) {
  hold_standard_streams();
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
