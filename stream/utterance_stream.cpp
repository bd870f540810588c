#include "stream/utterance_stream.h"

#include <algorithm>
#include <cstdlib>
#include <new>

#include "Voice_Engine/platform/export.h"
#include "stream/frame_detector.h"
#include "stream/lead_in.h"
#include "stream/utterance_finder.h"

struct UtteranceStream {
  UtteranceStream(const UtteranceSettings &settings, const orvalis::FrameDetector &opened,
                  int32_t room, int16_t *memory)
      : detector(opened),
        finder(orvalis::finder_settings(settings, orvalis::decision_timing(settings))),
        frame_samples(orvalis::decision_timing(settings).frame_samples),
        on_frame(settings.on_frame),
        user(settings.user),
        leads_in(settings.lead_in == 1),
        held(memory),
        held_room(room) {}

  orvalis::FrameDetector detector;
  orvalis::UtteranceFinder finder;
  orvalis::UtteranceQueue queue;
  int32_t frame_samples;
  void (*on_frame)(const UtteranceFrame *frame, void *user);
  void *user;

  bool leads_in;  // the lead-in is still to come
  bool flushed = false;
  bool finished = false;
  int64_t pushed = 0;
  int64_t processed = 0;

  // Audio waits here until it is a frame, or at first as much as the lead-in searches.
  int16_t *held;
  int32_t held_room;
  int32_t held_samples = 0;
  int32_t held_processed = 0;
};

namespace {

bool is_valid(const UtteranceSettings &settings) {
  if (settings.rate_hz != 16000 && settings.rate_hz != 8000) return false;
  if (std::min({settings.hangover_ms, settings.pad_before_ms, settings.pad_after_ms,
                settings.min_speech_ms}) < 0) {
    return false;
  }
  if (settings.detector == UTTERANCE_MCRA) {
    return settings.input_gain == 0 && settings.content_type == 0 && settings.pcm_dump == 0 &&
           settings.lead_in == 0;
  }
  return settings.detector == UTTERANCE_CHANNEL_ENERGY && settings.mcra == nullptr &&
         settings.input_gain >= 0 && settings.input_gain <= 2 && settings.lead_in >= 0 &&
         settings.lead_in <= 1;
}

/// Maximum number of samples that a stream holds before it processes them.
int32_t room_for_held(const UtteranceSettings &settings) {
  const int32_t frame_samples = orvalis::decision_timing(settings).frame_samples;
  return settings.lead_in == 1 ? orvalis::kLeadInSearch * frame_samples : frame_samples;
}

void lead_in(UtteranceStream &stream) {
  const int32_t frames = stream.held_samples / stream.frame_samples;
  const int16_t *window = orvalis::quietest_window(stream.held, frames, stream.frame_samples);
  if (window != nullptr) stream.detector.lead_in(window);
}

void process_frame(UtteranceStream &stream, const int16_t *pcm) {
  const auto [speech, is_null] = stream.detector.process(pcm);
  if (stream.on_frame != nullptr) {
    const UtteranceFrame frame = {.start = stream.processed,
                                  .pcm = pcm,
                                  .samples = stream.frame_samples,
                                  .speech = speech,
                                  .epd = stream.detector.epd_reasons(),
                                  .mcra = stream.detector.mcra_reasons()};
    stream.on_frame(&frame, stream.user);
  }
  stream.processed += stream.frame_samples;
  stream.finder.process(speech, is_null, stream.queue);
}

/// Processes the held audio once it fills its room or no more will come. Stops at a full queue; the
/// next call goes on.
void process_held(UtteranceStream &stream) {
  if (stream.held_samples < stream.held_room && !stream.flushed) return;
  if (stream.leads_in) lead_in(stream);
  stream.leads_in = false;
  while (stream.held_processed + stream.frame_samples <= stream.held_samples) {
    if (stream.queue.is_full()) return;
    process_frame(stream, stream.held + stream.held_processed);
    stream.held_processed += stream.frame_samples;
  }
  if (!stream.flushed) {
    stream.held_room = stream.frame_samples;
    stream.held_samples = stream.held_processed = 0;
  } else if (!stream.finished) {
    stream.finder.finish(stream.pushed, stream.queue);
    stream.finished = true;
  }
}

}  // namespace

extern "C" {

ORVALIS_EXPORT UtteranceStream *OpenUtteranceStream(const UtteranceSettings *settings) {
  if (settings == nullptr || !is_valid(*settings)) return nullptr;
  orvalis::FrameDetector detector;
  if (!detector.open(*settings)) return nullptr;
  const int32_t room = room_for_held(*settings);
  void *memory =
      std::malloc(sizeof(UtteranceStream) + static_cast<std::size_t>(room) * sizeof(int16_t));
  if (memory == nullptr) {
    detector.close();
    return nullptr;
  }
  auto *held = reinterpret_cast<int16_t *>(static_cast<UtteranceStream *>(memory) + 1);
  return new (memory) UtteranceStream(*settings, detector, room, held);
}

ORVALIS_EXPORT int32_t PushUtteranceAudio(UtteranceStream *stream, const int16_t *pcm,
                                          int32_t numSample) {
  if (stream == nullptr || stream->flushed || numSample < 0 || (pcm == nullptr && numSample > 0)) {
    return -1;
  }
  process_held(*stream);
  int32_t taken = 0;
  while (taken < numSample && !stream->queue.is_full()) {
    const int32_t chunk = std::min(numSample - taken, stream->held_room - stream->held_samples);
    std::copy_n(pcm + taken, chunk, stream->held + stream->held_samples);
    stream->held_samples += chunk;
    stream->pushed += chunk;
    taken += chunk;
    process_held(*stream);
  }
  return taken;
}

ORVALIS_EXPORT int32_t NextUtterance(UtteranceStream *stream, Utterance *utterance) {
  if (stream == nullptr || utterance == nullptr) return -1;
  process_held(*stream);
  return stream->queue.pop(*utterance) ? 1 : 0;
}

ORVALIS_EXPORT int64_t EarliestUtteranceStart(const UtteranceStream *stream) {
  if (stream == nullptr) return -1;
  const Utterance *decided = stream->queue.front();
  return decided != nullptr ? decided->start : stream->finder.earliest_start();
}

ORVALIS_EXPORT int32_t FlushUtteranceStream(UtteranceStream *stream) {
  if (stream == nullptr) return -1;
  stream->flushed = true;
  process_held(*stream);
  return static_cast<int32_t>(stream->pushed % stream->frame_samples);
}

ORVALIS_EXPORT int32_t CloseUtteranceStream(UtteranceStream *stream) {
  if (stream == nullptr) return -1;
  stream->detector.close();
  std::free(stream);
  return 0;
}

}  // extern "C"
