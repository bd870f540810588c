/* The example of ProcessDoNSFrame in orvalis.h, word for word, and a main program around it that
 * prints how loud a second is before and after:
 * example_ns <RECORDING    (raw 16-bit PCM, 16 kHz) */
// clang-format off
#include <string.h>
#include "orvalis.h"

// At least one frame, and whole ones. `out` is late by 48 samples; `pcm` is overwritten.
int suppress_noise(int16_t *pcm, int32_t samples, int16_t *out)
{
    NsInstance *ns = InitializeDoNS(ORVALIS_NS_13DB, 1, 0);
    if (ns == NULL)
        return -1;
    memset(out, 0, ORVALIS_NS_DELAY_1MIC * sizeof *out);
    memcpy(out + ORVALIS_NS_DELAY_1MIC, pcm,
           (samples - ORVALIS_NS_DELAY_1MIC) * sizeof *out);
    for (int32_t at = 0; at < samples; at += ORVALIS_FRAME_16K)
        ProcessDoNSFrame(ns, pcm + at, ORVALIS_FRAME_16K, out + at, ORVALIS_FRAME_16K);
    return FreeMemoryNS(ns);
}
// clang-format on

#include "tests/support/read_pcm.h"

/* How late the output is by the lag at which it is most like the input. */
static int lag_of(const int16_t *out, const int16_t *in, int32_t samples) {
  double most = 0;
  int lag = -1;
  for (int tried = 0; tried < ORVALIS_FRAME_16K; ++tried) {
    double sum = 0;
    for (int32_t i = 0; i + tried < samples; ++i) sum += (double)out[i + tried] * in[i];
    if (sum > most) {
      most = sum;
      lag = tried;
    }
  }
  return lag;
}

int main(void) {
  static int16_t in[1 << 20], out[1 << 20];
  const int32_t samples = read_pcm() / ORVALIS_FRAME_16K * ORVALIS_FRAME_16K, pause = 6400;
  memcpy(in, pcm, (size_t)samples * sizeof *in);
  if (samples < pause || suppress_noise(pcm, samples, out) != 0) return 1;
  printf("noise of %d dB now of %d dB, %d samples late\n", (int)computeEnergy(in, pause),
         (int)computeEnergy(out, pause), lag_of(out, in, samples));
  return 0;
}
