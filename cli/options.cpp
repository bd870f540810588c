#include "cli/options.h"

#include <fmt/format.h>
#include <fmt/ranges.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cmath>
#include <filesystem>
#include <limits>
#include <optional>
#include <stdexcept>
#include <string_view>
#include <system_error>
#include <utility>

namespace orvalis::cli {
namespace {

constexpr std::int32_t kMaxTimeMs = 3600 * 1000;

/// Milliseconds of 200ms, 0.2s or 200; none for anything else.
std::optional<std::int32_t> milliseconds(std::string_view text) {
  double factor = 1;
  if (text.ends_with("ms")) {
    text.remove_suffix(2);
  } else if (text.ends_with('s')) {
    text.remove_suffix(1);
    factor = 1000;
  }
  double value = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  const double ms = value * factor;
  if (error != std::errc() || end != text.data() + text.size() || !(ms >= 0 && ms <= kMaxTimeMs))
    return std::nullopt;
  const auto whole = static_cast<std::int32_t>(std::lround(ms));
  if (std::abs(ms - whole) > 1e-6) return std::nullopt;
  return whole;
}

/// Puts milliseconds in the place of a time.
CLI::Validator time() {
  return {[](std::string &text) {
            const auto ms = milliseconds(text);
            if (!ms)
              return fmt::format(
                  "\"{}\" is not a time from 0 to {} s in whole milliseconds, such as 200ms, 0.2s "
                  "or 200",
                  text, kMaxTimeMs / 1000);
            text = std::to_string(*ms);
            return std::string();
          },
          ""};
}

template <class Number>
CLI::Validator number_from_to(const char *kind, Number min, Number max) {
  return {[=](const std::string &text) {
            Number value{};
            const auto [end, error] =
                std::from_chars(text.data(), text.data() + text.size(), value);
            if (error == std::errc() && end == text.data() + text.size() && value >= min &&
                value <= max)
              return std::string();
            return fmt::format("\"{}\" is not a {} from {} to {}", text, kind, min, max);
          },
          ""};
}

}  // namespace

CLI::Validator from_to(int min, int max) { return number_from_to("whole number", min, max); }

CLI::Validator from_to(double min, double max) { return number_from_to("number", min, max); }

CLI::Validator one_of(std::vector<std::string> words) {
  return {[words = std::move(words)](const std::string &text) {
            return std::ranges::count(words, text) > 0
                       ? std::string()
                       : fmt::format("\"{}\" is none of {}", text, fmt::join(words, ", "));
          },
          ""};
}

CLI::Validator not_empty() {
  return {
      [](const std::string &text) { return std::string(text.empty() ? "the name is empty" : ""); },
      ""};
}

void add_files_option(CLI::App &command, std::vector<std::string> &files) {
  command.add_option("FILE", files, "Audio files; \"-\" is standard input")
      ->required()
      ->type_name("");
}

CLI::Option *add_audio_options(CLI::App &command, AudioSettings &settings,
                               const std::string &channel_text) {
  const CLI::Validator channels = from_to(1, 1024);  // libsndfile's limit
  auto *channel = command.add_option("--channel", settings.channel, channel_text)
                      ->check(channels)
                      ->type_name("N");
  auto *raw =
      command.add_flag("--raw", settings.raw, "Input is 16-bit little-endian without a header");
  command.add_option("--rate", settings.raw_rate_hz, "Rate of raw input")
      ->check(from_to(1000, 1000000))
      ->type_name("HZ")
      ->capture_default_str()
      ->needs(raw);
  command.add_option("--channels", settings.raw_channels, "Interleaved channels of raw input")
      ->check(channels)
      ->type_name("N")
      ->capture_default_str()
      ->needs(raw);
  command.add_flag("--partial", settings.partial, "Take what there is of input that is cut short");
  return channel;
}

void add_quiet_option(CLI::App &command, Console &console) {
  command.add_flag_callback(
      "-q,--quiet", [&console] { console.be_quiet(); }, "Print errors, but no notes or progress");
}

CLI::Option *add_jobs_option(CLI::App &command, std::size_t &jobs) {
  return command.add_option("-j,--jobs", jobs, "Number of files to process at once")
      ->check(from_to(1, 256))
      ->type_name("N")
      ->capture_default_str();
}

void add_report_option(CLI::App &command, const std::string &option, std::string &format) {
  std::vector<std::string> names;
  for (const ReportFormat &known : report_formats()) names.push_back(known.name);
  command.add_option(option, format, fmt::format("{}", fmt::join(names, ", ")))
      ->check(one_of(names))
      ->type_name("NAME")
      ->capture_default_str();
}

CLI::Option *add_time_option(CLI::App &command, const std::string &option, std::int32_t &ms,
                             const std::string &text) {
  return command.add_option(option, ms, text)
      ->transform(time())
      ->type_name("TIME")
      ->default_str(fmt::format("{}ms", ms));
}

std::vector<CLI::Option *> add_padding_options(CLI::App &command, UtteranceSettings &settings,
                                               const std::string &what) {
  return {add_time_option(command, "--pad-before", settings.pad_before_ms,
                          "Time to add before each " + what),
          add_time_option(command, "--pad-after", settings.pad_after_ms,
                          "Time to add after each " + what)};
}

UtteranceOptions add_utterance_options(CLI::App &command, DetectorSettings &settings) {
  UtteranceOptions options;
  options.all = {add_time_option(command, "--hangover", settings.stream.hangover_ms,
                                 "Longest silence that does not end an utterance")};
  for (CLI::Option *padding : add_padding_options(command, settings.stream, "utterance"))
    options.all.push_back(padding);

  command
      .add_option("--content-type", settings.stream.content_type,
                  "Timing: 0 or 1; 2 and more decide sooner, but\nignore short sounds")
      ->check(from_to(0, std::numeric_limits<int>::max()))
      ->type_name("N")
      ->capture_default_str();
  settings.lead_in = LeadIn::kAlways;
  auto *lead_in = command.add_flag_callback(
      "--lead-in", [&settings] { settings.lead_in = LeadIn::kAlways; },
      "Learn the noise from the first 10 s before they\nare judged, so that a first word counts "
      "(the\ndefault, except for --raw -)");
  auto *no_lead_in = command
                         .add_flag_callback(
                             "--no-lead-in", [&settings] { settings.lead_in = LeadIn::kNever; },
                             "Judge audio as it comes; in its first 0.4 s no\nspeech is found")
                         ->excludes(lead_in);
  command.parse_complete_callback([&command, &settings, lead_in, no_lead_in] {
    const bool is_given = lead_in->count() + no_lead_in->count() > 0;
    // Raw standard input is live audio as a rule.
    if (!is_given && command.count("--raw") > 0) settings.lead_in = LeadIn::kNotOfStandardInput;
  });
  options.split = command
                      .add_option("--split", settings.split.folder,
                                  "Write each utterance to a WAV file of its own in\nthis folder")
                      ->check(not_empty())
                      ->type_name("DIR");
  options.all.push_back(options.split);
  return options;
}

void check_inputs(const std::vector<std::string> &inputs) {
  if (std::ranges::count(inputs, "-") > 1)
    throw CLI::ValidationError("FILE", "standard input can be read only once");
}

std::unique_ptr<Report> make_report(const std::string &format, const std::string &option,
                                    std::size_t inputs, Console &console) {
  const auto known = std::ranges::find(report_formats(), format, &ReportFormat::name);
  if (inputs > 1 && !known->several_files)
    throw CLI::ValidationError(option, format + " describes one file, but several are given");
  return known->make(console, inputs > 1);
}

void prepare_split(const SplitSettings &split, const std::vector<std::string> &inputs) {
  if (split.folder.empty()) return;
  if (const std::string pair = same_parts(inputs); !pair.empty())
    throw CLI::ValidationError("--split", pair + " would have parts of the same names");
  make_folder("--split", split.folder);
  remove_leftovers(split.folder);
}

void make_folder(const std::string &option, const std::string &folder) {
  std::error_code error;
  std::filesystem::create_directories(folder, error);
  if (!error && access(folder.c_str(), W_OK) != 0) error = {errno, std::generic_category()};
  if (error) throw std::runtime_error(fmt::format("{} {}: {}", option, folder, error.message()));
}

}  // namespace orvalis::cli
