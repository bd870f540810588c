/* The worked example of utterance_stream.h, word for word, and a main program around it:
 * example_stream <RECORDING    (raw 16-bit PCM, 16 kHz) */
// clang-format off
#include <stdio.h>
#include "utterance_stream.h"

int print_utterances(const int16_t *pcm, int32_t samples)
{
    UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;    // 16 kHz
    UtteranceStream *stream = OpenUtteranceStream(&settings);
    Utterance found;
    int32_t done = 0;
    if (stream == NULL)
        return -1;
    do {
        done += PushUtteranceAudio(stream, pcm + done, samples - done);
        if (done == samples)
            FlushUtteranceStream(stream);
        while (NextUtterance(stream, &found) == 1)
            printf("%d: %.2f s to %.2f s\n", (int)found.number,
                   found.start / 16000.0, found.end / 16000.0);
    } while (done < samples);
    return CloseUtteranceStream(stream);
}
// clang-format on

#include "tests/support/read_pcm.h"

int main(void) { return print_utterances(pcm, read_pcm()) != 0; }
