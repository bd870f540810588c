#include "cli/enhance.h"

#include <fmt/format.h>

#include <cmath>
#include <cstdint>
#include <memory>
#include <new>
#include <optional>
#include <utility>
#include <vector>

namespace orvalis::cli {
namespace {

constexpr int kEngineRate = 16000;

/// The library's stream. Its output is as long as its input: if it is not aligned, the end is left
/// out.
class Enhancer {
public:
  explicit Enhancer(const EnhancementSettings &settings)
      : channels_(static_cast<std::size_t>(settings.microphones)),
        stream_(OpenEnhancementStream(&settings)) {
    if (!stream_) throw std::bad_alloc();
  }

  /// Takes one channel, or interleaved pairs. Appends the samples that are ready.
  void push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) {
    held_back_ += input.size() / channels_;
    const std::size_t room = input.size() / channels_ + ENHANCEMENT_HELD_BACK;
    held_back_ -= append(output, room, [&](std::int16_t *out, std::int32_t size) {
      return PushEnhancementAudio(stream_.get(), input.data(),
                                  static_cast<std::int32_t>(input.size()), out, size);
    });
  }

  /// Appends the rest.
  void flush(std::vector<std::int16_t> &output) {
    const std::size_t ready =
        append(output, ENHANCEMENT_HELD_BACK, [&](std::int16_t *out, std::int32_t size) {
          return FlushEnhancementStream(stream_.get(), out, size);
        });
    output.resize(output.size() - (ready - std::exchange(held_back_, 0)));
  }

  EnhancementCounts counts() const {
    EnhancementCounts counts;
    GetEnhancementCounts(stream_.get(), &counts);
    return counts;
  }

private:
  struct Close {
    void operator()(EnhancementStream *stream) const { CloseEnhancementStream(stream); }
  };

  /// Appends what `produce` writes into `room` samples, and returns how many these are.
  template <class Produce>
  static std::size_t append(std::vector<std::int16_t> &output, std::size_t room, Produce produce) {
    const std::size_t before = output.size();
    output.resize(before + room);
    const std::int32_t ready = produce(output.data() + before, static_cast<std::int32_t>(room));
    output.resize(before + static_cast<std::size_t>(ready));
    return static_cast<std::size_t>(ready);
  }

  std::size_t channels_;
  std::size_t held_back_ = 0;  ///< Samples per channel still to come out
  std::unique_ptr<EnhancementStream, Close> stream_;
};

/// The enhancer; behind it the detector, if wanted; then the way back to the input's rate, if that
/// is another one.
class SignalPath {
public:
  SignalPath(const std::string &input, const EnhanceSettings &settings, int rate_hz, Report &report)
      : enhancer_(settings.enhancement), gain_(std::pow(10.0, -settings.headroom_db / 20)) {
    if (settings.detect) {
      detector_.emplace(input, kEngineRate, settings.detector,
                        split_processed(settings.detector.split, input, kEngineRate), report);
      report.begin_file(input, kEngineRate, settings.detector.reported);
    }
    if (rate_hz != kEngineRate) resampler_.emplace(kEngineRate, rate_hz);
  }

  /// The samples that are ready after a chunk of input.
  std::span<const std::int16_t> process(std::span<const std::int16_t> chunk) {
    enhanced_.clear();
    if (gain_ != 1) {
      scaled_.clear();
      for (const std::int16_t sample : chunk)
        scaled_.push_back(static_cast<std::int16_t>(std::lround(gain_ * sample)));
      chunk = scaled_;
    }
    enhancer_.push(chunk, enhanced_);
    if (detector_) detector_->push(enhanced_);
    if (!resampler_) return enhanced_;
    resampled_.clear();
    resampler_->push(enhanced_, resampled_);
    return resampled_;
  }

  /// The rest of an output of `length` samples altogether.
  std::span<const std::int16_t> finish(std::int64_t length) {
    enhanced_.clear();
    enhancer_.flush(enhanced_);
    if (detector_) {
      detector_->push(enhanced_);
      detector_->flush();
    }
    if (!resampler_) return enhanced_;
    resampled_.clear();
    resampler_->push(enhanced_, resampled_);
    resampler_->flush(length, resampled_);
    return resampled_;
  }

  EnhancementCounts counts() const { return enhancer_.counts(); }

private:
  Enhancer enhancer_;
  std::optional<Detector> detector_;
  std::optional<Resampler16> resampler_;
  double gain_;  ///< At most 1
  std::vector<std::int16_t> scaled_, enhanced_, resampled_;
};

double seconds(std::int64_t samples) { return static_cast<double>(samples) / kEngineRate; }

void note_counts(Job &job, const EnhancementCounts &counts) {
  if (counts.loud_frames.count > 0)
    job.note(fmt::format("loud for {:.2f} s, first at {:.2f} s",
                         static_cast<double>(counts.loud_frames.count) / 100,
                         seconds(counts.loud_frames.first)));
  if (counts.clipped_out.count > 0)
    job.note(fmt::format("samples of the output at full scale: {}, the first at {:.3f} s",
                         counts.clipped_out.count, seconds(counts.clipped_out.first)));
}

}  // namespace

void enhance(Job &job, const OutputTarget &target, const EnhanceSettings &settings,
             Report &report) {
  AudioSource source = open_source(job, settings.audio);
  const int own_rate = source.source_rate_hz();
  const int rate = settings.keep_rate ? own_rate : kEngineRate;
  const auto output = open_audio_output(target, rate, settings.rules);
  if (rate != own_rate)
    job.note(fmt::format("written at {} Hz, converted from {} Hz (--keep-rate converts back)", rate,
                         own_rate));

  if (settings.keep_rate && own_rate > kEngineRate)
    job.note(fmt::format("written at {} Hz, but all above 8 kHz is gone", rate));

  SignalPath path(job.input(), settings, rate, report);
  for (auto chunk = source.read(); !chunk.empty(); chunk = source.read()) {
    output->write(path.process(chunk));
    job.show_progress(source.seconds_read(), source.length_seconds());
  }
  output->write(path.finish(source.source_frames_read()));
  if (settings.detect) report.end_file(source.samples_read());
  // Before the output gets its name: part of an input must not pass for the whole.
  check_complete(job, source);
  output->commit();
  note_clipping(job, source);
  if (settings.enhancement.level == 1) note_counts(job, path.counts());
}

}  // namespace orvalis::cli
