// What the tool says about its own use: help, and what is wrong with a command line.
#pragma once

#include <CLI/CLI.hpp>
#include <string>

#include "cli/commands.h"

namespace orvalis::cli {

/// Lays out the help of `app` and of the commands that are added to it later.
void set_help_format(CLI::App &app);

/// Adds the command help, which shows what --help does, and what all commands share.
void add_help_command(CLI::App &app, Run &run);

/// The line for a command line that `app` refused, and where to read more.
std::string usage_error(const CLI::App &app, const CLI::Error &error);

}  // namespace orvalis::cli
