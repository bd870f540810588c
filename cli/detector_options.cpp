#include "cli/detector_options.h"

#include <fmt/format.h>
#include <unistd.h>

#include <cerrno>
#include <filesystem>
#include <limits>
#include <stdexcept>
#include <system_error>

#include "cli/audio_options.h"
#include "cli/label_reports.h"
#include "cli/split_names.h"

namespace orvalis::cli {

CLI::Validator not_empty() {
  return {
      [](const std::string &text) { return std::string(text.empty() ? "the name is empty" : ""); },
      ""};
}

CLI::Option *add_time_option(CLI::App &command, const std::string &option, std::int32_t &ms,
                             const std::string &text) {
  return command.add_option(option, ms, text)
      ->check(from_to(0, 3600 * 1000))
      ->type_name("MS")
      ->capture_default_str();
}

UtteranceOptions add_detector_options(CLI::App &command, UtteranceSettings &detector,
                                      SplitSettings &split) {
  UtteranceOptions options;
  options.all = {add_time_option(command, "--hangover", detector.hangover_ms,
                                 "Longest silence that joins what is before and after it"),
                 add_time_option(command, "--pad-before", detector.pad_before_ms,
                                 "Time to add before an utterance"),
                 add_time_option(command, "--pad-after", detector.pad_after_ms,
                                 "Time to add after an utterance")};

  command
      .add_option("--content-type", detector.content_type,
                  "Timing: 0 or 1; 2 and more are quicker\nand refuse short sounds")
      ->check(from_to(0, std::numeric_limits<int>::max()))
      ->type_name("N")
      ->capture_default_str();
  auto *lead_in = command.add_flag_callback(
      "--lead-in", [&detector] { detector.lead_in = 1; },
      "Learn the noise of the first 10 s before they are\njudged, so that a first word counts "
      "(the default,\nbut not of --raw -)");
  auto *no_lead_in = command
                         .add_flag_callback(
                             "--no-lead-in", [&detector] { detector.lead_in = 0; },
                             "Judge audio as it comes; speech is not found in\nits first 0.4 s")
                         ->excludes(lead_in);
  detector.lead_in = 1;
  command.parse_complete_callback([&command, &detector, lead_in, no_lead_in] {
    const bool is_told = lead_in->count() + no_lead_in->count() > 0;
    if (!is_told && command.count("--raw") > 0) detector.lead_in = kLeadInForFiles;
  });
  options.split = command
                      .add_option("--split", split.folder,
                                  "Write each utterance to a WAV file of its\nown in this folder")
                      ->check(not_empty())
                      ->type_name("DIR");
  options.all.push_back(options.split);
  return options;
}

void add_report_option(CLI::App &command, const std::string &option, std::string &format) {
  command.add_option(option, format, "table, json, csv, labels, textgrid or rttm")
      ->check(CLI::IsMember({"table", "json", "csv", "labels", "textgrid", "rttm"}).description(""))
      ->type_name("NAME")
      ->capture_default_str();
}

std::unique_ptr<Report> make_report(const std::string &format, const std::string &option,
                                    std::size_t inputs) {
  if (format == "json") return make_json_report();
  if (format == "csv") return make_csv_report();
  if (format == "rttm") return make_rttm_report();
  if (format == "table") return make_table_report(inputs > 1);
  if (inputs > 1)
    throw CLI::ValidationError(option, format + " describes one file, but several are given");
  return format == "labels" ? make_labels_report() : make_textgrid_report();
}

std::string trace_format(const CLI::App &command, const std::string &picked) {
  if (command.get_option("--format")->count() == 0) return "csv";
  if (picked == "csv" || picked == "json") return picked;
  throw CLI::ValidationError("--trace",
                             "the format " + picked + " holds no trace; use csv or json");
}

void prepare_split(const SplitSettings &split, const std::vector<std::string> &inputs) {
  if (split.folder.empty()) return;
  if (const std::string pair = same_parts(inputs); !pair.empty())
    throw CLI::ValidationError("--split", pair + " would give files of the same names");
  make_folder("--split", split.folder);
}

void make_folder(const std::string &option, const std::string &folder) {
  std::error_code error;
  std::filesystem::create_directories(folder, error);
  if (!error && access(folder.c_str(), W_OK) != 0) error = {errno, std::generic_category()};
  if (error) throw std::runtime_error(fmt::format("{} {}: {}", option, folder, error.message()));
}

}  // namespace orvalis::cli
