/* The worked example of enhancement_stream.h, word for word, and a main program around it:
 * example_enhancement <RECORDING    (raw 16-bit PCM, 16 kHz) */
// clang-format off
#include <stddef.h>
#include "enhancement_stream.h"

// `out` has room for samples + ENHANCEMENT_HELD_BACK. Returns how many there are, or -1.
int32_t enhance(const int16_t *pcm, int32_t samples, int16_t *out)
{
    EnhancementSettings settings = ENHANCEMENT_SETTINGS_DEFAULT;    // one microphone, 13 dB
    EnhancementStream *stream;
    int32_t ready = 0;
    settings.level = 1;
    stream = OpenEnhancementStream(&settings);
    if (stream == NULL)
        return -1;
    for (int32_t at = 0; at < samples; at += 1000) {
        int32_t chunk = samples - at < 1000 ? samples - at : 1000;
        ready += PushEnhancementAudio(stream, pcm + at, chunk,
                                      out + ready, chunk + ENHANCEMENT_HELD_BACK);
    }
    ready += FlushEnhancementStream(stream, out + ready, ENHANCEMENT_HELD_BACK);
    CloseEnhancementStream(stream);
    return ready;
}
// clang-format on

#include <stdio.h>
#include <stdlib.h>

#include "tests/support/read_pcm.h"

static int peak(const int16_t *samples, int32_t count) {
  int largest = 0;
  for (int32_t i = 0; i < count; ++i)
    if (abs(samples[i]) > largest) largest = abs(samples[i]);
  return largest;
}

int main(void) {
  static int16_t out[sizeof pcm / sizeof pcm[0] + ENHANCEMENT_HELD_BACK];
  int32_t samples = read_pcm();
  int32_t ready = enhance(pcm, samples, out);
  printf("%d samples of %d, peak %d of %d\n", (int)ready, (int)samples, peak(out, ready),
         peak(pcm, samples));
  return ready != samples;
}
