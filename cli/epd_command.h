// `orvalis epd`: the utterances of each file.
#pragma once

#include <CLI/CLI.hpp>

namespace orvalis::cli {

/// Adds the command to `app`. Parsing a line that names it runs it and sets `exit_status`.
void add_epd_command(CLI::App &app, int &exit_status);

}  // namespace orvalis::cli
