// Keeps the library's log lines, which the digests hold, out of a test's output.
#pragma once

#include "orvalis.h"

namespace orvalis::test {

struct QuietLog {
  QuietLog() {
    SetLogSink([](int, const char *, const char *, void *) {}, nullptr);
  }
  ~QuietLog() { SetLogSink(nullptr, nullptr); }
  QuietLog(const QuietLog &) = delete;
  QuietLog &operator=(const QuietLog &) = delete;
};

}  // namespace orvalis::test
