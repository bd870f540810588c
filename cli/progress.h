// How far long work is: one line on standard error that is rewritten in place, on a terminal only.
#pragma once

#include <chrono>
#include <optional>
#include <string>

namespace orvalis::cli {

/// How far one input is.
struct Advance {
  std::string name;
  double heard_s = 0;
  std::optional<double> length_s;
  double elapsed_s = 0;
};

/// Like all printing, for one thread at a time.
class Progress {
public:
  using Clock = std::chrono::steady_clock;

  Progress();
  ~Progress();
  Progress(const Progress &) = delete;
  Progress &operator=(const Progress &) = delete;

  /// Shows the line if a reader would want it by now: not before a second has gone, and not more
  /// often than can be read.
  void update(const Advance &advance);

private:
  bool shown_;  // standard error is a terminal
  Clock::time_point next_;
};

/// Clears the line if it is there, before something else is printed.
void wipe_progress();

}  // namespace orvalis::cli
