// Overflow and carry flags of the three operator copies.
//
// Each copy has one process-wide pair, which hosts may read by name. The engine works on a local
// pair, which the compiler can keep in registers or drop where the next operator overwrites it, and
// publishes it once, when an exported call returns.
#pragma once

#include <type_traits>

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

/// The flags of one call of the plain or the ns_ copy, which differ only in where they are
/// published. `overflow` and `carry` hold 0 or 1, or what a host stored before.
struct Flags {
  Word32 overflow = 0;
  Word32 carry = 0;
};

/// Flags of the ZOLT_ copy: extended mathematics. A type of its own, so that no code on Flags
/// bypasses its deviations, which are overloads in zolt_operators.h.
struct ZoltFlags {
  Word32 overflow = 0;
  Word32 carry = 0;
};

static_assert(!std::is_convertible_v<ZoltFlags &, Flags &>);

/// Publishes to the plain copy: end-point detection, queries, dynamics control.
struct PlainCopy {
  using Local = Flags;
  static auto &overflow() { return ::Overflow; }
  static auto &carry() { return ::Carry; }
};

/// Publishes to the ns_ copy: the single-channel suppressor and its transform.
struct NsCopy {
  using Local = Flags;
  static auto &overflow() { return ::ns_Overflow; }
  static auto &carry() { return ::ns_Carry; }
};

/// Publishes to the ZOLT_ copy.
struct ZoltCopy {
  using Local = ZoltFlags;
  static auto &overflow() { return ::Overflow_ZOLT; }
  static auto &carry() { return ::Carry_ZOLT; }
};

/// The flags of one exported call: read when it begins, so that a value that no operator overwrites
/// stays, and published when it returns. Relaxed atomics keep concurrent instances free of data
/// races on objects that have to stay plain integers.
template <class Copy>
class PublishedFlags {
public:
  PublishedFlags() {
    flags_.overflow = __atomic_load_n(&Copy::overflow(), __ATOMIC_RELAXED);
    flags_.carry = __atomic_load_n(&Copy::carry(), __ATOMIC_RELAXED);
  }
  ~PublishedFlags() {
    store(Copy::overflow(), flags_.overflow);
    store(Copy::carry(), flags_.carry);
  }
  PublishedFlags(const PublishedFlags &) = delete;
  PublishedFlags &operator=(const PublishedFlags &) = delete;

  /// The local pair that operators report to.
  typename Copy::Local &operator*() { return flags_; }

private:
  template <class Word>
  static void store(Word &published, Word32 value) {
    __atomic_store_n(&published, static_cast<Word>(value), __ATOMIC_RELAXED);
  }

  typename Copy::Local flags_;
};

static_assert(!std::is_convertible_v<PublishedFlags<NsCopy> &, PublishedFlags<PlainCopy> &>);

}  // namespace orvalis
