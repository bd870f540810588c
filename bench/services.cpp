// What a frame of 10 ms costs in each service, by each of its bodies that this processor can run.
//
//   orvalis_services                      the table
//   orvalis_services --rows               the rows of the table, numbered
//   orvalis_services --run ROW FRAMES     runs one row on so many frames of speech, for a profiler
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <string_view>

#include "Voice_Engine/bodies/services.h"
#include "bench/machine.h"
#include "bench/slots.h"

namespace orvalis::bench {
namespace {

constexpr const ServiceKind *kServices[] = {&kDetection16,    &kDetection8,      &kOneMicrophone,
                                            &kTwoMicrophones, &kDynamicsControl, &kAllInARow,
                                            &kMcraDetection};

struct NamedSet {
  InstructionSet set;
  const char *name;
};
constexpr NamedSet kSets[] = {{InstructionSet::kPortable, "portable"},
                              {InstructionSet::kSse2, "SSE2"},
                              {InstructionSet::kAvx2, "AVX2"},
                              {InstructionSet::kNeon, "NEON"}};

struct Variant {
  const ServiceKind *kind;
  NamedSet body;
};

/// Each service by each body; those that have one body only, once.
std::vector<Variant> variants() {
  std::vector<Variant> variants;
  for (const ServiceKind *kind : kServices) {
    if (!kind->has_bodies) {
      variants.push_back({kind, {best_instruction_set(), "-"}});
      continue;
    }
    for (const NamedSet &body : kSets)
      if (has_instruction_set(body.set)) variants.push_back({kind, body});
  }
  return variants;
}

struct Worst {
  double to_median = 0;
  const char *signal = nullptr;
};

/// The costliest frame of each signal, beside the median frame of that signal; the largest of these
/// ratios. Every frame counts by its fastest pass, which no interruption has slowed down.
Worst worst_frame(const Variant &variant, const std::vector<Signal> &signals) {
  using Clock = std::chrono::steady_clock;
  constexpr int kPasses = 25;
  constexpr double kSkippedNs = 150;  // below it frames are skipped, and steps of the clock decide
  use_instruction_set(variant.body.set);
  const auto service = variant.kind->create();
  Worst worst;
  for (const Signal &signal : signals) {
    std::vector<double> fastest(signal.frames(), HUGE_VAL);
    for (int pass = 0; pass < kPasses; ++pass) {
      service->start();
      for (std::size_t i = 0; i < signal.frames(); ++i) {
        const Clock::time_point before = Clock::now();
        service->process(signal.frame(i));
        const std::chrono::duration<double, std::nano> spent = Clock::now() - before;
        fastest[i] = std::min(fastest[i], spent.count());
      }
    }
    const double median = spread(fastest).median;
    if (median < kSkippedNs) continue;
    const double to_median = *std::ranges::max_element(fastest) / median;
    if (to_median > worst.to_median) worst = {to_median, signal.name};
  }
  return worst;
}

void print_table() {
  const std::vector<Variant> all = variants();
  std::vector<Row> rows;
  for (const Variant &variant : all) {
    rows.push_back({variant.kind->create(), speech_for(*variant.kind),
                    [set = variant.body.set] { use_instruction_set(set); }});
  }
  run_in_slots(rows);
  std::printf("%s\n\n%-28s %-9s %8s %11s %13s  %-24s %6s\n", machine().c_str(), "frame of 10 ms",
              "body", "ns", "of portable", "worst/median", "(in which signal)", "bytes");
  std::size_t first = 0;
  for (std::size_t i = 0; i < all.size(); ++i) {
    const Variant &variant = all[i];
    if (variant.kind != all[first].kind) first = i;
    const Worst worst = worst_frame(variant, signals_for(*variant.kind));
    char of_portable[16] = "-";
    if (variant.kind->has_bodies)
      std::snprintf(of_portable, sizeof of_portable, "%.3f", ratio(rows[i], rows[first]).median);
    std::printf("%-28s %-9s %8.0f %11s %13.2f  %-24s %6zu\n", variant.kind->name, variant.body.name,
                spread(rows[i].slots).median, of_portable, worst.to_median, worst.signal,
                variant.kind->bytes);
    std::fflush(stdout);
  }
}

int run(const char *number, const char *frame_count) {
  const std::vector<Variant> all = variants();
  const auto row = std::strtoul(number, nullptr, 10);
  const auto frames = std::strtoul(frame_count, nullptr, 10);
  if (row >= all.size()) return std::fprintf(stderr, "there is no row %s\n", number), 2;
  use_instruction_set(all[row].body.set);
  const Signal speech = speech_for(*all[row].kind);
  const auto service = all[row].kind->create();
  service->start();
  for (std::size_t i = 0; i < frames; ++i) service->process(speech.frame(i));
  return 0;
}

}  // namespace
}  // namespace orvalis::bench

int main(int argc, char **argv) {
  using namespace orvalis::bench;
  SetLogSink(LogNothing, nullptr);
  const std::string_view option = argc > 1 ? argv[1] : "";
  if (option == "--run" && argc == 4) return run(argv[2], argv[3]);
  if (option == "--rows") {
    int number = 0;
    for (const Variant &variant : variants())
      std::printf("%d\t%-28s %-9s\n", number++, variant.kind->name, variant.body.name);
    return 0;
  }
  if (argc > 1) {
    std::fprintf(stderr, "usage: %s [--rows | --run ROW FRAMES]\n", argv[0]);
    return 2;
  }
  print_table();
}
