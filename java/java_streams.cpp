// The natives behind the safe Java classes: the utterance stream, and log lines on their way to
// Java. Registered when the library is loaded, so that no name of them is exported.
#include <jni.h>

#include <algorithm>
#include <atomic>
#include <iterator>

#include "Voice_Engine/platform/log.h"
#include "jni/orvalis.h"
#include "stream/utterance_stream.h"

namespace {

constexpr jint kJniVersion = JNI_VERSION_1_6;

UtteranceStream *stream_of(jlong handle) {
  return reinterpret_cast<UtteranceStream *>(static_cast<intptr_t>(handle));
}

jlong JNICALL open_stream(JNIEnv *, jclass, jint rate_hz, jint input_gain, jint content_type,
                          jint hangover_ms, jint pad_before_ms, jint pad_after_ms) {
  const UtteranceSettings settings = {.rate_hz = rate_hz,
                                      .input_gain = input_gain,
                                      .content_type = content_type,
                                      .hangover_ms = hangover_ms,
                                      .pad_before_ms = pad_before_ms,
                                      .pad_after_ms = pad_after_ms,
                                      .pcm_dump = 0};
  return reinterpret_cast<intptr_t>(OpenUtteranceStream(&settings));
}

/// How many of the samples were taken; -1 if they are not all in the array, or after the flush.
jint JNICALL push_audio(JNIEnv *env, jclass, jlong stream, jshortArray pcm, jint offset,
                        jint count) {
  if (pcm == nullptr || offset < 0 || count < 0 || offset > env->GetArrayLength(pcm) - count)
    return -1;
  jshort piece[1024];
  jint done = 0;
  while (done < count) {
    const jint samples = std::min<jint>(count - done, std::size(piece));
    env->GetShortArrayRegion(pcm, offset + done, samples, piece);
    const jint taken = PushUtteranceAudio(stream_of(stream), piece, samples);
    if (taken < 0) return -1;
    done += taken;
    if (taken < samples) break;
  }
  return done;
}

/// Stores start, end, began, ended, number and open of the next utterance: 1 if there was one.
jint JNICALL next_utterance(JNIEnv *env, jclass, jlong stream, jlongArray fields) {
  Utterance found;
  const jint answer = NextUtterance(stream_of(stream), &found);
  if (answer == 1) {
    const jlong values[] = {found.start, found.end,    found.began,
                            found.ended, found.number, found.open};
    env->SetLongArrayRegion(fields, 0, std::size(values), values);
  }
  return answer;
}

jint JNICALL flush_stream(JNIEnv *, jclass, jlong stream) {
  return FlushUtteranceStream(stream_of(stream));
}

jint JNICALL close_stream(JNIEnv *, jclass, jlong stream) {
  return CloseUtteranceStream(stream_of(stream));
}

// Where lines go that are meant for Java. Set before the first of them, and then kept.
constinit std::atomic<JavaVM *> java_machine = nullptr;
constinit std::atomic<jclass> java_receiver = nullptr;
constinit std::atomic<jmethodID> java_receive = nullptr;

/// Lines of threads that Java does not know are left out.
void send_line_to_java(int priority, const char *, const char *text, void *) {
  void *found = nullptr;
  if (java_machine.load()->GetEnv(&found, kJniVersion) != JNI_OK) return;
  auto *env = static_cast<JNIEnv *>(found);
  // A line may tell of a failure whose exception is pending; it is still to be seen afterwards.
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

void drop_line(int, const char *, const char *, void *) {}

/// Whether lines can be sent to `receiver`, a class with a static method line(int, String).
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

/// 0: standard error, 1: nowhere, 2: the receiver. The caller takes care that calls do not overlap.
void JNICALL set_log_destination(JNIEnv *env, jclass receiver, jint destination) {
  if (destination == 0) {
    SetLogSink(nullptr, nullptr);
  } else if (destination == 1) {
    SetLogSink(drop_line, nullptr);
  } else if (can_send_to(env, receiver)) {
    SetLogSink(send_line_to_java, nullptr);
  }
}

/// JNI's record has no room for constants.
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
      native("openStream", "(IIIIII)J", address(open_stream)),
      native("pushAudio", "(J[SII)I", address(push_audio)),
      native("nextUtterance", "(J[J)I", address(next_utterance)),
      native("flushStream", "(J)I", address(flush_stream)),
      native("closeStream", "(J)I", address(close_stream)),
      native("setLogDestination", "(I)V", address(set_log_destination)),
  };
  // An application that brings a Loquent of its own, without the safe classes, is served all the
  // same.
  const jclass safe_layer = env->FindClass("com/zentq/tqe/phonoweave/SafeLayer");
  if (safe_layer == nullptr ||
      env->RegisterNatives(safe_layer, natives, std::size(natives)) != JNI_OK)
    env->ExceptionClear();
  return kJniVersion;
}
