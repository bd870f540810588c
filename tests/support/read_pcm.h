/* Raw 16-bit PCM of native byte order from standard input, for the C programs among the tests. */
#ifndef ORVALIS_TESTS_SUPPORT_READ_PCM_H
#define ORVALIS_TESTS_SUPPORT_READ_PCM_H

#include <stdint.h>
#include <stdio.h>

static int16_t pcm[1 << 20];

/* How many samples there are. */
static int32_t read_pcm(void) {
  return (int32_t)fread(pcm, sizeof pcm[0], sizeof pcm / sizeof pcm[0], stdin);
}

#endif /* ORVALIS_TESTS_SUPPORT_READ_PCM_H */
