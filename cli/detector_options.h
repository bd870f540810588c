// The options of commands that look for utterances: the detector's timing, the report, the files.
#pragma once

#include <utterance_stream.h>

#include <CLI/CLI.hpp>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "cli/detector_stage.h"
#include "cli/report.h"

namespace orvalis::cli {

/// Those that a single frame's answer does not know, and among them --split.
struct UtteranceOptions {
  std::vector<CLI::Option *> all;
  CLI::Option *split;
};

/// Adds an option in milliseconds, of which `ms` holds the default.
CLI::Option *add_time_option(CLI::App &command, const std::string &option, std::int32_t &ms,
                             const std::string &text);

/// Adds --hangover, --pad-before, --pad-after, --content-type, --lead-in and --split.
UtteranceOptions add_detector_options(CLI::App &command, UtteranceSettings &detector,
                                      SplitSettings &split);

/// Adds the option of that name with which the user picks a report. `format` holds the default.
void add_report_option(CLI::App &command, const std::string &option, std::string &format);

/// The report of that format on some inputs. Throws CLI::ValidationError, in the name of `option`,
/// if it cannot describe as many.
std::unique_ptr<Report> make_report(const std::string &format, const std::string &option,
                                    std::size_t inputs);

/// The format of a trace: csv, unless the user has picked one by --format. Throws
/// CLI::ValidationError for one that holds no frames.
std::string trace_format(const CLI::App &command, const std::string &picked);

/// Refuses an empty name.
CLI::Validator not_empty();

/// Makes the folder for the utterances' files, before the work begins. Throws CLI::ValidationError
/// if inputs would give files of the same names.
void prepare_split(const SplitSettings &split, const std::vector<std::string> &inputs);

/// Makes the folder that an option names, or throws.
void make_folder(const std::string &option, const std::string &folder);

}  // namespace orvalis::cli
