// `orvalis energy` and `orvalis spectrum`: the queries of the library over the time of a file.
#include <fmt/format.h>
#include <fmt/ranges.h>
#include <orvalis.h>

#include <algorithm>
#include <memory>
#include <nlohmann/json.hpp>
#include <span>
#include <string>
#include <vector>

#include "cli/audio_source.h"
#include "cli/commands.h"
#include "cli/detect.h"
#include "cli/jobs.h"
#include "cli/options.h"

namespace orvalis::cli {
namespace {

/// One query, and the blocks of audio that it is applied to.
struct Query {
  const char *name;
  const char *summary;
  const char *notes;
  int blocks_per_second;
  const char *json_field;
  std::vector<std::int32_t> (*values)(std::span<const std::int16_t> block, int rate_hz);
  std::vector<std::string> (*columns)(int rate_hz);
};

std::vector<std::int32_t> energy_of(std::span<const std::int16_t> block, int) {
  return {computeEnergy(block.data(), static_cast<std::int32_t>(block.size()))};
}

std::vector<std::int32_t> spectrum_of(std::span<const std::int16_t> block, int rate_hz) {
  std::vector<std::int32_t> bins(rate_hz == 16000 ? ORVALIS_BINS_16K : ORVALIS_BINS_8K);
  getSpectrum(block.data(), bins.data(), rate_hz);
  return bins;
}

std::vector<std::string> energy_columns(int) { return {"energy"}; }

std::vector<std::string> spectrum_columns(int rate_hz) {
  std::vector<std::string> names(rate_hz == 16000 ? ORVALIS_BINS_16K : ORVALIS_BINS_8K);
  for (std::size_t i = 0; i < names.size(); ++i) names[i] = fmt::format("bin{}", i);
  return names;
}

constexpr Query kEnergy = {
    "energy",
    "Print the energy of each 20 ms of a file",
    "A line for each whole block: where it starts in seconds, and its energy in whole dB\n"
    "with its mean removed, 0 for silence and 90 for a square wave of full scale.\n\n"
    "Examples:\n"
    "  orvalis energy take.wav >take.csv\n"
    "  orvalis energy --format json take.wav",
    50,
    "energy",
    energy_of,
    energy_columns};

constexpr Query kSpectrum = {
    "spectrum",
    "Print the power spectrum of each 10 ms of a file",
    "A line for each whole frame: where it starts in seconds, and the power of 128 bins at\n"
    "16 kHz or 64 at 8 kHz. A bin is 2 re^2 + 2 im^2 of a transform over sample pairs, even\n"
    "samples real and odd ones imaginary, without a window.\n\n"
    "Examples:\n"
    "  orvalis spectrum take.wav >take.csv\n"
    "  orvalis spectrum --format json take.wav",
    100,
    "power",
    spectrum_of,
    spectrum_columns};

struct QueryOptions {
  std::string file;
  std::string format = "csv";
  AudioSettings audio;
};

/// Calls `process` for each whole block of `length` samples.
template <class Process>
void for_each_block(Job &job, AudioSource &source, std::size_t length, Process process) {
  std::vector<std::int16_t> block;
  for (auto chunk = source.read(); !chunk.empty(); chunk = source.read()) {
    while (!chunk.empty()) {
      const auto part = chunk.first(std::min(chunk.size(), length - block.size()));
      block.insert(block.end(), part.begin(), part.end());
      chunk = chunk.subspan(part.size());
      if (block.size() < length) continue;
      process(std::span<const std::int16_t>(block));
      block.clear();
    }
    job.show_progress(source.seconds_read(), source.length_seconds());
  }
}

void print_query(const Query &query, const QueryOptions &options, Job &job, Console &console) {
  AudioSource source = open_source(job, options.audio);
  const int rate_hz = source.rate_hz();
  const bool json = options.format == "json";
  if (!json) console.print_line(fmt::format("start,{}", fmt::join(query.columns(rate_hz), ",")));
  std::int64_t number = 0;
  for_each_block(
      job, source, static_cast<std::size_t>(rate_hz / query.blocks_per_second),
      [&](std::span<const std::int16_t> block) {
        const double start = static_cast<double>(number++) / query.blocks_per_second;
        const auto values = query.values(block, rate_hz);
        if (!json) {
          console.print_line(fmt::format("{:.2f},{}", start, fmt::join(values, ",")));
        } else if (values.size() == 1) {
          console.print_line(
              nlohmann::ordered_json{{"start", start}, {query.json_field, values[0]}}.dump());
        } else {
          console.print_line(
              nlohmann::ordered_json{{"start", start}, {query.json_field, values}}.dump());
        }
      });
  check_complete(job, source);
}

void add_query(CLI::App &app, const Query &query, Run &run) {
  const auto options = std::make_shared<QueryOptions>();
  CLI::App *command = app.add_subcommand(query.name, query.summary);
  command->footer(query.notes);
  command->add_option("FILE", options->file, "Audio file; \"-\" is standard input")
      ->required()
      ->type_name("");
  command->add_option("-f,--format", options->format, "csv, or json (one object per line)")
      ->check(one_of({"csv", "json"}))
      ->type_name("NAME")
      ->capture_default_str();
  add_quiet_option(*command, run.console);
  add_audio_options(*command, options->audio);
  command->callback([options, &query, &run] {
    run.exit_status = process_files({options->file}, 1, run.console, [&](Job &job) {
      print_query(query, *options, job, run.console);
    });
  });
}

}  // namespace

void add_query_commands(CLI::App &app, Run &run) {
  add_query(app, kEnergy, run);
  add_query(app, kSpectrum, run);
}

}  // namespace orvalis::cli
