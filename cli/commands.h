// The tool's commands.
#pragma once

#include <CLI/CLI.hpp>

#include "cli/console.h"

namespace orvalis::cli {

/// One run of the tool.
struct Run {
  Console console;
  int exit_status = 0;
};

/// Each adds commands to `app`. To parse a command line that names one of them is to run it; `run`
/// has to exist until then.
void add_detect_commands(CLI::App &app, Run &run);   // epd, vad
void add_enhance_commands(CLI::App &app, Run &run);  // denoise, level, process
void add_query_commands(CLI::App &app, Run &run);    // energy, spectrum

}  // namespace orvalis::cli
