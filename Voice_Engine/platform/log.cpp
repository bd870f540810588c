#include "Voice_Engine/platform/log.h"

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

struct Destination {
  LogSink sink;
  void *user;
};

constexpr Destination kStandardError = {write_to_standard_error, nullptr};

constinit Destination destination = kStandardError;

}  // namespace

void set_log_sink(LogSink sink, void *user) {
  destination = sink != nullptr ? Destination{sink, user} : kStandardError;
}

void log_line(int priority, const char *tag, const char *format, ...) {
  std::va_list arguments;
  va_start(arguments, format);
#ifdef __ANDROID__
  __android_log_vprint(priority, tag, format, arguments);
#else
  char text[256];
  std::vsnprintf(text, sizeof text, format, arguments);
  destination.sink(priority, tag, text, destination.user);
#endif
  va_end(arguments);
}

}  // namespace orvalis
