#include "Voice_Engine/platform/cpu.h"

#if defined(__x86_64__) || defined(__i386__)
#include <cpuid.h>
#endif

namespace orvalis {
namespace {

#if defined(__x86_64__) || defined(__i386__)

constexpr bool kHasSse2 = true;  // every build for these processors assumes it
constexpr bool kHasNeon = false;

/// AVX2 with FMA, in a system that saves the wide registers.
bool has_avx2() {
  unsigned eax;
  unsigned ebx;
  unsigned ecx;
  unsigned edx;
  constexpr unsigned kNeeded = bit_FMA | bit_OSXSAVE | bit_AVX;
  if (__get_cpuid(1, &eax, &ebx, &ecx, &edx) == 0 || (ecx & kNeeded) != kNeeded) return false;
  constexpr unsigned kWideRegisters = 6;  // XMM and YMM in XCR0
  unsigned saved;
  asm("xgetbv" : "=a"(saved), "=d"(edx) : "c"(0));
  if ((saved & kWideRegisters) != kWideRegisters) return false;
  return __get_cpuid_count(7, 0, &eax, &ebx, &ecx, &edx) != 0 && (ebx & bit_AVX2) != 0;
}

#else

constexpr bool kHasSse2 = false;
bool has_avx2() { return false; }
#ifdef __aarch64__
constexpr bool kHasNeon = true;  // part of the architecture
#else
constexpr bool kHasNeon = false;
#endif

#endif

}  // namespace

bool has_instruction_set(InstructionSet set) {
  switch (set) {
    case InstructionSet::kSse2:
      return kHasSse2;
    case InstructionSet::kAvx2:
      return has_avx2();
    case InstructionSet::kNeon:
      return kHasNeon;
    default:
      return true;
  }
}

InstructionSet best_instruction_set() {
  if (has_avx2()) return InstructionSet::kAvx2;
  if (kHasSse2) return InstructionSet::kSse2;
  return kHasNeon ? InstructionSet::kNeon : InstructionSet::kPortable;
}

}  // namespace orvalis
