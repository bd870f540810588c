// `orvalis denoise`, `orvalis level` and `orvalis process`: audio in, better audio out.
#pragma once

#include <CLI/CLI.hpp>

namespace orvalis::cli {

/// Adds the commands to `app`. Parsing a line that names one runs it and sets `exit_status`.
void add_enhance_commands(CLI::App &app, int &exit_status);

}  // namespace orvalis::cli
