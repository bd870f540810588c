// One line a benchmark: what a frame costs, instead of Google Benchmark's own columns.
#pragma once

#include <benchmark/benchmark.h>

namespace orvalis::bench {

/// Names of the counters that the table reads.
inline constexpr char kWorstFrame[] = "worst_ns";
inline constexpr char kInstanceBytes[] = "instance_bytes";
inline constexpr char kFrames[] = "frames";

/// Prints the median of the repetitions as soon as a benchmark is done.
class Table : public benchmark::BenchmarkReporter {
public:
  bool ReportContext(const Context &context) override;
  void ReportRuns(const std::vector<Run> &runs) override;

private:
  bool has_heading_ = false;
};

}  // namespace orvalis::bench
