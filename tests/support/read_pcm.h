/* Reads a raw 16-bit PCM file of native byte order for the C programs among the tests. */
#ifndef ORVALIS_TESTS_SUPPORT_READ_PCM_H
#define ORVALIS_TESTS_SUPPORT_READ_PCM_H

#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>

/* All samples of the file, to be freed by the caller; ends the program if there are none. */
static int16_t *read_pcm(const char *path, int32_t *samples) {
  FILE *file = fopen(path, "rb");
  long bytes = -1;
  int16_t *pcm = NULL;
  if (file != NULL && fseek(file, 0, SEEK_END) == 0) bytes = ftell(file);
  if (bytes > 1) pcm = (int16_t *)malloc((size_t)bytes);
  if (pcm == NULL || fseek(file, 0, SEEK_SET) != 0 ||
      fread(pcm, 2, (size_t)bytes / 2, file) != (size_t)bytes / 2) {
    fprintf(stderr, "cannot read %s\n", path);
    exit(2);
  }
  fclose(file);
  *samples = (int32_t)(bytes / 2);
  return pcm;
}

#endif /* ORVALIS_TESTS_SUPPORT_READ_PCM_H */
