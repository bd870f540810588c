// `orvalis vad`: the segments of speech that the MCRA detector finds in each file.
#pragma once

#include <CLI/CLI.hpp>

namespace orvalis::cli {

/// Adds the command to `app`. Parsing a line that names it runs it and sets `exit_status`.
void add_vad_command(CLI::App &app, int &exit_status);

}  // namespace orvalis::cli
