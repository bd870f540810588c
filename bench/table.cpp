#include "bench/table.h"

#include <cstdio>
#include <fstream>
#include <string>

namespace orvalis::bench {
namespace {

constexpr double kFrameNs = 1e7;  // the 10 ms of audio that a frame holds

std::string processor() {
  std::ifstream info("/proc/cpuinfo");
  for (std::string line; std::getline(info, line);) {
    if (line.starts_with("model name")) return line.substr(line.find(": ") + 2);
  }
  return "unknown processor";
}

constexpr const char *compiler() {
#ifdef __clang__
  return "Clang " __clang_version__;
#else
  return "GCC " __VERSION__;
#endif
}

}  // namespace

bool Table::ReportContext(const Context & /*context*/) {
  GetOutputStream() << processor() << ", " << compiler() << "\n\n";
  return true;
}

void Table::ReportRuns(const std::vector<Run> &runs) {
  char line[160];
  if (!has_heading_) {
    std::snprintf(line, sizeof line, "%-26s %12s %12s %12s %10s\n", "frame of 10 ms", "median [us]",
                  "worst [us]", "real time", "bytes");
    GetOutputStream() << line;
    has_heading_ = true;
  }
  for (const Run &run : runs) {
    if (run.aggregate_name != "median") continue;
    const double ns = run.GetAdjustedCPUTime() / run.counters.at(kFrames);
    const auto bytes = static_cast<int>(run.counters.at(kInstanceBytes));
    std::snprintf(line, sizeof line, "%-26s %12.2f %12.2f %12.6f %10s\n",
                  run.run_name.function_name.c_str(), ns / 1000,
                  run.counters.at(kWorstFrame) / 1000, ns / kFrameNs,
                  bytes > 0 ? std::to_string(bytes).c_str() : "-");
    GetOutputStream() << line;
  }
  GetOutputStream().flush();
}

}  // namespace orvalis::bench
