// Options that several commands share, and what is checked of them before the work begins.
#pragma once

#include <CLI/CLI.hpp>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "cli/audio_source.h"
#include "cli/detect.h"
#include "cli/report.h"

namespace orvalis::cli {

/// Refuses numbers out of a range, and what is no number.
CLI::Validator from_to(int min, int max);
CLI::Validator from_to(double min, double max);

/// Refuses all but some words.
CLI::Validator one_of(std::vector<std::string> words);

/// Refuses an empty name.
CLI::Validator not_empty();

/// Adds the inputs.
void add_files_option(CLI::App &command, std::vector<std::string> &files);

/// Adds --channel, --raw, --rate, --channels and --partial. Returns the first of them.
CLI::Option *add_audio_options(
    CLI::App &command, AudioSettings &settings,
    const std::string &channel_text = "Channel to process, from 1 (default: the mean)");

/// Adds --quiet.
void add_quiet_option(CLI::App &command, Console &console);

/// Adds --jobs.
CLI::Option *add_jobs_option(CLI::App &command, std::size_t &jobs);

/// Adds the option of that name that selects a report. `format` holds the default.
void add_report_option(CLI::App &command, const std::string &option, std::string &format);

/// Adds an option that takes a time, as 200ms, 0.2s or 200. `ms` holds the default.
CLI::Option *add_time_option(CLI::App &command, const std::string &option, std::int32_t &ms,
                             const std::string &text);

/// Adds --pad-before and --pad-after. `what` they pad is a word for the help.
std::vector<CLI::Option *> add_padding_options(CLI::App &command, UtteranceSettings &settings,
                                               const std::string &what);

/// The options of the channel-energy detector that have no meaning for single frames.
struct UtteranceOptions {
  std::vector<CLI::Option *> all;
  CLI::Option *split;  ///< One of them
};

/// Adds --hangover, the padding, --content-type, --lead-in, --no-lead-in and --split.
UtteranceOptions add_utterance_options(CLI::App &command, DetectorSettings &settings);

// The functions below throw CLI::ValidationError.

/// Refuses standard input if it is named twice: it can be read only once.
void check_inputs(const std::vector<std::string> &inputs);

/// The report that `option` selects, on some inputs. Refuses a format that cannot describe as many.
std::unique_ptr<Report> make_report(const std::string &format, const std::string &option,
                                    std::size_t inputs, Console &console);

/// Creates the folder for --split, if it is given. Refuses inputs whose parts would have the same
/// names.
void prepare_split(const SplitSettings &split, const std::vector<std::string> &inputs);

/// Creates the folder that an option names, or throws std::runtime_error.
void make_folder(const std::string &option, const std::string &folder);

}  // namespace orvalis::cli
