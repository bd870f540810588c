#include "Voice_Engine/platform/log.h"

#include <atomic>
#include <cstdarg>
#include <cstdio>

#ifdef __ANDROID__
#include <android/log.h>
#endif

namespace orvalis {
namespace {

void write_to_standard_error(int priority, const char *tag, const char *text, void *) {
  const char letter = priority >= kLogError ? 'E' : priority >= kLogInfo ? 'I' : 'D';
  std::fprintf(stderr, "%c/%s: %s\n", letter, tag, text);
}

// Two separate atomics: a host whose sinks ignore `user` may change them at any time.
constinit std::atomic<LogSink> current_sink = write_to_standard_error;
constinit std::atomic<void *> current_user = nullptr;

}  // namespace

void set_log_sink(LogSink sink, void *user) {
  current_user.store(user, std::memory_order_relaxed);
  current_sink.store(sink != nullptr ? sink : write_to_standard_error, std::memory_order_release);
}

void log_line(int priority, const char *tag, const char *format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
#ifdef __ANDROID__
  __android_log_vprint(priority, tag, format, arguments);
#else
  char text[256];
  std::vsnprintf(text, sizeof text, format, arguments);
  const LogSink sink = current_sink.load(std::memory_order_acquire);
  sink(priority, tag, text, current_user.load(std::memory_order_relaxed));
#endif
  va_end(arguments);
}

}  // namespace orvalis
