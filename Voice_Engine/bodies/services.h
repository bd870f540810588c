// The services' bodies: what is compiled once for each instruction set, and chosen when it is first
// used. One choice serves a whole frame, so that everything below it is inlined.
#pragma once

#include "Voice_Engine/basic_op/fft.h"
#include "Voice_Engine/basic_op/flags.h"
#include "Voice_Engine/platform/cpu.h"

struct DrcInstance;

namespace orvalis {

struct ChannelFindings;
struct ChannelPlan;
struct ChannelState;
struct S1chnsState;
struct TransformPlan;

/// The bodies of one instruction set. What they do stands where the functions of these names are
/// declared.
struct Services {
  void (*complex_fft)(Flags &, Word16 *, Direction, const TransformPlan &);
  void (*real_fft)(Flags &, Word16 *, Direction, const TransformPlan &);
  ChannelFindings (*analyse_frame)(Flags &, const ChannelPlan &, ChannelState &, const Word16 *);
  void (*track_noise)(const ChannelPlan &, ChannelState &);
  bool (*is_null_frame)(const Word16 *, int, Word32 &);
  void (*s1chns_C)(Flags &, S1chnsState *, Word16 *, Word16 *);
  Word16 (*level_frame)(Flags &, DrcInstance &, Word16 *);
};

namespace portable {
extern const Services kServices;
}
namespace sse2 {
extern const Services kServices;
}
namespace avx2 {
extern const Services kServices;
}
namespace neon {
extern const Services kServices;
}

/// Chooses the bodies from here on, for tests and benchmarks: a set that the processor has.
void use_instruction_set(InstructionSet set);

}  // namespace orvalis
