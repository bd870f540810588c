// Several inputs processed at once, while all that is printed keeps the order of the inputs.
#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "cli/console.h"
#include "cli/report.h"

namespace orvalis::cli {

class Turns;

/// The processing of one input, on a thread of its own.
class Job {
public:
  Job(std::string input, std::size_t number, Turns &turns, Console &console);

  const std::string &input() const { return input_; }

  /// The input's place among all, from 0.
  std::size_t number() const { return number_; }

  /// Performs `action` once all jobs before this one have ended: now, or later on another thread.
  void in_turn(std::function<void()> action);

  /// Prints in turn, on standard error, something to know about the input.
  void note(const std::string &text);

  /// The same of an error, which is not dropped when notes are.
  void print_error(const std::string &text);

  /// Called after each chunk. `length_s`: of the whole input, if known.
  void show_progress(double processed_s, std::optional<double> length_s);

private:
  std::string input_;
  std::size_t number_;
  Turns &turns_;
  Console &console_;
  std::chrono::steady_clock::time_point start_;
};

/// Passes the findings of a job to a report in turn.
class ReportInTurn : public Report {
public:
  ReportInTurn(Report &report, Job &job) : report_(report), job_(job) {}

  void begin_file(const std::string &name, int rate_hz, Reported reported) override;
  void utterance(const Utterance &found) override;
  void silence(const Silence &found) override;
  void frame(std::int64_t number, int decision) override;
  void trace(std::int64_t number, double start_s, const Trace &values) override;
  void statistics(const Statistics &values) override;
  void end_file(std::int64_t samples) override;

private:
  Report &report_;
  Job &job_;
};

/// Calls `process` for each input, on up to `threads` threads. An AudioError that it throws is
/// printed, and the other inputs are processed all the same; any other exception, the first in the
/// order of the inputs, ends everything and is thrown here. Returns the exit status. If standard
/// input is among the inputs, Ctrl-C ends that input and not the tool.
int process_files(const std::vector<std::string> &inputs, std::size_t threads, Console &console,
                  const std::function<void(Job &job)> &process);

}  // namespace orvalis::cli
