// Log lines: to Android's log there, elsewhere to the host's sink or standard error.
#pragma once

namespace orvalis {

inline constexpr char kLogTag[] = "Orvalis";

/// Priorities of the Android log.
inline constexpr int kLogDebug = 3;
inline constexpr int kLogInfo = 4;
inline constexpr int kLogWarning = 5;
inline constexpr int kLogError = 6;

using LogSink = void (*)(int priority, const char *tag, const char *text, void *user);

/// Sets where log lines go; null restores the default, which writes warnings and errors to standard
/// error. Not to be changed while instances run.
void set_log_sink(LogSink sink, void *user);

/// Sinks that write every line to standard error, or none.
void log_all_to_standard_error(int priority, const char *tag, const char *text, void *user);
void log_nothing(int priority, const char *tag, const char *text, void *user);

/// Writes one line. Texts are truncated to 255 bytes. What the default or log_nothing would drop is
/// not formatted.
__attribute__((format(printf, 3, 4))) void log_line(int priority, const char *tag,
                                                    const char *format, ...);

}  // namespace orvalis
