// What the tool prints of its findings, and in which formats.
#pragma once

#include <utterance_stream.h>

#include <cstdint>
#include <memory>
#include <string>
#include <variant>
#include <vector>

#include "cli/console.h"

namespace orvalis::cli {

struct TraceValue {
  const char *name;
  std::variant<std::int64_t, float> value;
};

/// What led a detector to its decision on a frame.
using Trace = std::vector<TraceValue>;

/// What is reported of a file.
enum class Reported { kUtterances, kSilences, kFrames, kTrace, kStatistics };

inline bool is_frames(Reported reported) {
  return reported == Reported::kFrames || reported == Reported::kTrace;
}

/// What lies between two utterances, or between one and the start or the end of the audio. In
/// samples.
struct Silence {
  std::int32_t number;  ///< 1, 2, 3 ...
  std::int64_t start, end;
};

/// Of a whole file. Lengths are in samples.
struct Statistics {
  std::int64_t length = 0;
  std::int64_t speech = 0;  ///< Of all utterances together
  std::int32_t utterances = 0;
  std::int64_t clipped = 0;  ///< Samples

  double share() const {
    return length > 0 ? static_cast<double>(speech) / static_cast<double>(length) : 0;
  }
};

/// Prints findings in the order of the audio, each at once. All methods throw std::system_error if
/// standard output fails.
class Report {
public:
  virtual ~Report() = default;

  /// From here on, samples are counted at `rate_hz`.
  virtual void begin_file(const std::string &name, int rate_hz, Reported reported) = 0;
  virtual void utterance(const Utterance &found) = 0;
  virtual void silence(const Silence &found) = 0;
  /// The decision on a frame of 10 ms, numbered from 0.
  virtual void frame(std::int64_t number, int decision) = 0;
  /// A frame that starts at `start_s`, and what led to the decision on it.
  virtual void trace(std::int64_t number, double start_s, const Trace &values) = 0;
  virtual void statistics(const Statistics &values) = 0;
  /// `samples`: length of the file.
  virtual void end_file(std::int64_t samples) = 0;
};

struct ReportFormat {
  std::string name;
  bool several_files;  ///< Whether one report can describe them
  bool rows;           ///< Whether it can hold frames and statistics
  bool trace;          ///< Whether it can hold traces
  /// `headings`: several files follow, and each one's name is printed above it.
  std::unique_ptr<Report> (*make)(Console &console, bool headings);
};

const std::vector<ReportFormat> &report_formats();

}  // namespace orvalis::cli
