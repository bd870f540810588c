/* Prints the library's results for a recording. Built once as it is, and once with wrong functions
 * and tables of its own under names that the library exports too: the library must not notice, and
 * both programs print the same.
 *   interposing_host <RECORDING    (raw 16-bit PCM) */
#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "jni/orvalis.h"
#include "stream/utterance_stream.h"
#include "tests/support/read_pcm.h"

#ifdef HOST_INTERPOSES
#include <dlfcn.h>
#include <stdlib.h>

int16_t add(int16_t a, int16_t b) { return (int16_t)(a ^ b ^ 0x55); }
int16_t sub(int16_t a, int16_t b) { return (int16_t)(a ^ b ^ 0x33); }
int16_t norm_l(int32_t x) { return (int16_t)(x & 3); }
int32_t L_mac(int32_t sum, int16_t a, int16_t b) { return sum ^ a ^ b; }
int32_t L_add(int32_t a, int32_t b) { return a ^ b; }
int32_t L_ns_add(int32_t a, int32_t b) { return a ^ b; }
int32_t fnLog10(int32_t x) { return ~x; }
void r_fft_epd(int16_t *buffer, int16_t isign, int32_t band) {
  buffer[0] = (int16_t)(isign + band);
}
void r_fft_ns(int16_t *buffer, int16_t isign) { buffer[0] = isign; }
int32_t ResetEPDparams(EpdInstance *epd) { return epd == NULL; }
void initialVADINFO(VADINFO **info) { *info = NULL; }
int32_t processVAD(VADINFO **info, int16_t *frame, int32_t length, float exponent) {
  return info != NULL && frame[length - 1] > exponent;
}
int16_t window[160] = {1, 2, 3};
int16_t phs_tbl_WB[256] = {1, 2, 3};
int16_t phs_tbl_256[256] = {1, 2, 3};
int16_t tablog[33] = {1, 2, 3};
const int16_t *phs_tbl[2] = {window, window};

/* Without this the test could pass because nothing was interposed. */
static void check_interposed(const char *name, const void *own) {
  if (dlsym(RTLD_DEFAULT, name) == own) return;
  fprintf(stderr, "%s is not interposed\n", name);
  exit(2);
}
#endif

static void print_answers(int32_t samples, int32_t mode, int32_t content_type) {
  const int32_t frame = mode == 0 ? 160 : 80;
  EpdInstance *epd = InitializeEPD(mode, 0);
  printf("mode %d, content type %d: ", (int)mode, (int)content_type);
  for (int32_t at = 0; at + frame <= samples; at += frame) {
    putchar('0' + ProcessEPDFrameByCnttype(epd, pcm + at, frame, content_type));
  }
  putchar('\n');
  FreeMemoryEPD(epd);
}

static void print_queries(int32_t samples, int32_t rate_hz) {
  uint32_t folded = 0;
  for (int32_t at = 0; at + 160 <= samples; at += 160) {
    int32_t spectrum[128] = {0};
    getSpectrum(pcm + at, spectrum, rate_hz);
    for (int i = 0; i < 128; ++i) folded = folded * 31u + (uint32_t)spectrum[i];
    folded = folded * 31u + (uint32_t)computeEnergy(pcm + at, 160);
  }
  printf("queries at %d Hz: %08lx\n", (int)rate_hz, (unsigned long)folded);
}

static void print_utterances(int32_t samples, int32_t detector) {
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  settings.detector = detector;
  UtteranceStream *stream = OpenUtteranceStream(&settings);
  Utterance found;
  PushUtteranceAudio(stream, pcm, samples);
  FlushUtteranceStream(stream);
  while (NextUtterance(stream, &found) == 1) {
    printf("utterance %ld to %ld\n", (long)found.start, (long)found.end);
  }
  CloseUtteranceStream(stream);
}

int main(void) {
  const int32_t samples = read_pcm();
#ifdef HOST_INTERPOSES
  check_interposed("add", (const void *)(uintptr_t)add);
  check_interposed("phs_tbl_WB", phs_tbl_WB);
  check_interposed("tablog", tablog);
#endif
  print_answers(samples, 0, 0);
  print_answers(samples, 0, 2);
  print_answers(samples, 1000, 0);
  print_queries(samples, 16000);
  print_queries(samples, 8000);
  print_utterances(samples, UTTERANCE_CHANNEL_ENERGY);
  print_utterances(samples, UTTERANCE_MCRA);
  return 0;
}
