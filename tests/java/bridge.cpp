// The natives of the test class Bridge: whole recordings through the flat C interface, without the
// Java methods, and the string helpers as native code calls them.
#include <jni.h>

#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "jni/java_strings.h"
#include "jni/orvalis.h"

namespace {

using Pcm = std::vector<int16_t>;

Pcm samples_of(JNIEnv *env, jshortArray array) {
  Pcm samples(static_cast<std::size_t>(env->GetArrayLength(array)));
  env->GetShortArrayRegion(array, 0, static_cast<jsize>(samples.size()), samples.data());
  return samples;
}

jintArray java_array(JNIEnv *env, const std::vector<jint> &values) {
  const auto count = static_cast<jsize>(values.size());
  const jintArray array = env->NewIntArray(count);
  env->SetIntArrayRegion(array, 0, count, values.data());
  return array;
}

/// One result for each whole frame.
template <class Call>
jintArray results_of(JNIEnv *env, Pcm &samples, jint frame, Call call) {
  std::vector<jint> results;
  const auto length = static_cast<std::size_t>(frame);
  for (std::size_t at = 0; at + length <= samples.size(); at += length)
    results.push_back(call(static_cast<jint>(at) / frame, &samples[at]));
  return java_array(env, results);
}

std::string c_string(JNIEnv *env, jbyteArray bytes) {
  std::string text(static_cast<std::size_t>(env->GetArrayLength(bytes)), '\0');
  env->GetByteArrayRegion(bytes, 0, static_cast<jsize>(text.size()),
                          reinterpret_cast<jbyte *>(text.data()));
  return text;
}

}  // namespace

extern "C" {

#define BRIDGE(result, name) JNIEXPORT result JNICALL Java_com_zentq_tqe_phonoweave_Bridge_##name

BRIDGE(jintArray, epd)
(JNIEnv *env, jclass, jint mode, jshortArray pcm, jint frame, jint content_type, jint reset_at) {
  Pcm samples = samples_of(env, pcm);
  EpdInstance *epd = InitializeEPD(mode, 0);
  const jintArray results = results_of(env, samples, frame, [&](jint number, int16_t *at) {
    if (number == reset_at) ResetEPDparams(epd);
    return content_type < 0 ? ProcessEPDFrame(epd, at, frame)
                            : ProcessEPDFrameByCnttype(epd, at, frame, content_type);
  });
  FreeMemoryEPD(epd);
  return results;
}

BRIDGE(jintArray, ns)
(JNIEnv *env, jclass, jint mode, jint microphones, jshortArray in, jshortArray out, jint frame) {
  Pcm samples = samples_of(env, in);
  Pcm result = samples_of(env, out);
  NsInstance *ns = InitializeDoNS(mode, microphones, 0);
  const jintArray results = results_of(env, samples, frame, [&](jint number, int16_t *at) {
    return ProcessDoNSFrame(ns, at, frame, &result[static_cast<std::size_t>(number * frame)],
                            frame);
  });
  FreeMemoryNS(ns);
  env->SetShortArrayRegion(out, 0, static_cast<jsize>(result.size()), result.data());
  return results;
}

BRIDGE(jintArray, drc)(JNIEnv *env, jclass, jint rate_hz, jshortArray pcm, jint frame) {
  Pcm samples = samples_of(env, pcm);
  const int64_t drc = InitializeDRC(rate_hz, 0);
  const jintArray results = results_of(
      env, samples, frame, [&](jint, int16_t *at) { return ProcessDRC(drc, at, frame); });
  FreeMemoryDRC(drc);
  env->SetShortArrayRegion(pcm, 0, static_cast<jsize>(samples.size()), samples.data());
  return results;
}

BRIDGE(jintArray, energy)(JNIEnv *env, jclass, jint rate_hz, jshortArray pcm, jint frame) {
  Pcm samples = samples_of(env, pcm);
  return results_of(env, samples, frame,
                    [&](jint, int16_t *at) { return ComputeEnergy(at, frame, rate_hz); });
}

/// The 128 numbers of each frame of 160 samples, one frame after the other.
BRIDGE(jintArray, spectrum)(JNIEnv *env, jclass, jint rate_hz, jshortArray pcm) {
  const Pcm samples = samples_of(env, pcm);
  std::vector<jint> power(samples.size() / 160 * 128);
  for (std::size_t frame = 0; frame < samples.size() / 160; ++frame)
    getSpectrum(&samples[160 * frame], &power[128 * frame], rate_hz);
  return java_array(env, power);
}

BRIDGE(jbyteArray, fromC)(JNIEnv *env, jclass, jbyteArray text) {
  return cstr2jbyteArray(env, text == nullptr ? nullptr : c_string(env, text).c_str());
}

BRIDGE(jbyteArray, toC)(JNIEnv *env, jclass, jbyteArray bytes) {
  char *text = jbyteArray2cstr(env, bytes);
  if (text == nullptr) return nullptr;
  const auto length = static_cast<jsize>(std::strlen(text));
  const jbyteArray copy = env->NewByteArray(length);
  env->SetByteArrayRegion(copy, 0, length, reinterpret_cast<jbyte *>(text));
  std::free(text);
  return copy;
}

BRIDGE(jbyteArray, getBytes)(JNIEnv *env, jclass, jstring text) { return javaGetBytes(env, text); }

BRIDGE(jbyteArray, getBytesEncoding)
(JNIEnv *env, jclass, jstring text, jbyteArray encoding) {
  return javaGetBytesEncoding(env, text,
                              encoding == nullptr ? nullptr : c_string(env, encoding).c_str());
}

BRIDGE(jstring, newString)(JNIEnv *env, jclass, jbyteArray bytes) {
  return javaNewString(env, bytes);
}

BRIDGE(jstring, newStringEncoding)
(JNIEnv *env, jclass, jbyteArray bytes, jbyteArray encoding) {
  return javaNewStringEncoding(env, bytes,
                               encoding == nullptr ? nullptr : c_string(env, encoding).c_str());
}

}  // extern "C"
