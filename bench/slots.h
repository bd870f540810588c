// Comparisons within one run on a machine that does other work too: rows take turns in slots of
// half a second of audio, so that whatever disturbs one disturbs its neighbours, and what counts is
// the median.
#pragma once

#include <algorithm>
#include <ctime>
#include <functional>
#include <memory>
#include <vector>

#include "bench/signals.h"

namespace orvalis::bench {

struct Row {
  std::unique_ptr<Service> service;
  Signal signal;
  std::function<void()> prepare = [] {};  ///< before each slot, not measured
  std::vector<double> slots{};            ///< ns a frame
};

/// A median between the quartiles.
struct Spread {
  double low, median, high;
};

inline Spread spread(std::vector<double> values) {
  std::ranges::sort(values);
  const std::size_t count = values.size();
  return {values[count / 4], values[count / 2], values[count - 1 - count / 4]};
}

/// What a frame of `row` costs as a part of what one of `other` does, slot by slot.
inline Spread ratio(const Row &row, const Row &other) {
  std::vector<double> ratios;
  for (std::size_t i = 0; i < row.slots.size(); ++i)
    ratios.push_back(row.slots[i] / other.slots[i]);
  return spread(ratios);
}

/// Processor time of this thread.
inline double thread_ns() {
  std::timespec now{};
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return 1e9 * static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec);
}

/// Runs every row in turn, again and again.
inline void run_in_slots(std::vector<Row> &rows) {
  constexpr std::size_t kSlots = 301;
  constexpr std::size_t kFrames = 50;
  for (Row &row : rows) row.service->start();
  for (std::size_t slot = 0; slot < kSlots; ++slot) {
    for (Row &row : rows) {
      row.prepare();
      // What the other rows drove out of the caches is fetched before the clock starts.
      std::size_t next = slot * kFrames;
      for (std::size_t end = next + kFrames / 5; next < end; ++next)
        row.service->process(row.signal.frame(next));
      const double start = thread_ns();
      for (const std::size_t end = (slot + 1) * kFrames; next < end; ++next)
        row.service->process(row.signal.frame(next));
      row.slots.push_back((thread_ns() - start) / (kFrames - kFrames / 5));
    }
  }
}

}  // namespace orvalis::bench
