// The tool's standard streams: what it prints, and the line on a terminal that shows its progress.
#pragma once

#include <chrono>
#include <optional>
#include <string>

namespace orvalis::cli {

/// How much of one input has been processed.
struct Progress {
  std::string name;
  double processed_s = 0;
  std::optional<double> length_s;
  double elapsed_s = 0;
};

/// Text for a reader: control characters, which file names may hold and terminals obey, appear as
/// \x1b and the like.
std::string printable(const std::string &text);

/// Used by one thread at a time; jobs print when it is their turn.
class Console {
public:
  /// The engine's log lines are dropped.
  Console();
  ~Console();
  Console(const Console &) = delete;
  Console &operator=(const Console &) = delete;

  /// Writes to standard output and flushes; throws std::system_error if that fails.
  void print_line(const std::string &line);

  /// Writes "orvalis: ..." to standard error, made printable; failures are ignored.
  void print_error(const std::string &message);

  /// The same about one input, which is named.
  void print_error(const std::string &input, const std::string &text);

  /// The same, of what is no error.
  void print_note(const std::string &input, const std::string &text);

  /// Rewrites the progress line on standard error if that is a terminal, though not in the first
  /// second, nor more often than a reader can follow. Anything else that is printed clears it.
  void show_progress(const Progress &progress);

  /// Drops notes and progress from now on.
  void be_quiet();

  /// Shows the engine's log lines on standard error, instead of progress.
  void show_engine_log();

  /// Reserves standard output for audio and returns its new descriptor: from now on, lines are
  /// printed on standard error.
  int reserve_standard_output();

private:
  using Clock = std::chrono::steady_clock;

  void clear_progress();

  bool shows_progress_;
  bool shows_notes_ = true;
  bool progress_is_shown_ = false;
  Clock::time_point next_progress_;
};

}  // namespace orvalis::cli
