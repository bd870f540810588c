/* A program of somebody else's: prints the utterances of raw 16-bit PCM at 16 kHz from standard
 * input. */
#include <orvalis.h>
#include <stdio.h>
#include <utterance_stream.h>

int main(void) {
  const UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  UtteranceStream *stream = OpenUtteranceStream(&settings);
  Utterance found;
  int16_t chunk[1000];
  int32_t samples;
  if (OrvalisAbiVersion() != ORVALIS_ABI_VERSION) return 1;
  while ((samples = (int32_t)fread(chunk, sizeof chunk[0], 1000, stdin)) > 0)
    if (PushUtteranceAudio(stream, chunk, samples) != samples) return 1;
  FlushUtteranceStream(stream);
  printf("library %s\n", GetVersion());
  while (NextUtterance(stream, &found) == 1)
    printf("%.2f s to %.2f s\n", (double)found.start / 16000, (double)found.end / 16000);
  return CloseUtteranceStream(stream) != 0;
}
