#include "stream/utterance_stream.h"

#include <algorithm>
#include <cstdlib>
#include <new>

#include "Voice_Engine/platform/export.h"
#include "stream/frame_detector.h"
#include "stream/utterance_finder.h"

struct UtteranceStream {
  UtteranceStream(const UtteranceSettings &settings, const orvalis::FrameDetector &opened)
      : detector(opened),
        finder(orvalis::finder_settings(settings, orvalis::decision_timing(settings))),
        frame_samples(orvalis::decision_timing(settings).frame_samples),
        on_frame(settings.on_frame),
        user(settings.user) {}

  orvalis::FrameDetector detector;
  orvalis::UtteranceFinder finder;
  orvalis::UtteranceQueue queue;
  int32_t frame_samples;
  void (*on_frame)(const UtteranceFrame *frame, void *user);
  void *user;
  bool flushed = false;
  int64_t pushed = 0;
  int64_t judged = 0;
  int32_t filled = 0;
  int16_t frame[orvalis::kMaxFrameSamples] = {};
};

namespace {

bool is_valid(const UtteranceSettings &settings) {
  if (settings.rate_hz != 16000 && settings.rate_hz != 8000) return false;
  if (std::min({settings.hangover_ms, settings.pad_before_ms, settings.pad_after_ms,
                settings.min_speech_ms}) < 0) {
    return false;
  }
  if (settings.detector == UTTERANCE_MCRA) {
    return settings.input_gain == 0 && settings.content_type == 0 && settings.pcm_dump == 0;
  }
  return settings.detector == UTTERANCE_CHANNEL_ENERGY && settings.mcra == nullptr &&
         settings.input_gain >= 0 && settings.input_gain <= 2;
}

void judge_frame(UtteranceStream &stream) {
  const auto [speech, is_null] = stream.detector.process(stream.frame);
  if (stream.on_frame != nullptr) {
    const UtteranceFrame frame = {.start = stream.judged,
                                  .pcm = stream.frame,
                                  .samples = stream.frame_samples,
                                  .speech = speech,
                                  .mcra = stream.detector.mcra()};
    stream.on_frame(&frame, stream.user);
  }
  stream.judged += stream.frame_samples;
  stream.finder.process(speech, is_null, stream.queue);
  stream.filled = 0;
}

}  // namespace

extern "C" {

ORVALIS_EXPORT UtteranceStream *OpenUtteranceStream(const UtteranceSettings *settings) {
  if (settings == nullptr || !is_valid(*settings)) return nullptr;
  orvalis::FrameDetector detector;
  if (!detector.open(*settings)) return nullptr;
  void *memory = std::malloc(sizeof(UtteranceStream));
  if (memory == nullptr) {
    detector.close();
    return nullptr;
  }
  return new (memory) UtteranceStream(*settings, detector);
}

ORVALIS_EXPORT int32_t PushUtteranceAudio(UtteranceStream *stream, const int16_t *pcm,
                                          int32_t numSample) {
  if (stream == nullptr || stream->flushed || numSample < 0 || (pcm == nullptr && numSample > 0)) {
    return -1;
  }
  int32_t taken = 0;
  while (taken < numSample && !stream->queue.is_full()) {
    const int32_t piece = std::min(numSample - taken, stream->frame_samples - stream->filled);
    std::copy_n(pcm + taken, piece, stream->frame + stream->filled);
    stream->filled += piece;
    taken += piece;
    if (stream->filled == stream->frame_samples) judge_frame(*stream);
  }
  stream->pushed += taken;
  return taken;
}

ORVALIS_EXPORT int32_t NextUtterance(UtteranceStream *stream, Utterance *utterance) {
  if (stream == nullptr || utterance == nullptr) return -1;
  return stream->queue.pop(*utterance) ? 1 : 0;
}

ORVALIS_EXPORT int64_t EarliestUtteranceStart(const UtteranceStream *stream) {
  if (stream == nullptr) return -1;
  const Utterance *decided = stream->queue.front();
  return decided != nullptr ? decided->start : stream->finder.earliest_start();
}

ORVALIS_EXPORT int32_t FlushUtteranceStream(UtteranceStream *stream) {
  if (stream == nullptr) return -1;
  if (!stream->flushed) stream->finder.finish(stream->pushed, stream->queue);
  stream->flushed = true;
  return stream->filled;
}

ORVALIS_EXPORT int32_t CloseUtteranceStream(UtteranceStream *stream) {
  if (stream == nullptr) return -1;
  stream->detector.close();
  std::free(stream);
  return 0;
}

}  // extern "C"
