#include "cli/enhancement.h"

#include <fmt/format.h>

#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "cli/audio_output.h"
#include "cli/audio_source.h"
#include "cli/clipping_meter.h"
#include "cli/level_stage.h"
#include "cli/rate_stage.h"

namespace orvalis::cli {
namespace {

constexpr int kEngineRate = 16000;

struct Findings {
  Occurrences clipped_in, loud_frames, clipped_out;
};

void refuse_unclear_channels(const AudioSource &source, const EnhancementSettings &settings) {
  const int channels = source.source_channels();
  if (channels == 1 || settings.audio.pair || settings.audio.channel > 0 || settings.mix) return;
  throw AudioError(
      fmt::format("there are {} channels: average them with --mix, or pick one with "
                  "--channel N{}",
                  channels, settings.denoise ? ", or clean two microphones with --mics 2" : ""));
}

double seconds(std::int64_t samples) { return static_cast<double>(samples) / kEngineRate; }

void tell_findings(const Findings &found, const std::function<void(const std::string &)> &tell) {
  const auto tell_clipped = [&](const Occurrences &clipped, const char *where) {
    if (clipped.count > 0)
      tell(fmt::format("samples of the {} at full scale: {}, the first at {:.3f} s", where,
                       clipped.count, seconds(clipped.first)));
  };
  tell_clipped(found.clipped_in, "input");
  if (found.loud_frames.count > 0)
    tell(fmt::format("loud for {:.2f} s, first at {:.2f} s",
                     static_cast<double>(found.loud_frames.count) / 100,
                     seconds(found.loud_frames.first)));
  tell_clipped(found.clipped_out, "output");
}

}  // namespace

void enhance(const std::string &input, const PlannedOutput &output,
             const EnhancementSettings &settings, Report &report,
             const std::function<void(const std::string &)> &tell, const Advanced &advanced) {
  const auto began = Progress::Clock::now();
  AudioSource source(input, settings.audio);
  refuse_unclear_channels(source, settings);
  const int own_rate = source.source_rate_hz();
  const int rate = settings.keep_rate ? own_rate : kEngineRate;
  const auto file = open_audio_output(output.name, output.format, rate, settings.replace);
  if (rate != own_rate)
    tell(fmt::format("written at {} Hz, converted from {} Hz (--keep-rate converts back)", rate,
                     own_rate));

  Findings found;
  Chain chain;
  if (settings.level)
    chain.add(std::make_unique<ClippingMeter>(settings.audio.pair ? 2 : 1, found.clipped_in));
  if (settings.denoise) chain.add(std::make_unique<DenoiseStage>(settings.noise));
  if (settings.level) {
    chain.add(std::make_unique<LevelStage>(found.loud_frames));
    chain.add(std::make_unique<ClippingMeter>(1, found.clipped_out));
  }
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
  tell_findings(found, tell);
}

}  // namespace orvalis::cli
