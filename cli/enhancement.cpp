#include "cli/enhancement.h"

#include <fmt/format.h>

#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "cli/audio_output.h"
#include "cli/audio_source.h"
#include "cli/enhancement_stage.h"
#include "cli/rate_stage.h"

namespace orvalis::cli {
namespace {

constexpr int kEngineRate = 16000;

void refuse_unclear_channels(const AudioSource &source, const PathSettings &settings) {
  const int channels = source.source_channels();
  if (channels == 1 || settings.audio.pair || settings.audio.channel > 0 || settings.mix) return;
  throw AudioError(fmt::format(
      "there are {} channels: average them with --mix, or pick one with "
      "--channel N{}",
      channels,
      settings.enhancement.suppression_db > 0 ? ", or clean two microphones with --mics 2" : ""));
}

double seconds(std::int64_t samples) { return static_cast<double>(samples) / kEngineRate; }

void tell_counts(const EnhancementCounts &counts,
                 const std::function<void(const std::string &)> &tell) {
  const auto tell_clipped = [&](const EnhancementCount &clipped, const char *where) {
    if (clipped.count > 0)
      tell(fmt::format("samples of the {} at full scale: {}, the first at {:.3f} s", where,
                       clipped.count, seconds(clipped.first)));
  };
  tell_clipped(counts.clipped_in, "input");
  if (counts.loud_frames.count > 0)
    tell(fmt::format("loud for {:.2f} s, first at {:.2f} s",
                     static_cast<double>(counts.loud_frames.count) / 100,
                     seconds(counts.loud_frames.first)));
  tell_clipped(counts.clipped_out, "output");
}

}  // namespace

void enhance(const std::string &input, const PlannedOutput &output, const PathSettings &settings,
             Report &report, const std::function<void(const std::string &)> &tell,
             const Advanced &advanced) {
  const auto began = Progress::Clock::now();
  AudioSource source(input, settings.audio);
  refuse_unclear_channels(source, settings);
  const int own_rate = source.source_rate_hz();
  const int rate = settings.keep_rate ? own_rate : kEngineRate;
  const auto file = open_audio_output(output.name, output.format, rate, settings.replace);
  if (rate != own_rate)
    tell(fmt::format("written at {} Hz, converted from {} Hz (--keep-rate converts back)", rate,
                     own_rate));

  Chain chain;
  auto stage = std::make_unique<EnhancementStage>(settings.enhancement);
  const EnhancementStage &enhancement = *stage;
  chain.add(std::move(stage));
  if (settings.detect) {
    auto excerpts = settings.split.folder.empty() ? nullptr : make_heard_excerpts(kEngineRate);
    chain.add(std::make_unique<DetectorStage>(input, settings.detector, settings.split,
                                              std::move(excerpts), report));
    report.begin_file(input, kEngineRate);
  }
  if (rate != kEngineRate)
    chain.add(std::make_unique<RateStage>(rate, [&] { return source.source_frames_read(); }));

  std::vector<std::int16_t> processed;
  for (auto piece = source.read(); !piece.empty(); piece = source.read()) {
    processed.clear();
    chain.push(piece, processed);
    file->write(processed);
    advanced(advance_of(input, source, began));
  }
  processed.clear();
  chain.flush(processed);
  file->write(processed);
  if (settings.detect) report.end_file(source.samples_read());
  // Before the output has its name: what is made of a part must not pass for the whole.
  source.check_complete();
  file->commit();
  if (settings.enhancement.level == 1) tell_counts(enhancement.counts(), tell);
}

}  // namespace orvalis::cli
