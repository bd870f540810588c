/* The worked example of orvalis.h, word for word, and a main program around it:
 * example_epd <RECORDING    (raw 16-bit PCM, 16 kHz) */
// clang-format off
#include <stdio.h>
#include "orvalis.h"

int report_speech(const int16_t *pcm, int32_t samples)
{
    EpdInstance *epd = InitializeEPD(ORVALIS_EPD_16K, 0);    // no dump files
    int32_t previous = 0;
    if (epd == NULL)
        return -1;
    for (int32_t at = 0; at + ORVALIS_FRAME_16K <= samples; at += ORVALIS_FRAME_16K) {
        int32_t speech = ProcessEPDFrame(epd, pcm + at, ORVALIS_FRAME_16K);
        if (speech != previous)
            printf("%s after %.2f s\n", speech ? "speech" : "silence",
                   (at + ORVALIS_FRAME_16K) / 16000.0);
        previous = speech;
    }
    return FreeMemoryEPD(epd);
}
// clang-format on

#include "tests/support/read_pcm.h"

int main(void) { return report_speech(pcm, read_pcm()) != 0; }
