#include "jni/java_strings.h"

#include <atomic>
#include <climits>
#include <cstddef>
#include <cstdlib>
#include <cstring>

#include "Voice_Engine/platform/export.h"
#include "Voice_Engine/platform/log.h"

namespace {

void log_error(const char *text) {
  orvalis::log_line(orvalis::kLogError, orvalis::kLogTag, "%s", text);
}

// Filled on first use. Threads that come first together store equivalent values.
constinit std::atomic<jclass> string_class = nullptr;

jclass find_string_class(JNIEnv *env) {
  if (const jclass known = string_class.load(std::memory_order_acquire)) return known;
  const jclass local = env->FindClass("java/lang/String");
  if (local == nullptr) {
    log_error("cls.error");
    return nullptr;
  }
  const auto global = static_cast<jclass>(env->NewGlobalRef(local));
  if (global == nullptr) {
    log_error("class_String.error");
    return nullptr;
  }
  string_class.store(global, std::memory_order_release);
  return global;
}

/// A method of String, looked up once.
struct Method {
  const char *name;
  const char *signature;
  const char *failure;
  std::atomic<jmethodID> found = nullptr;

  jmethodID find(JNIEnv *env, jclass type) {
    if (const jmethodID known = found.load(std::memory_order_acquire)) return known;
    const jmethodID id = env->GetMethodID(type, name, signature);
    if (id == nullptr) log_error(failure);
    found.store(id, std::memory_order_release);
    return id;
  }
};

constinit Method get_bytes = {"getBytes", "()[B", "mid_getBytes.error"};
constinit Method get_bytes_encoding = {"getBytes", "(Ljava/lang/String;)[B", "mid_getBytes.error"};
constinit Method new_string = {"<init>", "([B)V", "mid_newString.error"};
constinit Method new_string_encoding = {"<init>", "([BLjava/lang/String;)V", "mid_newString.error"};

// The variadic entries of JNI's table are called themselves, as from C: the C++ wrappers would take
// a way through va_list.

/// text.method(arguments...)
template <class... Arguments>
jbyteArray call_get_bytes(JNIEnv *env, Method &method, jstring text, Arguments... arguments) {
  const jclass type = find_string_class(env);
  if (type == nullptr) return nullptr;
  const jmethodID id = method.find(env, type);
  if (id == nullptr) return nullptr;
  return static_cast<jbyteArray>(env->functions->CallObjectMethod(env, text, id, arguments...));
}

/// new String(bytes, arguments...)
template <class... Arguments>
jstring call_new_string(JNIEnv *env, Method &constructor, jbyteArray bytes,
                        Arguments... arguments) {
  const jclass type = find_string_class(env);
  if (type == nullptr) return nullptr;
  const jmethodID id = constructor.find(env, type);
  if (id == nullptr) return nullptr;
  return static_cast<jstring>(env->functions->NewObject(env, type, id, bytes, arguments...));
}

}  // namespace

extern "C" {

ORVALIS_EXPORT jbyteArray cstr2jbyteArray(JNIEnv *env, const char *text) {
  if (text == nullptr) return nullptr;
  const std::size_t length = std::strlen(text);
  if (length > INT_MAX) return nullptr;
  const auto count = static_cast<jsize>(length);
  const jbyteArray bytes = env->NewByteArray(count);
  if (bytes == nullptr) return nullptr;
  env->SetByteArrayRegion(bytes, 0, count, reinterpret_cast<const jbyte *>(text));
  return bytes;
}

ORVALIS_EXPORT char *jbyteArray2cstr(JNIEnv *env, jbyteArray bytes) {
  if (bytes == nullptr) return nullptr;
  const auto length = static_cast<std::size_t>(env->GetArrayLength(bytes));
  jbyte *const elements = env->GetByteArrayElements(bytes, nullptr);
  if (elements == nullptr) return nullptr;
  auto *const text = static_cast<char *>(std::malloc(length + 1));
  if (text != nullptr) {
    std::strncpy(text, reinterpret_cast<const char *>(elements), length);
    text[length] = '\0';
  }
  env->ReleaseByteArrayElements(bytes, elements, JNI_ABORT);
  return text;
}

ORVALIS_EXPORT jbyteArray javaGetBytes(JNIEnv *env, jstring text) {
  log_error("Insert javaGetBytes");
  if (text == nullptr) return nullptr;
  return call_get_bytes(env, get_bytes, text);
}

ORVALIS_EXPORT jbyteArray javaGetBytesEncoding(JNIEnv *env, jstring text, const char *encoding) {
  log_error("Insert javaGetBytes");
  if (text == nullptr || encoding == nullptr) return nullptr;
  const jstring name = env->NewStringUTF(encoding);
  if (name == nullptr) return nullptr;
  return call_get_bytes(env, get_bytes_encoding, text, name);
}

ORVALIS_EXPORT jstring javaNewString(JNIEnv *env, jbyteArray bytes) {
  log_error("Insert javaNewString");
  if (bytes == nullptr) return nullptr;
  return call_new_string(env, new_string, bytes);
}

ORVALIS_EXPORT jstring javaNewStringEncoding(JNIEnv *env, jbyteArray bytes, const char *encoding) {
  if (bytes == nullptr || encoding == nullptr) return nullptr;
  const jstring name = env->NewStringUTF(encoding);
  if (name == nullptr) return nullptr;
  return call_new_string(env, new_string_encoding, bytes, name);
}

}  // extern "C"
