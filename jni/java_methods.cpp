// The native methods of com.zentq.tqe.phonoweave.Loquent: each checks its arrays, copies their
// samples and makes one call of the flat C interface. Handles are not checked, as in C.
#include <jni.h>

#include "Voice_Engine/epd/queries.h"
#include "jni/java_arrays.h"
#include "jni/orvalis.h"

namespace {

using orvalis::Access;
using orvalis::check;
using orvalis::Elements;
using orvalis::out_of_memory;
using orvalis::WorkingCopy;

template <class Instance>
Instance *instance_of(jlong handle) {
  return reinterpret_cast<Instance *>(static_cast<intptr_t>(handle));
}

jlong handle_of(const void *instance) { return reinterpret_cast<intptr_t>(instance); }

/// Samples that frame calls may read for a count above 0: whole frames of any length, and the 160
/// samples that the suppressor reads from the beginning of the last one.
std::size_t room_for_frames(jint count) {
  constexpr std::size_t kMaxFrame = 320;
  const auto frames = (static_cast<std::size_t>(count) + kMaxFrame - 1) / kMaxFrame;
  return frames * kMaxFrame + 160;
}

/// The same for blocks of 20 ms.
std::size_t room_for_blocks(jint count, jint rate_hz) {
  const auto samples = static_cast<std::size_t>(count);
  const int32_t block = orvalis::energy_block_samples(rate_hz);
  if (block < 1) return samples;
  const auto length = static_cast<std::size_t>(block);
  return (samples + length - 1) / length * length;
}

/// The samples that a method was given.
struct Samples {
  JNIEnv *env;
  const char *method;
  jshortArray pcm;
  jint count;
};

/// Whether the caller's array gets the processed samples.
enum class Mode { kReadOnly, kInPlace };

/// Makes the one call of the flat interface: on a copy of the samples, or on null if the count is 0
/// or less. Otherwise the engine may read `room` samples.
template <class Call>
jint on_copy(const Samples &samples, std::size_t room, Mode mode, Call call) {
  const auto [env, method, pcm, count] = samples;
  const Access access = check(env, method, pcm, count);
  if (access == Access::kRefused) return -1;
  if (access == Access::kNothing) return call(nullptr);

  WorkingCopy copy(static_cast<std::size_t>(count), room);
  if (copy.data() == nullptr) return out_of_memory(method);
  Elements<jshortArray> elements(env, pcm);
  if (elements.data() == nullptr) return out_of_memory(method);
  copy.fill_from(elements.data());
  if (mode == Mode::kReadOnly) elements.release();
  const jint result = call(copy.data());
  if (mode == Mode::kInPlace) copy.store_to(elements.data());
  return result;
}

/// Detection only reads; it ignores a partial last frame.
template <class Call>
jint detect(const Samples &samples, Call call) {
  return on_copy(samples, static_cast<std::size_t>(samples.count), Mode::kReadOnly, call);
}

}  // namespace

extern "C" {

#define LOQUENT(result, name) JNIEXPORT result JNICALL Java_com_zentq_tqe_phonoweave_Loquent_##name

LOQUENT(jlong, initializeEPD)(JNIEnv *, jobject, jint mode, jint dump_flag) {
  return handle_of(InitializeEPD(mode, dump_flag));
}

LOQUENT(jlong, initializeDoNS)(JNIEnv *, jobject, jint mode, jint microphones, jint unused) {
  return handle_of(InitializeDoNS(mode, microphones, unused));
}

LOQUENT(jlong, initializeDRC)(JNIEnv *, jobject, jint rate_hz, jint dump_flag) {
  return InitializeDRC(rate_hz, dump_flag);
}

LOQUENT(jint, processEPDFrame)
(JNIEnv *env, jobject, jlong handle, jshortArray pcm, jint count) {
  return detect({env, "processEPDFrame", pcm, count}, [&](const int16_t *samples) {
    return ProcessEPDFrame(instance_of<EpdInstance>(handle), samples, count);
  });
}

LOQUENT(jint, ProcessEPDFrameByCnttype)
(JNIEnv *env, jobject, jlong handle, jshortArray pcm, jint count, jint content_type) {
  return detect({env, "ProcessEPDFrameByCnttype", pcm, count}, [&](const int16_t *samples) {
    return ProcessEPDFrameByCnttype(instance_of<EpdInstance>(handle), samples, count, content_type);
  });
}

LOQUENT(jint, processDRC)(JNIEnv *env, jobject, jlong handle, jshortArray pcm, jint count) {
  return on_copy({env, "processDRC", pcm, count}, room_for_frames(count), Mode::kInPlace,
                 [&](int16_t *samples) { return ProcessDRC(handle, samples, count); });
}

LOQUENT(jint, computeEnergyFrame)
(JNIEnv *env, jobject, jshortArray pcm, jint count, jint rate_hz) {
  return on_copy({env, "computeEnergyFrame", pcm, count}, room_for_blocks(count, rate_hz),
                 Mode::kReadOnly,
                 [&](const int16_t *samples) { return ComputeEnergy(samples, count, rate_hz); });
}

LOQUENT(jint, processDoNSFrame)
(JNIEnv *env, jobject, jlong handle, jshortArray in, jint in_count, jshortArray out,
 jint out_count) {
  constexpr char kMethod[] = "processDoNSFrame";
  auto *ns = instance_of<NsInstance>(handle);
  Access access = check(env, kMethod, in, in_count);
  // As many samples of the output are used as of the input.
  if (access == Access::kSamples) access = check(env, kMethod, out, in_count);
  if (access == Access::kRefused) return -1;
  if (access == Access::kNothing)
    return ProcessDoNSFrame(ns, nullptr, in_count, nullptr, out_count);

  const std::size_t room = room_for_frames(in_count);
  WorkingCopy in_copy(static_cast<std::size_t>(in_count), room);
  WorkingCopy out_copy(static_cast<std::size_t>(in_count), room);
  if (in_copy.data() == nullptr || out_copy.data() == nullptr) return out_of_memory(kMethod);
  Elements<jshortArray> in_elements(env, in);
  const Elements<jshortArray> out_elements(env, out);
  if (in_elements.data() == nullptr || out_elements.data() == nullptr)
    return out_of_memory(kMethod);
  in_copy.fill_from(in_elements.data());
  out_copy.fill_from(out_elements.data());
  in_elements.release();  // before the output's, which has to stay if both are one array
  const jint result = ProcessDoNSFrame(ns, in_copy.data(), in_count, out_copy.data(), out_count);
  out_copy.store_to(out_elements.data());
  return result;
}

LOQUENT(jint, getSpectrum)
(JNIEnv *env, jobject, jshortArray pcm, jintArray spectrum, jint rate_hz) {
  constexpr char kMethod[] = "getSpectrum";
  constexpr jint kSamples = ORVALIS_FRAME_16K;
  constexpr jint kBins = ORVALIS_BINS_16K;
  if (check(env, kMethod, pcm, kSamples) != Access::kSamples ||
      check(env, kMethod, spectrum, kBins) != Access::kSamples)
    return 0;

  Elements<jshortArray> samples(env, pcm);
  const Elements<jintArray> bins(env, spectrum);
  if (samples.data() == nullptr || bins.data() == nullptr) {
    out_of_memory(kMethod);
    return 0;
  }
  int16_t frame[kSamples];
  int32_t power[kBins];
  std::memcpy(frame, samples.data(), sizeof frame);
  std::memcpy(power, bins.data(), sizeof power);
  samples.release();
  const jint result = getSpectrum(frame, power, rate_hz);
  std::memcpy(bins.data(), power, sizeof power);
  return result;
}

LOQUENT(jint, resetEPDparams)(JNIEnv *, jobject, jlong handle) {
  return ResetEPDparams(instance_of<EpdInstance>(handle));
}

LOQUENT(jstring, GetVersion)(JNIEnv *env, jobject) { return env->NewStringUTF(GetVersion()); }

LOQUENT(jint, LogEpdSetting)(JNIEnv *, jobject, jlong handle, jint value) {
  return setLogging(instance_of<EpdInstance>(handle), value);
}

LOQUENT(jint, freeMemoryEPD)(JNIEnv *, jobject, jlong handle) {
  return FreeMemoryEPD(instance_of<EpdInstance>(handle));
}

LOQUENT(jint, freeMemoryDoNS)(JNIEnv *, jobject, jlong handle) {
  return FreeMemoryNS(instance_of<NsInstance>(handle));
}

LOQUENT(jint, freeMemoryDRC)(JNIEnv *, jobject, jlong handle) { return FreeMemoryDRC(handle); }

#undef LOQUENT

}  // extern "C"
