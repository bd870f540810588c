// What the tool prints of its findings, in the formats that it knows.
#pragma once

#include <cstdint>
#include <exception>
#include <memory>
#include <string>

#include "cli/trace.h"
#include "utterance_stream.h"

namespace orvalis::cli {

/// Takes findings in the order of the audio and prints each at once. A method throws
/// std::system_error if standard output does not take the text.
class Report {
public:
  virtual ~Report() = default;

  /// Samples are counted at rate_hz from here on.
  virtual void begin_file(const std::string &name, int rate_hz) = 0;
  virtual void utterance(const Utterance &utterance) = 0;
  /// The detector's answer to a frame of 10 ms, numbered from 0.
  virtual void frame(std::int64_t number, int answer) = 0;
  /// What led to an answer; start_s is the time at which the frame starts. For csv and json.
  virtual void trace(std::int64_t number, double start_s, const Trace &values) = 0;
  /// All of `samples` were heard.
  virtual void end_file(std::int64_t samples) = 0;
};

/// For a reader. `headings`: several files are coming, each gets its name above it.
std::unique_ptr<Report> make_table_report(bool headings);

/// For a program: an object a line.
std::unique_ptr<Report> make_json_report();

/// Writes to standard output and flushes; throws std::system_error if that fails.
void print_line(const std::string &line);

/// Writes "orvalis: ..." to standard error; there is nobody to tell if that fails.
void print_error(const std::string &message);

/// Tells standard error something about the input of that name.
void print_note(const std::string &name, const std::string &text);

/// Tells standard error what is wrong with the input of that name.
void print_input_error(const std::string &name, const std::exception &error);

}  // namespace orvalis::cli
