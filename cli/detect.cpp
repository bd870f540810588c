#include "cli/detect.h"

#include <MCRAvad.h>
#include <fmt/format.h>
#include <orvalis.h>

#include <algorithm>
#include <cstdlib>
#include <new>
#include <optional>
#include <utility>

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

/// Energies and bins are those of the frame and its predecessor together.
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

/// The hangover that bridges silence shorter than `min_silence_ms`. Silence comes in whole frames,
/// and a hangover includes the frame of speech that ends it.
std::int32_t bridging_hangover_ms(std::int32_t min_silence_ms, int rate_hz) {
  const std::int32_t frame_ms = 1000 * MCRA_FRAME_SAMPLES / rate_hz;
  return (min_silence_ms + frame_ms - 1) / frame_ms * frame_ms;
}

bool needs_lead_in(LeadIn lead_in, const std::string &input) {
  return lead_in == LeadIn::kAlways || (lead_in == LeadIn::kNotOfStandardInput && input != "-");
}

}  // namespace

Detector::Detector(const std::string &input, int rate_hz, const DetectorSettings &settings,
                   std::unique_ptr<Split> split, Report &report)
    : rate_hz_(rate_hz), reported_(settings.reported), split_(std::move(split)), report_(report) {
  UtteranceSettings stream = settings.stream;
  stream.rate_hz = rate_hz;
  stream.lead_in = needs_lead_in(settings.lead_in, input) ? 1 : 0;
  if (stream.detector == UTTERANCE_MCRA) {
    stream.mcra = &settings.mcra;
    stream.hangover_ms = bridging_hangover_ms(settings.min_silence_ms, rate_hz);
  }
  if (is_frames(reported_) || stream.pcm_dump != 0) {
    stream.on_frame = [](const UtteranceFrame *frame, void *detector) {
      static_cast<Detector *>(detector)->note_frame(*frame);
    };
    stream.user = this;
  }
  stream_.reset(OpenUtteranceStream(&stream));
  if (!stream_) throw std::bad_alloc();
}

void Detector::push(std::span<const std::int16_t> audio) {
  if (split_) split_->push(audio);
  statistics_.length += std::ssize(audio);
  while (!audio.empty()) {
    const auto count =
        PushUtteranceAudio(stream_.get(), audio.data(), static_cast<std::int32_t>(audio.size()));
    audio = audio.subspan(static_cast<std::size_t>(count));
    report_new();
  }
}

void Detector::flush() {
  FlushUtteranceStream(stream_.get());
  report_new();
  if (reported_ == Reported::kSilences) report_silence_before(statistics_.length);
}

void Detector::note_frame(const UtteranceFrame &frame) {
  if (frame.epd != nullptr && frame.epd->judged != 0) samples_judged_ += frame.samples;
  if (!is_frames(reported_)) return;
  Trace trace;
  if (reported_ == Reported::kTrace)
    trace = frame.mcra != nullptr ? trace_of(*frame.mcra) : trace_of(frame, *frame.epd);
  frames_.push_back({frame.start, frame.speech, std::move(trace)});
}

void Detector::report_new() {
  for (Utterance found; NextUtterance(stream_.get(), &found) == 1;) {
    // The file first: it exists once its utterance is reported.
    if (split_) split_->write(found);
    statistics_.speech += found.end - found.start;
    ++statistics_.utterances;
    if (reported_ == Reported::kUtterances) report_.utterance(found);
    if (reported_ == Reported::kSilences) report_silence_before(found.start);
    silence_start_ = found.end;
  }
  if (split_) split_->forget_before(EarliestUtteranceStart(stream_.get()));
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

void Detector::report_silence_before(std::int64_t position) {
  if (position > silence_start_) report_.silence({++silence_count_, silence_start_, position});
}

AudioSource open_source(Job &job, const AudioSettings &settings) {
  AudioSource source(job.input(), settings);
  if (source.raw_has_header())
    job.note("begins with a RIFF header, which --raw takes for samples; leave out --raw");
  return source;
}

void note_clipping(Job &job, const AudioSource &source) {
  if (source.clipped() > 0)
    job.note(fmt::format("clipped samples of the input: {}, the first at {:.3f} s",
                         source.clipped(), source.first_clipped_s()));
}

void check_complete(Job &job, const AudioSource &source) {
  if (const std::string warning = source.check_complete(); !warning.empty()) job.note(warning);
}

void detect(Job &job, const DetectSettings &settings, Report &report) {
  AudioSource source = open_source(job, settings.audio);
  const int rate_hz = source.rate_hz();
  report.begin_file(job.input(), rate_hz, settings.detector.reported);
  std::optional<Detector> detector(
      std::in_place, job.input(), rate_hz, settings.detector,
      split_source(settings.detector.split, job.input(), settings.audio, rate_hz), report);
  for (auto chunk = source.read(); !chunk.empty(); chunk = source.read()) {
    detector->push(chunk);
    job.show_progress(source.seconds_read(), source.length_seconds());
  }
  detector->flush();
  if (settings.detector.reported == Reported::kStatistics) {
    Statistics statistics = detector->statistics();
    statistics.clipped = source.clipped();
    report.statistics(statistics);
  }
  report.end_file(source.samples_read());
  const std::int64_t dumped = detector->samples_judged();
  detector.reset();
  if (settings.dump != nullptr) settings.dump->finish(job.input(), dumped);
  note_clipping(job, source);
  // Last, so that of a damaged file everything that could be decided is reported.
  check_complete(job, source);
}

}  // namespace orvalis::cli
