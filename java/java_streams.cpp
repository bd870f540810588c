// The natives of SafeLayer: both streams, and the sink that passes log lines to Java. They are
// registered when the library is loaded, so that their names are not exported.
#include <jni.h>

#include <algorithm>
#include <atomic>
#include <iterator>

#include "Voice_Engine/platform/log.h"
#include "jni/orvalis.h"
#include "stream/enhancement_stream.h"
#include "stream/utterance_stream.h"

namespace {

constexpr jint kJniVersion = JNI_VERSION_1_6;

UtteranceStream *stream_of(jlong handle) {
  return reinterpret_cast<UtteranceStream *>(static_cast<intptr_t>(handle));
}

/// 0 if memory runs out or a setting is refused. The values have the order of UtteranceSettings.
jlong JNICALL open_stream(JNIEnv *env, jclass, jintArray values) {
  UtteranceSettings settings = UTTERANCE_SETTINGS_DEFAULT;
  int32_t *const fields[] = {&settings.rate_hz,     &settings.input_gain,    &settings.content_type,
                             &settings.hangover_ms, &settings.pad_before_ms, &settings.pad_after_ms,
                             &settings.detector,    &settings.min_speech_ms, &settings.lead_in};
  jint numbers[std::size(fields)];
  if (values == nullptr || env->GetArrayLength(values) != jint{std::size(fields)}) return 0;
  env->GetIntArrayRegion(values, 0, jint{std::size(fields)}, numbers);
  for (std::size_t i = 0; i < std::size(fields); ++i) *fields[i] = numbers[i];
  return reinterpret_cast<intptr_t>(OpenUtteranceStream(&settings));
}

/// Samples that are copied from Java at a time.
constexpr jint kMaxChunk = 1024;

bool holds(JNIEnv *env, jshortArray pcm, jint offset, jint count) {
  return pcm != nullptr && offset >= 0 && count >= 0 && offset <= env->GetArrayLength(pcm) - count;
}

/// How many of the samples were taken; -1 if they are not all in the array, or after the flush.
jint JNICALL push_audio(JNIEnv *env, jclass, jlong stream, jshortArray pcm, jint offset,
                        jint count) {
  if (!holds(env, pcm, offset, count)) return -1;
  jshort chunk[kMaxChunk];
  jint done = 0;
  while (done < count) {
    const jint samples = std::min(count - done, kMaxChunk);
    env->GetShortArrayRegion(pcm, offset + done, samples, chunk);
    const jint taken = PushUtteranceAudio(stream_of(stream), chunk, samples);
    if (taken < 0) return -1;
    done += taken;
    if (taken < samples) break;
  }
  return done;
}

/// Stores start, end, began, ended, number and open of the next utterance. Returns 1 if there was
/// one.
jint JNICALL next_utterance(JNIEnv *env, jclass, jlong stream, jlongArray fields) {
  Utterance found;
  const jint result = NextUtterance(stream_of(stream), &found);
  if (result == 1) {
    const jlong values[] = {found.start, found.end,    found.began,
                            found.ended, found.number, found.open};
    env->SetLongArrayRegion(fields, 0, std::size(values), values);
  }
  return result;
}

jint JNICALL flush_stream(JNIEnv *, jclass, jlong stream) {
  return FlushUtteranceStream(stream_of(stream));
}

jint JNICALL close_stream(JNIEnv *, jclass, jlong stream) {
  return CloseUtteranceStream(stream_of(stream));
}

EnhancementStream *enhancement_of(jlong handle) {
  return reinterpret_cast<EnhancementStream *>(static_cast<intptr_t>(handle));
}

jlong JNICALL open_enhancement(JNIEnv *, jclass, jint microphones, jint suppression_db,
                               jboolean level, jboolean aligned) {
  const EnhancementSettings settings = {.microphones = microphones,
                                        .suppression_db = suppression_db,
                                        .level = level,
                                        .aligned = aligned};
  return reinterpret_cast<intptr_t>(OpenEnhancementStream(&settings));
}

jint JNICALL enhancement_delay(JNIEnv *, jclass, jlong stream) {
  return EnhancementDelay(enhancement_of(stream));
}

/// How many samples of output there were; -1 if the samples are not all in the array, or after the
/// flush.
jint JNICALL enhance(JNIEnv *env, jclass, jlong stream, jshortArray pcm, jint offset, jint count,
                     jshortArray output) {
  if (!holds(env, pcm, offset, count)) return -1;
  jshort in[kMaxChunk], out[kMaxChunk + ENHANCEMENT_HELD_BACK];
  jint done = 0, ready = 0;
  do {
    const jint samples = std::min(count - done, kMaxChunk);
    env->GetShortArrayRegion(pcm, offset + done, samples, in);
    const jint written =
        PushEnhancementAudio(enhancement_of(stream), in, samples, out, std::size(out));
    if (written < 0) return -1;
    env->SetShortArrayRegion(output, ready, written, out);
    done += samples;
    ready += written;
  } while (done < count);
  return ready;
}

/// How many samples of output were left; -1 if the last pair of samples is incomplete.
jint JNICALL flush_enhancement(JNIEnv *env, jclass, jlong stream, jshortArray output) {
  jshort out[ENHANCEMENT_HELD_BACK];
  const jint ready = FlushEnhancementStream(enhancement_of(stream), out, std::size(out));
  if (ready > 0) env->SetShortArrayRegion(output, 0, ready, out);
  return ready;
}

jboolean JNICALL is_loud(JNIEnv *, jclass, jlong stream) {
  EnhancementCounts counts = {};
  GetEnhancementCounts(enhancement_of(stream), &counts);
  return counts.is_loud == 1;
}

jint JNICALL close_enhancement(JNIEnv *, jclass, jlong stream) {
  return CloseEnhancementStream(enhancement_of(stream));
}

// What send_line_to_java calls. Set before the first line, and never changed.
constinit std::atomic<JavaVM *> java_machine = nullptr;
constinit std::atomic<jclass> java_receiver = nullptr;
constinit std::atomic<jmethodID> java_receive = nullptr;

/// Lines of threads that Java does not know are dropped.
void send_line_to_java(int priority, const char *, const char *text, void *) {
  void *found = nullptr;
  if (java_machine.load()->GetEnv(&found, kJniVersion) != JNI_OK) return;
  auto *env = static_cast<JNIEnv *>(found);
  // The line may report a failure whose exception is pending: keep it for the caller.
  const jthrowable pending = env->ExceptionOccurred();
  env->ExceptionClear();
  if (const jstring line = env->NewStringUTF(text)) {
    env->CallStaticVoidMethod(java_receiver.load(), java_receive.load(), jint{priority}, line);
    env->DeleteLocalRef(line);
  }
  env->ExceptionClear();
  if (pending != nullptr) {
    env->Throw(pending);
    env->DeleteLocalRef(pending);
  }
}

/// Prepares `receiver`, a class with a static method line(int, String), for log lines.
bool can_send_to(JNIEnv *env, jclass receiver) {
  if (java_receiver.load() != nullptr) return true;
  JavaVM *machine = nullptr;
  if (env->GetJavaVM(&machine) != JNI_OK) return false;
  const jmethodID receive = env->GetStaticMethodID(receiver, "line", "(ILjava/lang/String;)V");
  if (receive == nullptr) return false;
  java_machine = machine;
  java_receive = receive;
  java_receiver = static_cast<jclass>(env->NewGlobalRef(receiver));
  return java_receiver.load() != nullptr;
}

/// 0: standard error, 1: nowhere, 2: the receiver. Calls must not overlap.
void JNICALL set_log_destination(JNIEnv *env, jclass receiver, jint destination) {
  if (destination == 0) {
    SetLogSink(LogAllToStandardError, nullptr);
  } else if (destination == 1) {
    SetLogSink(LogNothing, nullptr);
  } else if (can_send_to(env, receiver)) {
    SetLogSink(send_line_to_java, nullptr);
  }
}

/// JNINativeMethod takes no pointers to constants.
JNINativeMethod native(const char *name, const char *signature, void *function) {
  return {const_cast<char *>(name), const_cast<char *>(signature), function};
}

template <class Function>
void *address(Function *function) {
  return reinterpret_cast<void *>(function);
}

}  // namespace

extern "C" JNIEXPORT jint JNICALL JNI_OnLoad(JavaVM *machine, void *) {
  void *found = nullptr;
  if (machine->GetEnv(&found, kJniVersion) != JNI_OK) return JNI_ERR;
  auto *env = static_cast<JNIEnv *>(found);
  const JNINativeMethod natives[] = {
      native("openStream", "([I)J", address(open_stream)),
      native("pushAudio", "(J[SII)I", address(push_audio)),
      native("nextUtterance", "(J[J)I", address(next_utterance)),
      native("flushStream", "(J)I", address(flush_stream)),
      native("closeStream", "(J)I", address(close_stream)),
      native("openEnhancement", "(IIZZ)J", address(open_enhancement)),
      native("enhancementDelay", "(J)I", address(enhancement_delay)),
      native("enhance", "(J[SII[S)I", address(enhance)),
      native("flushEnhancement", "(J[S)I", address(flush_enhancement)),
      native("isLoud", "(J)Z", address(is_loud)),
      native("closeEnhancement", "(J)I", address(close_enhancement)),
      native("setLogDestination", "(I)V", address(set_log_destination)),
  };
  // Without the safe classes, which a shrinker may have removed, Loquent works all the same.
  const jclass safe_layer = env->FindClass("com/zentq/tqe/phonoweave/SafeLayer");
  if (safe_layer == nullptr ||
      env->RegisterNatives(safe_layer, natives, std::size(natives)) != JNI_OK)
    env->ExceptionClear();
  return kJniVersion;
}
