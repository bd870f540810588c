// Runs the benchmarks on real speech. Google Benchmark's options work, such as
// --benchmark_filter=fft.
#include <benchmark/benchmark.h>

#include "bench/frame_costs.h"
#include "bench/table.h"
#include "jni/orvalis.h"

int main(int argc, char **argv) {
  benchmark::Initialize(&argc, argv);
  if (benchmark::ReportUnrecognizedArguments(argc, argv)) return 2;
  // Writing lines would cost more than the frames.
  SetLogSink(LogNothing, nullptr);
  orvalis::bench::register_frame_costs();
  orvalis::bench::Table table;
  benchmark::RunSpecifiedBenchmarks(&table);
  benchmark::Shutdown();
}
