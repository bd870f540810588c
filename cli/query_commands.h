// `orvalis energy` and `orvalis spectrum`: the library's queries over the time of a file.
#pragma once

#include <CLI/CLI.hpp>

namespace orvalis::cli {

/// Adds both commands to `app`. Parsing a line that names one runs it and sets `exit_status`.
void add_query_commands(CLI::App &app, int &exit_status);

}  // namespace orvalis::cli
