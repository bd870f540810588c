// orvalis: the voice front end on the command line.
#include <fcntl.h>
#include <fmt/format.h>
#include <orvalis.h>
#include <unistd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <exception>
#include <new>
#include <string>
#include <string_view>
#include <system_error>

#include "cli/commands.h"
#include "cli/signals.h"
#include "cli/usage.h"

namespace {

constexpr int kFailed = 1;
constexpr int kWrongUsage = 2;

std::string version() {
  return fmt::format("orvalis {}\nlibrary {}", ORVALIS_TOOL_VERSION, GetVersion());
}

int parse_and_run(int argc, char **argv, orvalis::cli::Run &run) {
  CLI::App app(
      "The Orvalis voice front end: finds speech in audio, suppresses its noise, levels it.",
      "orvalis");
  app.require_subcommand(1);
  app.set_version_flag("--version", version());
  app.failure_message([&app](const CLI::App *, const CLI::Error &error) {
    return orvalis::cli::usage_error(app, error);
  });
  orvalis::cli::set_help_format(app);
  app.footer(
      "Examples:\n"
      "  orvalis epd meeting.wav                 the utterances of a recording\n"
      "  orvalis vad meeting.wav                 the same with another detector\n"
      "  orvalis denoise meeting.wav clean.wav   the recording without its noise\n"
      "  orvalis process meeting.wav out.wav     the recording denoised and levelled\n"
      "  orvalis energy meeting.wav              how loud each 20 ms of it are\n"
      "  orvalis help denoise                    the options of the command denoise\n"
      "  orvalis help input                      what all commands read, and the exit status");
  orvalis::cli::add_detect_commands(app, run);
  orvalis::cli::add_enhance_commands(app, run);
  orvalis::cli::add_query_commands(app, run);
  app.add_subcommand("version", "Print the versions of the tool and of the library")
      ->callback([&run] { run.console.print_line(version()); });
  orvalis::cli::add_help_command(app, run);
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError &error) {
    // Help and version come as errors, too, with code 0.
    return app.exit(error) == 0 ? 0 : kWrongUsage;
  }
  return run.exit_status;
}

/// Keeps descriptors 0 to 2 occupied: if one is closed, the first file that is opened would get it,
/// and with it what is printed.
void occupy_standard_streams() {
  int descriptor = open("/dev/null", O_RDONLY);
  while (descriptor >= 0 && descriptor <= STDERR_FILENO) descriptor = open("/dev/null", O_RDONLY);
  if (descriptor >= 0) close(descriptor);
}

/// Memory may run out where nothing catches it, as in what a library prepares before main.
struct OutOfMemoryIsAnError {
  OutOfMemoryIsAnError() {
    std::set_terminate([] {
      try {
        if (const auto exception = std::current_exception()) std::rethrow_exception(exception);
      } catch (const std::bad_alloc &) {
        constexpr std::string_view kText = "orvalis: out of memory\n";
        // There is nobody to tell if this fails.
        [[maybe_unused]] const auto written = write(STDERR_FILENO, kText.data(), kText.size());
        _exit(kFailed);
      } catch (...) {
      }
      std::abort();
    });
  }
};
[[gnu::init_priority(101)]] const OutOfMemoryIsAnError out_of_memory_is_an_error;

}  // namespace

int main(int argc, char **argv) {
  occupy_standard_streams();
  // When a reader has gone, or a file reaches its size limit, the write fails instead of the
  // process.
  std::signal(SIGPIPE, SIG_IGN);
  std::signal(SIGXFSZ, SIG_IGN);
  orvalis::cli::watch_signals();
  orvalis::cli::Run run;
  try {
    return parse_and_run(argc, argv, run);
  } catch (const std::system_error &error) {
    if (error.code() != std::errc::broken_pipe) run.console.print_error(error.what());
  } catch (const std::bad_alloc &) {
    run.console.print_error("out of memory");
  } catch (const std::exception &error) {
    run.console.print_error(error.what());
  }
  return kFailed;
}
