#include "stream/enhancement_stream.h"

#include <algorithm>
#include <cstdlib>
#include <new>

#include "Voice_Engine/drc/dynamics_control.h"
#include "Voice_Engine/ns/ns_instance.h"
#include "Voice_Engine/platform/export.h"
#include "stream/frame_cutter.h"

using orvalis::FrameCutter;
using orvalis::kFrame;

struct EnhancementStream {
  EnhancementStream(const EnhancementSettings &chosen, int32_t delay_samples)
      : settings(chosen),
        delay(delay_samples),
        lead(delay_samples),
        input(chosen.microphones),
        suppressed(1) {}

  EnhancementSettings settings;
  int32_t delay;
  int32_t lead;  ///< samples of the delay that are still to come out of the suppressor
  bool flushed = false;
  int64_t pushed = 0;  ///< samples of all microphones
  int64_t given = 0;   ///< samples put out after the delay
  NsInstance *ns = nullptr;
  DrcInstance *drc = nullptr;
  FrameCutter input;
  FrameCutter suppressed;          ///< input of dynamics control
  orvalis::S2chnsState pair = {};  ///< record of two microphones
  EnhancementCounts counts = {{0, -1}, {0, -1}, {0, -1}, 0};
};

namespace {

constexpr int32_t kRateHz = 16000;
constexpr int32_t kStrongMode = 2;  // a creation mode of the suppressor

bool is_switch(int32_t value) { return value == 0 || value == 1; }

bool is_valid(const EnhancementSettings &settings) {
  if (!is_switch(settings.level) || !is_switch(settings.aligned)) return false;
  if (settings.suppression_db == 18) return settings.microphones == 1;
  return (settings.microphones == 1 || settings.microphones == 2) &&
         (settings.suppression_db == 0 || settings.suppression_db == 13);
}

int32_t delay_of(const EnhancementSettings &settings) {
  if (settings.suppression_db == 0) return 0;
  return settings.microphones == 2 ? 160 : 48;
}

/// False if memory ran out.
bool create_instances(EnhancementStream &stream) {
  const EnhancementSettings &settings = stream.settings;
  if (settings.suppression_db != 0) {
    const int32_t mode = settings.suppression_db == 18 ? kStrongMode : 0;
    stream.ns = orvalis::DoNS_Create(mode, settings.microphones, stream.pair);
    if (stream.ns == nullptr) return false;
  }
  if (settings.level == 1) {
    stream.drc = orvalis::create_drc(kRateHz, 0);
    if (stream.drc == nullptr) return false;
  }
  return true;
}

void release(EnhancementStream *stream) {
  if (stream->ns != nullptr) orvalis::freeMemory_NS(stream->ns);
  if (stream->drc != nullptr) orvalis::freeMemory_DRC(stream->drc);
  std::free(stream);
}

void note(EnhancementCount &count, int64_t position) {
  if (count.count++ == 0) count.first = position;
}

bool is_full_scale(int16_t sample) { return sample == INT16_MAX || sample == INT16_MIN; }

void put_out(EnhancementStream &stream, const int16_t *samples, int32_t count, int16_t *&out) {
  for (int32_t i = 0; i < count; ++i)
    if (is_full_scale(samples[i])) note(stream.counts.clipped_out, stream.given + i);
  out = std::copy_n(samples, count, out);
  stream.given += count;
}

/// Levels a frame, of which `count` samples come out.
void level(EnhancementStream &stream, const int16_t *frame, int32_t count, int16_t *&out) {
  int16_t levelled[kFrame];
  std::copy_n(frame, kFrame, levelled);
  stream.counts.is_loud = orvalis::process_drc(stream.drc, levelled, kFrame);
  if (stream.counts.is_loud == 1) note(stream.counts.loud_frames, stream.given);
  put_out(stream, levelled, count, out);
}

/// Passes samples on from the suppressor.
void pass_on(EnhancementStream &stream, const int16_t *samples, int32_t count, int16_t *&out) {
  const int32_t lead = std::min(stream.lead, count);
  stream.lead -= lead;
  if (stream.settings.aligned == 0) out = std::copy_n(samples, lead, out);
  samples += lead;
  count -= lead;
  if (stream.drc == nullptr) {
    put_out(stream, samples, count, out);
  } else {
    stream.suppressed.push(samples, count,
                           [&](const int16_t *frame) { level(stream, frame, kFrame, out); });
  }
}

/// How many samples come out if the suppressor passes `passed_on` on.
int64_t ready_of(const EnhancementStream &stream, int64_t passed_on) {
  const int64_t lead = std::min<int64_t>(stream.lead, passed_on);
  int64_t ready = passed_on - lead;
  if (stream.drc != nullptr) ready = (stream.suppressed.waiting_values() + ready) / kFrame * kFrame;
  return stream.settings.aligned == 0 ? lead + ready : ready;
}

/// Suppresses the noise of a frame. A frame that is not suppressed gives the first channel,
/// delayed.
void suppress(EnhancementStream &stream, const int16_t *frame, int16_t *output) {
  const int32_t channels = stream.settings.microphones;
  for (int32_t i = 0; i < kFrame; ++i) output[i] = frame[(i - stream.delay) * channels];
  if (stream.ns == nullptr) return;
  // The engine overwrites its input, and its output has as many channels.
  int16_t in[2 * kFrame], out[2 * kFrame];
  const int32_t values = kFrame * channels;
  std::copy_n(frame, values, in);
  for (int32_t i = 0; i < values; ++i) out[i] = output[i / channels];
  orvalis::DO_NS_Proc_Frame(stream.ns, stream.pair, in, values, out, values);
  for (int32_t i = 0; i < kFrame; ++i) output[i] = out[i * channels];
}

/// Samples that the suppressor has not passed on: of the incomplete frame, and of the delay.
int32_t held_back(const EnhancementStream &stream) {
  if (stream.pushed == 0 || stream.flushed) return 0;
  return stream.input.waiting_values() / stream.settings.microphones + stream.delay;
}

/// Puts out all that is held back.
void drain(EnhancementStream &stream, int16_t *out) {
  int32_t rest = held_back(stream);
  stream.input.flush((rest + kFrame - 1) / kFrame, [&](const int16_t *frame) {
    int16_t samples[kFrame];
    suppress(stream, frame, samples);
    const int32_t count = std::min(rest, kFrame);
    pass_on(stream, samples, count, out);
    rest -= count;
  });
  const int32_t count = stream.suppressed.waiting_values();
  if (count == 0) return;
  stream.suppressed.flush(1, [&](const int16_t *frame) { level(stream, frame, count, out); });
}

}  // namespace

extern "C" {

ORVALIS_EXPORT EnhancementStream *OpenEnhancementStream(const EnhancementSettings *settings) {
  if (settings == nullptr || !is_valid(*settings)) return nullptr;
  void *memory = std::malloc(sizeof(EnhancementStream));
  if (memory == nullptr) return nullptr;
  auto *stream = new (memory) EnhancementStream(*settings, delay_of(*settings));
  if (create_instances(*stream)) return stream;
  release(stream);
  return nullptr;
}

ORVALIS_EXPORT int32_t EnhancementDelay(const EnhancementStream *stream) {
  return stream == nullptr ? -1 : stream->delay;
}

ORVALIS_EXPORT int32_t PushEnhancementAudio(EnhancementStream *stream, const int16_t *pcm,
                                            int32_t numSample, int16_t *out, int32_t room) {
  if (stream == nullptr || stream->flushed || numSample < 0 || room < 0 ||
      (pcm == nullptr && numSample > 0) || (out == nullptr && room > 0))
    return -1;
  const int64_t values = int64_t{stream->input.waiting_values()} + numSample;
  const int64_t ready = ready_of(*stream, values / stream->input.frame_values() * kFrame);
  if (ready > room) return -1;
  const int32_t channels = stream->settings.microphones;
  for (int32_t i = 0; i < numSample; ++i)
    if (is_full_scale(pcm[i])) note(stream->counts.clipped_in, (stream->pushed + i) / channels);
  stream->pushed += numSample;
  stream->input.push(pcm, numSample, [&](const int16_t *frame) {
    int16_t samples[kFrame];
    suppress(*stream, frame, samples);
    pass_on(*stream, samples, kFrame, out);
  });
  return static_cast<int32_t>(ready);
}

ORVALIS_EXPORT int32_t FlushEnhancementStream(EnhancementStream *stream, int16_t *out,
                                              int32_t room) {
  if (stream == nullptr || room < 0 || (out == nullptr && room > 0)) return -1;
  if (stream->pushed % stream->settings.microphones != 0) return -1;
  const int32_t rest = held_back(*stream);
  const int32_t skipped = stream->settings.aligned == 1 ? std::min(stream->lead, rest) : 0;
  const int32_t ready = rest - skipped + stream->suppressed.waiting_values();
  if (ready > room) return -1;
  drain(*stream, out);
  stream->flushed = true;
  return ready;
}

ORVALIS_EXPORT int32_t GetEnhancementCounts(const EnhancementStream *stream,
                                            EnhancementCounts *counts) {
  if (stream == nullptr || counts == nullptr) return -1;
  *counts = stream->counts;
  return 0;
}

ORVALIS_EXPORT int32_t CloseEnhancementStream(EnhancementStream *stream) {
  if (stream == nullptr) return -1;
  release(stream);
  return 0;
}

}  // extern "C"
