/* The worked example of MCRAvad.h, word for word, and a main program around it:
 * example_mcra <RECORDING    (raw 16-bit PCM) */
// clang-format off
#include <stdio.h>
#include <stdlib.h>
#include "MCRAvad.h"

int report_share(const int16_t *pcm, int32_t samples)
{
    VADINFO *vad = (VADINFO *)calloc(1, sizeof *vad);    // all fields 0
    int16_t frame[MCRA_FRAME_SAMPLES];
    int32_t speech = 0, frames = 0;
    if (vad == NULL)
        return -1;
    initialVADINFO(&vad);
    while (frames < samples / MCRA_FRAME_SAMPLES) {
        for (int32_t i = 0; i < MCRA_FRAME_SAMPLES; ++i)    // a copy: the call changes it
            frame[i] = pcm[frames * MCRA_FRAME_SAMPLES + i];
        speech += processVAD(&vad, frame, MCRA_FRAME_SAMPLES, 0.84f);
        ++frames;
    }
    printf("speech in %d of %d frames\n", (int)speech, (int)frames);
    free(vad);
    return 0;
}
// clang-format on

#include "tests/support/read_pcm.h"

int main(void) { return report_share(pcm, read_pcm()) != 0; }
