// Collects the library's log lines.
#pragma once

#include <cstdio>
#include <ostream>
#include <string>
#include <utility>
#include <vector>

#include "orvalis.h"

namespace orvalis::test {

struct LogLine {
  int priority;
  std::string tag;
  std::string text;
  bool operator==(const LogLine &) const = default;
  friend std::ostream &operator<<(std::ostream &out, const LogLine &line) {
    return out << line.priority << '/' << line.tag << ": " << line.text;
  }
};

using LogLines = std::vector<LogLine>;

inline LogLine debug_line(std::string text) { return {3, "Orvalis", std::move(text)}; }

/// The same from a printf format and its values.
template <class Value, class... Values>
LogLine debug_line(const char *format, Value value, Values... values) {
  char text[200];
  std::snprintf(text, sizeof text, format, value, values...);
  return debug_line(text);
}

inline LogLine info_line(std::string text) { return {4, "Orvalis", std::move(text)}; }

class LogCapture {
public:
  LogCapture() {
    SetLogSink(
        [](int priority, const char *tag, const char *text, void *self) {
          static_cast<LogCapture *>(self)->lines_.push_back({priority, tag, text});
        },
        this);
  }
  ~LogCapture() { SetLogSink(nullptr, nullptr); }
  LogCapture(const LogCapture &) = delete;
  LogCapture &operator=(const LogCapture &) = delete;

  /// The lines since the last time.
  LogLines take() { return std::exchange(lines_, {}); }

private:
  LogLines lines_;
};

}  // namespace orvalis::test
