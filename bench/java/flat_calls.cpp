// The native side of BoundaryBenchmark: the same calls over the same frames, from C++.
#include <jni.h>

#include <chrono>
#include <vector>

#include "jni/orvalis.h"

namespace {

constexpr int32_t kFrame = 160;

/// Nanoseconds that a call takes, on average over the frames.
template <class Call>
jdouble time_frames(std::vector<int16_t> &pcm, Call call) {
  const std::size_t frames = pcm.size() / kFrame;
  const auto start = std::chrono::steady_clock::now();
  for (std::size_t i = 0; i < frames; ++i) call(&pcm[i * kFrame]);
  const std::chrono::duration<double, std::nano> time = std::chrono::steady_clock::now() - start;
  return time.count() / static_cast<double>(frames);
}

}  // namespace

extern "C" JNIEXPORT jdouble JNICALL Java_BoundaryBenchmark_flatCalls(JNIEnv *env, jclass,
                                                                      jint method,
                                                                      jshortArray recording) {
  std::vector<int16_t> pcm(static_cast<std::size_t>(env->GetArrayLength(recording)));
  env->GetShortArrayRegion(recording, 0, static_cast<jsize>(pcm.size()), pcm.data());
  EpdInstance *epd = InitializeEPD(0, 0);
  NsInstance *ns = InitializeDoNS(0, 1, 0);
  const int64_t drc = InitializeDRC(16000, 0);
  int16_t out[kFrame] = {};
  int32_t spectrum[128];
  jdouble time = 0;
  switch (method) {
    case 0:
      time = time_frames(pcm, [&](const int16_t *frame) { ProcessEPDFrame(epd, frame, kFrame); });
      break;
    case 1:
      time = time_frames(pcm, [&](int16_t *in) { ProcessDoNSFrame(ns, in, kFrame, out, kFrame); });
      break;
    case 2:
      time = time_frames(pcm, [&](int16_t *frame) { ProcessDRC(drc, frame, kFrame); });
      break;
    case 3:
      time = time_frames(pcm, [&](const int16_t *frame) { ComputeEnergy(frame, kFrame, 8000); });
      break;
    case 4:
      time = time_frames(pcm, [&](const int16_t *frame) { getSpectrum(frame, spectrum, 16000); });
      break;
    default:
      time = time_frames(pcm, [&](const int16_t *) { ResetEPDparams(epd); });
  }
  FreeMemoryEPD(epd);
  FreeMemoryNS(ns);
  FreeMemoryDRC(drc);
  return time;
}
