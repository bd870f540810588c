#include "Voice_Engine/drc/dynamics_control.h"

#include <cstdlib>
#include <iterator>
#include <numeric>

#include "Voice_Engine/platform/dump_file.h"
#include "Voice_Engine/platform/log.h"

namespace orvalis {
namespace {

constexpr Word32 kRate = 16000;
constexpr Word32 kMaxLoudSamples = 100;

/// Gains in Q11 by the peak in 63rds of full scale: 2048 (63 / i)^(2/3), which compresses 3:1, up
/// to +12 dB.
constexpr Word16 kGainCurve[64] = {
    8153, 8153, 8153, 8153, 8153, 8153, 8153, 8153, 8106, 7494, 6986, 6556, 6186, 5865, 5582, 5331,
    5107, 4904, 4721, 4554, 4401, 4260, 4130, 4009, 3897, 3793, 3695, 3603, 3517, 3435, 3358, 3286,
    3217, 3152, 3090, 3030, 2974, 2920, 2869, 2820, 2772, 2727, 2684, 2642, 2602, 2563, 2526, 2490,
    2455, 2422, 2389, 2358, 2327, 2298, 2270, 2242, 2215, 2189, 2164, 2140, 2116, 2093, 2070, 2048};

Word16 frame_length(Word32 samplingRate) { return samplingRate == kRate ? 160 : 80; }

}  // namespace

DrcInstance *create_drc(Word32 samplingRate, Word32 pcmDumpEnabled) {
  const Word16 length = frame_length(samplingRate);
  log_line(kLogDebug, kLogTag, "Create DRC, SamplingRate : %d, PCM_LEN : %d", samplingRate, length);
  DrcInstance *drc = initRecDynamicsControlParameter(samplingRate, length, MAX_16, pcmDumpEnabled);
  if (drc != nullptr) log_line(kLogDebug, kLogTag, "Create DRC end");
  return drc;
}

DrcInstance *initRecDynamicsControlParameter(Word32 samplingRate, Word16 frameLength,
                                             Word16 outputScale, Word32 pcmDumpEnabled) {
  auto *drc = static_cast<DrcInstance *>(std::calloc(1, sizeof(DrcInstance)));
  if (drc == nullptr) return nullptr;
  drc->pcmDumpEnabled = pcmDumpEnabled;
  drc->samplingRate = samplingRate;
  drc->frameLength = frameLength;
  drc->outputScale = outputScale;
  drc->riseCoefficient = 164;  // 0.005: a time constant of 12.5 ms
  drc->fallCoefficient = 10;   // 0.0003: 0.2 s
  drc->gainCurve = kGainCurve;
  return drc;
}

Word32 process_drc(DrcInstance *drc, Word16 *pcm, Word32 count) {
  if (drc == nullptr) return -1;
  PublishedFlags<PlainCopy> flags;
  const Word32 length = frame_length(drc->samplingRate);
  bool loud = false;
  for (Word32 rest = count; rest > 0; rest -= length, pcm += length)
    loud |= EnvBasedDynamicsControl(*flags, drc, pcm) == 1;
  return loud;
}

Word32 EnvBasedDynamicsControl(Flags &flags, DrcInstance *drc, Word16 *frame) {
  if (drc == nullptr || drc->samplingRate != kRate) return -1;
  if (drc->firstCallLogged == 0) {
    log_line(kLogDebug, kLogTag, "TQE: with doDRC ... samplingRate = %d", drc->samplingRate);
    drc->firstCallLogged = 1;
  }
  std::FILE *before = nullptr;
  std::FILE *after = nullptr;
  if (drc->pcmDumpEnabled == 1) {
    before = open_dump(kDrcDumpFolder, drc, "_beforeDRC.pcm");
    after = open_dump(kDrcDumpFolder, drc, "_afterDRC.pcm");
  }
  write_dump(before, frame, drc->frameLength);

  const Word16 loud = level_frame(flags, *drc, frame);
  drc->loudRingIndex = static_cast<Word16>((drc->loudRingIndex + 1) % 10);
  drc->loudRing[drc->loudRingIndex] = loud;

  close_dump(before);
  write_dump(after, frame, drc->frameLength);
  close_dump(after);
  // The newest frame is in the ring and counts once more.
  const Word32 recent = std::accumulate(std::begin(drc->loudRing), std::end(drc->loudRing), loud);
  return recent > kMaxLoudSamples ? 1 : 0;
}

Word32 freeMemory_DRC(DrcInstance *drc) {
  if (drc == nullptr || handle_number(drc) == -1) return -1;
  std::free(drc);
  return 0;
}

}  // namespace orvalis
