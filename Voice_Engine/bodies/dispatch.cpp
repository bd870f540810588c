#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <initializer_list>
#include <iterator>
#include <type_traits>

#include "Voice_Engine/bodies/services.h"
#include "Voice_Engine/channel/channel_analysis.h"
#include "Voice_Engine/channel/fixed_fft_kernel.h"
#include "Voice_Engine/channel/frame_screening.h"
#include "Voice_Engine/drc/dynamics_control.h"
#include "Voice_Engine/ns/s1chns.h"

namespace orvalis {
namespace {

const Services *chosen = nullptr;  // atomically: any thread may be the first

const Services &bodies_of(InstructionSet set) {
  switch (set) {
#if defined(__x86_64__) || defined(__i386__)
    case InstructionSet::kAvx2:
      return avx2::kServices;
    case InstructionSet::kSse2:
      return sse2::kServices;
#elif defined(__aarch64__)
    case InstructionSet::kNeon:
      return neon::kServices;
#endif
    default:
      return portable::kServices;
  }
}

inline const Services &services() {
  const Services *services = __atomic_load_n(&chosen, __ATOMIC_RELAXED);
  if (services != nullptr) [[likely]]
    return *services;
  use_instruction_set(best_instruction_set());
  return bodies_of(best_instruction_set());
}

/// Memory that a service changes.
struct Region {
  void *at;
  std::size_t size;
};

template <class T>
Region region(T &object) {
  return {&object, sizeof object};
}
template <class T>
Region region(T *array, int size) {
  return {array, static_cast<std::size_t>(size) * sizeof(T)};
}

#ifdef ORVALIS_CHECK_BODIES

/// A copy of what a service changes.
class Copies {
public:
  explicit Copies(std::initializer_list<Region> regions) : regions_(regions) {
    each([](void *at, std::byte *copy, std::size_t size) {
      std::memcpy(copy, at, size);
      return true;
    });
  }
  void restore() {
    each([](void *at, const std::byte *copy, std::size_t size) {
      std::memcpy(at, copy, size);
      return true;
    });
  }
  bool hold_now() {
    return each([](const void *at, const std::byte *copy, std::size_t size) {
      return std::memcmp(at, copy, size) == 0;
    });
  }

private:
  template <class Visit>
  bool each(Visit visit) {
    std::byte *copy = bytes_;
    for (const Region &region : regions_) {
      if (copy + region.size > std::end(bytes_)) std::abort();
      if (!visit(region.at, copy, region.size)) return false;
      copy += region.size;
    }
    return true;
  }

  std::initializer_list<Region> regions_;
  std::byte bytes_[4096];
};

/// Runs a service in the portable body and in the chosen one, and ends the process unless both
/// return the same and leave the same behind.
template <class Run>
auto serve(std::initializer_list<Region> regions, Run run) {
  const auto result_of = [&run](const Services &services) {
    if constexpr (std::is_void_v<decltype(run(services))>) {
      return run(services), true;
    } else {
      return run(services);
    }
  };
  Copies before(regions);
  const auto expected = result_of(portable::kServices);
  Copies after(regions);
  before.restore();
  const auto result = result_of(services());
  if (!(result == expected) || !after.hold_now()) {
    std::fputs("a body differs from the portable one\n", stderr);
    std::abort();
  }
  return static_cast<decltype(run(services()))>(result);
}

#else

template <class Run>
inline auto serve(std::initializer_list<Region> /*regions*/, Run run) {
  return run(services());
}

#endif

}  // namespace

void use_instruction_set(InstructionSet set) {
  __atomic_store_n(&chosen, &bodies_of(set), __ATOMIC_RELAXED);
}

void complex_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan) {
  serve({region(flags), region(x, plan.size)},
        [&](const Services &body) { body.complex_fft(flags, x, direction, plan); });
}

void real_fft(Flags &flags, Word16 *x, Direction direction, const TransformPlan &plan) {
  serve({region(flags), region(x, plan.size)},
        [&](const Services &body) { body.real_fft(flags, x, direction, plan); });
}

ChannelFindings analyse_frame(Flags &flags, const ChannelPlan &plan, ChannelState &state,
                              const Word16 *frame) {
  return serve(
      {region(flags), region(state.energy, plan.channels), region(state.noise, plan.channels),
       region(state.long_term_q5, plan.channels), region(state.overlap, plan.overlap),
       region(state.pre_emp_mem), region(state.prev_shift), region(state.update_cnt),
       region(state.hyster_cnt), region(state.last_update_cnt)},
      [&](const Services &body) { return body.analyse_frame(flags, plan, state, frame); });
}

void track_noise(const ChannelPlan &plan, ChannelState &state) {
  serve({region(state.noise, plan.channels)},
        [&](const Services &body) { body.track_noise(plan, state); });
}

bool is_null_frame(const Word16 *frame, int samples, Word32 &small_samples) {
  return serve({region(small_samples)}, [&](const Services &body) {
    return body.is_null_frame(frame, samples, small_samples);
  });
}

void s1chns_C(Flags &flags, S1chnsState *state, Word16 *in, Word16 *out) {
  serve(
      {region(flags), region(*state), region(in, kMaxFrameSamples), region(out, kMaxFrameSamples)},
      [&](const Services &body) { body.s1chns_C(flags, state, in, out); });
}

Word16 level_frame(Flags &flags, DrcInstance &drc, Word16 *frame) {
  return serve({region(flags), region(drc), region(frame, drc.frameLength)},
               [&](const Services &body) { return body.level_frame(flags, drc, frame); });
}

}  // namespace orvalis
