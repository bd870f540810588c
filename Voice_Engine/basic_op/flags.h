// Overflow and carry flags of the three operator copies.
//
// Each copy has one process-wide pair, which hosts may read by name. The engine itself works on a
// pair in a local variable, so that the compiler can keep it in registers or drop it where the
// next operator overwrites it, and publishes that pair once when an exported call returns.
#pragma once

#include "Voice_Engine/basic_op/word.h"
#include "Voice_Engine/platform/export.h"

extern "C" {
// Plain integers that a host may also place in its own image (a copy relocation): always reached
// through the global offset table, never bound inside the library.
ORVALIS_EXPORT extern orvalis::Word32 Overflow, Carry;
ORVALIS_EXPORT extern orvalis::Word32 ns_Overflow, ns_Carry;
ORVALIS_EXPORT extern orvalis::Word16 Overflow_ZOLT, Carry_ZOLT;
}

namespace orvalis {

/// The flags of one call. `overflow` and `carry` hold 0 or 1, or what a host stored before.
struct Flags {
  Word32 overflow = 0;
  Word32 carry = 0;
};

/// Flags of the plain copy: end-point detection, queries, dynamics control.
struct PlainFlags : Flags {
  static auto &published_overflow() { return ::Overflow; }
  static auto &published_carry() { return ::Carry; }
};

/// Flags of the ns_ copy: the single-channel suppressor and its transform.
struct NsFlags : Flags {
  static auto &published_overflow() { return ::ns_Overflow; }
  static auto &published_carry() { return ::ns_Carry; }
};

/// Flags of the ZOLT_ copy: extended mathematics. Its deviations stand in zolt_operators.h.
struct ZoltFlags : Flags {
  static auto &published_overflow() { return ::Overflow_ZOLT; }
  static auto &published_carry() { return ::Carry_ZOLT; }
};

/// The flags of one exported call: read when it begins, published when it returns, so that a value
/// that no operator overwrites stays. Relaxed atomics keep concurrent instances free of data races
/// on objects whose layout has to stay a plain integer.
template <class FlagSet>
class PublishedFlags {
public:
  PublishedFlags() {
    flags_.overflow = __atomic_load_n(&FlagSet::published_overflow(), __ATOMIC_RELAXED);
    flags_.carry = __atomic_load_n(&FlagSet::published_carry(), __ATOMIC_RELAXED);
  }
  ~PublishedFlags() {
    store(FlagSet::published_overflow(), flags_.overflow);
    store(FlagSet::published_carry(), flags_.carry);
  }
  PublishedFlags(const PublishedFlags &) = delete;
  PublishedFlags &operator=(const PublishedFlags &) = delete;

  /// The local pair that operators report to.
  FlagSet &operator*() { return flags_; }

private:
  template <class Word>
  static void store(Word &published, Word32 value) {
    __atomic_store_n(&published, static_cast<Word>(value), __ATOMIC_RELAXED);
  }

  FlagSet flags_;
};

}  // namespace orvalis
