#include "cli/detector_stage.h"

#include <MCRAvad.h>
#include <orvalis.h>

#include <algorithm>
#include <cstdlib>
#include <new>
#include <utility>

#include "cli/split_names.h"

namespace orvalis::cli {
namespace {

/// Both sides of the conditions that led to a decision. Null audio is not judged and has none.
Trace trace_of(const UtteranceFrame &frame, const EpdReasons &why) {
  const auto peak = std::ranges::max(std::span(frame.pcm, static_cast<std::size_t>(frame.samples)),
                                     {}, [](int sample) { return std::abs(sample); });
  const auto number = [](auto value) { return std::int64_t{value}; };
  const auto decibels = [](std::int32_t q5) { return static_cast<float>(q5) / 32; };
  return {{"answer", number(frame.speech)},
          {"energy", number(computeEnergy(frame.pcm, frame.samples))},
          {"peak", number(std::abs(peak))},
          {"judged", number(why.judged)},
          {"voice", number(why.voice)},
          {"noise", number(why.noise)},
          {"voice_metric", number(why.voiceMetric)},
          {"voice_metric_threshold", number(why.voiceMetricThreshold)},
          {"deviation", decibels(why.spectralDeviation)},
          {"deviation_threshold", decibels(why.spectralDeviationThreshold)},
          {"channel_energy", number(why.channelEnergy)},
          {"min_channel_energy", number(why.minChannelEnergy)},
          {"gated_energy", number(why.energy)},
          {"energy_gate", number(why.energyGate)},
          {"noise_floor", why.noiseFloor},
          {"onset", number(why.onset)},
          {"onset_frames", number(why.onsetFrames)},
          {"pause", number(why.pause)},
          {"pause_frames", number(why.pauseFrames)}};
}

/// Energies and bins are those of the frame and its predecessor.
Trace trace_of(const McraReasons &why) {
  return {{"answer", std::int64_t{why.answer}},
          {"energy", why.energy},
          {"energy_threshold", why.energyThreshold},
          {"smoothed_energy", why.smoothedEnergy},
          {"smoothed_threshold", why.smoothedThreshold},
          {"minimum_energy", why.minEnergy},
          {"speech_bins", why.speechBins},
          {"speech_bins_threshold", why.speechBinsThreshold},
          {"frame_snr", why.frameSnr}};
}

}  // namespace

DetectorStage::DetectorStage(std::string name, UtteranceSettings detector, SplitSettings split,
                             std::unique_ptr<Excerpts> excerpts, Report &report, Reported reported)
    : name_(std::move(name)),
      rate_hz_(detector.rate_hz),
      split_(std::move(split)),
      excerpts_(std::move(excerpts)),
      report_(report),
      reported_(reported) {
  if (reported != Reported::kUtterances) {
    detector.on_frame = [](const UtteranceFrame *frame, void *stage) {
      static_cast<DetectorStage *>(stage)->note_frame(*frame);
    };
    detector.user = this;
  }
  if (detector.lead_in == kLeadInForFiles) detector.lead_in = name_ == "-" ? 0 : 1;
  stream_.reset(OpenUtteranceStream(&detector));
  if (!stream_) throw std::bad_alloc();
}

void DetectorStage::push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) {
  output.insert(output.end(), input.begin(), input.end());
  if (excerpts_) excerpts_->hear(input);
  while (!input.empty()) {
    const auto taken =
        PushUtteranceAudio(stream_.get(), input.data(), static_cast<std::int32_t>(input.size()));
    input = input.subspan(static_cast<std::size_t>(taken));
    report_new();
  }
}

void DetectorStage::flush(std::vector<std::int16_t> &) {
  FlushUtteranceStream(stream_.get());
  report_new();
}

void DetectorStage::note_frame(const UtteranceFrame &frame) {
  Trace trace;
  if (reported_ == Reported::kTrace) {
    trace = frame.mcra != nullptr ? trace_of(*frame.mcra) : trace_of(frame, *frame.epd);
  }
  frames_.push_back({frame.start, frame.speech, std::move(trace)});
}

void DetectorStage::report_new() {
  for (Utterance found; NextUtterance(stream_.get(), &found) == 1;) {
    if (reported_ != Reported::kUtterances) continue;
    // First, so that what is reported is there.
    if (excerpts_)
      excerpts_->write(found.start, found.end, part_name(split_.folder, name_, found.number),
                       split_.replace);
    report_.utterance(found);
  }
  if (excerpts_) excerpts_->forget_before(EarliestUtteranceStart(stream_.get()));
  for (const Frame &frame : frames_) {
    if (reported_ == Reported::kTrace) {
      const auto start_s = static_cast<double>(frame.start) / rate_hz_;
      report_.trace(frame_count_, start_s, frame.trace);
    } else {
      report_.frame(frame_count_, frame.decision);
    }
    ++frame_count_;
  }
  frames_.clear();
}

}  // namespace orvalis::cli
