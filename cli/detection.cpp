#include "cli/detection.h"

#include <MCRAvad.h>

#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "cli/audio_source.h"
#include "cli/excerpts.h"

namespace orvalis::cli {
namespace {

/// The hangover that joins what silence shorter than `min_silence_ms` cuts. It counts the frame of
/// speech that ends the silence, and silence comes in whole frames.
std::int32_t hangover_ms(std::int32_t min_silence_ms, int rate_hz) {
  const std::int32_t frame_ms = 1000 * MCRA_FRAME_SAMPLES / rate_hz;
  return (min_silence_ms + frame_ms - 1) / frame_ms * frame_ms;
}

}  // namespace

void detect(const std::string &name, const DetectionSettings &settings, Report &report,
            const Advanced &advanced) {
  const auto began = Progress::Clock::now();
  AudioSource source(name, settings.audio);
  UtteranceSettings detector = settings.detector;
  detector.rate_hz = source.rate_hz();
  if (detector.detector == UTTERANCE_MCRA) {
    detector.mcra = &settings.mcra;
    detector.hangover_ms = hangover_ms(settings.min_silence_ms, detector.rate_hz);
  }

  report.begin_file(name, source.rate_hz());
  std::unique_ptr<Excerpts> excerpts;
  if (!settings.split.folder.empty())
    excerpts = make_excerpts(name, settings.audio, source.rate_hz());
  DetectorStage stage(name, detector, settings.split, std::move(excerpts), report,
                      settings.reported);
  std::vector<std::int16_t> passed;
  for (auto piece = source.read(); !piece.empty(); piece = source.read()) {
    passed.clear();
    stage.push(piece, passed);
    advanced(advance_of(name, source, began));
  }
  stage.flush(passed);
  report.end_file(source.samples_read());
  // Last, so that a damaged file still gives what could be decided.
  source.check_complete();
}

}  // namespace orvalis::cli
