#include "Voice_Engine/platform/log.h"

#include <atomic>
#include <cstdarg>
#include <cstdio>

#ifdef __ANDROID__
#include <android/log.h>
#endif

namespace orvalis {
namespace {

/// The default. log_line() hands it warnings and errors only.
void log_problems(int priority, const char *tag, const char *text, void *user) {
  log_all_to_standard_error(priority, tag, text, user);
}

// Two separate atomics: a host whose sinks ignore `user` may change them at any time.
constinit std::atomic<LogSink> current_sink = log_problems;
constinit std::atomic<void *> current_user = nullptr;

}  // namespace

void log_all_to_standard_error(int priority, const char *tag, const char *text, void *) {
  const char letter = priority >= kLogError     ? 'E'
                      : priority >= kLogWarning ? 'W'
                      : priority >= kLogInfo    ? 'I'
                                                : 'D';
  std::fprintf(stderr, "%c/%s: %s\n", letter, tag, text);
}

void log_nothing(int, const char *, const char *, void *) {}

void set_log_sink(LogSink sink, void *user) {
  current_user.store(user, std::memory_order_relaxed);
  current_sink.store(sink != nullptr ? sink : log_problems, std::memory_order_release);
}

void log_line(int priority, const char *tag, const char *format, ...) {
  std::va_list arguments;
#ifdef __ANDROID__
  va_start(arguments, format);
  __android_log_vprint(priority, tag, format, arguments);
#else
  const LogSink sink = current_sink.load(std::memory_order_acquire);
  if (sink == log_nothing || (sink == log_problems && priority < kLogWarning)) return;
  va_start(arguments, format);
  char text[256];
  std::vsnprintf(text, sizeof text, format, arguments);
  sink(priority, tag, text, current_user.load(std::memory_order_relaxed));
#endif
  va_end(arguments);
}

}  // namespace orvalis
