// The options with which every command says what audio it is given.
#pragma once

#include <CLI/CLI.hpp>
#include <string>

#include "cli/audio_source.h"

namespace orvalis::cli {

/// A range without the note that CLI11 would add to the help.
CLI::Validator from_to(int least, int most);

/// Adds --channel, --raw, --rate and --channels to a command. Returns the first of them.
CLI::Option *add_audio_options(
    CLI::App &command, AudioSettings &settings,
    const std::string &channel_text = "Channel to listen to, from 1 (default: the mean)");

}  // namespace orvalis::cli
