// How samples get from Java to the engine and back: arrays and counts are checked here, and samples
// copied.
#pragma once

#include <jni.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>

#include "Voice_Engine/platform/log.h"

namespace orvalis {

/// What a caller's array and count allow.
enum class Access {
  kSamples,  ///< there are samples to process
  kNothing,  ///< the count is 0 or less: no array is touched
  kRefused,  ///< the count is larger than the array
};

/// Checks the array and count that a method was given. What a correct caller never does is logged
/// in one line.
inline Access check(JNIEnv *env, const char *method, jarray array, jint count) {
  const jint length = array == nullptr ? 0 : env->GetArrayLength(array);
  if (array == nullptr || count < 0 || count > length) {
    log_line(kLogError, kLogTag, "TQE: %s: %d samples asked of an array of %d", method,
             static_cast<int>(count), static_cast<int>(length));
  }
  if (count <= 0) return Access::kNothing;
  return count > length ? Access::kRefused : Access::kSamples;
}

inline jshort *get_elements(JNIEnv *env, jshortArray array) {
  return env->GetShortArrayElements(array, nullptr);
}
inline jint *get_elements(JNIEnv *env, jintArray array) {
  return env->GetIntArrayElements(array, nullptr);
}
inline void release_elements(JNIEnv *env, jshortArray array, jshort *elements) {
  env->ReleaseShortArrayElements(array, elements, 0);
}
inline void release_elements(JNIEnv *env, jintArray array, jint *elements) {
  env->ReleaseIntArrayElements(array, elements, 0);
}

/// The elements of an array. The Java machine copies the whole array to get them, and back to
/// release them.
template <class Array>
class Elements {
public:
  Elements(JNIEnv *env, Array array)
      : env_(env), array_(array), elements_(get_elements(env, array)) {
    // The caller learns of it from the result, not from an exception.
    if (elements_ == nullptr) env->ExceptionClear();
  }
  ~Elements() { release(); }
  Elements(const Elements &) = delete;
  Elements &operator=(const Elements &) = delete;

  auto *data() const { return elements_; }

  void release() {
    if (elements_ != nullptr) release_elements(env_, array_, elements_);
    elements_ = nullptr;
  }

private:
  JNIEnv *env_;
  Array array_;
  decltype(get_elements(nullptr, Array{})) elements_;
};

/// A working copy of samples, followed by zeros as far as the engine may read: a small one on the
/// stack, a large one on the heap.
class WorkingCopy {
public:
  WorkingCopy(std::size_t count, std::size_t room)
      : count_(count),
        data_(room <= kMaxOnStack ? on_stack_
                                  : static_cast<int16_t *>(std::calloc(room, sizeof(int16_t)))) {
    if (data_ == on_stack_) std::memset(on_stack_ + count, 0, (room - count) * sizeof(int16_t));
  }
  ~WorkingCopy() {
    if (data_ != on_stack_) std::free(data_);
  }
  WorkingCopy(const WorkingCopy &) = delete;
  WorkingCopy &operator=(const WorkingCopy &) = delete;

  /// Null if memory ran out.
  int16_t *data() { return data_; }

  void fill_from(const jshort *samples) { std::memcpy(data_, samples, count_ * sizeof *data_); }
  void store_to(jshort *samples) const { std::memcpy(samples, data_, count_ * sizeof *data_); }

private:
  static constexpr std::size_t kMaxOnStack = 1024;

  std::size_t count_;
  int16_t *data_;
  int16_t on_stack_[kMaxOnStack];
};

/// Logs that memory ran out, and returns the methods' result for that.
inline jint out_of_memory(const char *method) {
  log_line(kLogError, kLogTag, "TQE: %s: out of memory", method);
  return -1;
}

}  // namespace orvalis
