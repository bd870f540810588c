// The algebra of the two-microphone suppressor over all 256 bins at once, in split form: an array
// of real parts and one of imaginary parts, bin after bin. Each bin is computed by itself, as
// complex_matrix.h tells. An output must not be an input.
#pragma once

#include <bit>

#include "Voice_Engine/ns/complex_matrix.h"

namespace orvalis {

/// A complex value for each bin: four floats a bin in either array for a matrix, two for a row or a
/// column, one for a scalar.
template <class Value>
struct Bins {
  static constexpr int kParts = sizeof(Value) / sizeof(Bin);
  using Parts = std::array<Bin, kParts>;

  float re[kTransformBins * kParts];
  float im[kTransformBins * kParts];

  ORVALIS_KERNEL Value load(int bin) const {
    Parts parts;
    for (int i = 0; i < kParts; ++i) parts[i] = {re[kParts * bin + i], im[kParts * bin + i]};
    return std::bit_cast<Value>(parts);
  }

  ORVALIS_KERNEL void store(int bin, const Value &value) {
    const auto parts = std::bit_cast<Parts>(value);
    for (int i = 0; i < kParts; ++i) {
      re[kParts * bin + i] = parts[i].re;
      im[kParts * bin + i] = parts[i].im;
    }
  }
};

using Scalars = Bins<Bin>;
using Pairs = Bins<Pair>;
using Matrices = Bins<Matrix>;

/// a^-1; not finite where a is singular.
ORVALIS_KERNEL void inv_matrix(const Matrices &a, Matrices &out) {
  for (int k = 0; k < kTransformBins; ++k) out.store(k, inverse(a.load(k)));
}

ORVALIS_KERNEL void mul_2by2_matrix(const Matrices &a, const Matrices &b, Matrices &out) {
  for (int k = 0; k < kTransformBins; ++k) out.store(k, a.load(k) * b.load(k));
}

/// Row times column.
ORVALIS_KERNEL void mul_1by2_2by1_matrix(const Pairs &a, const Pairs &b, Scalars &out) {
  for (int k = 0; k < kTransformBins; ++k) out.store(k, row_times_column(a.load(k), b.load(k)));
}

/// Row times matrix, a row.
ORVALIS_KERNEL void mul_1by2_2by2_matrix(const Pairs &a, const Matrices &b, Pairs &out) {
  for (int k = 0; k < kTransformBins; ++k) out.store(k, row_times_matrix(a.load(k), b.load(k)));
}

/// Column times row, a matrix.
ORVALIS_KERNEL void mul_2by1_1by2_matrix(const Pairs &a, const Pairs &b, Matrices &out) {
  for (int k = 0; k < kTransformBins; ++k) out.store(k, column_times_row(a.load(k), b.load(k)));
}

/// (m - I) conj(d) / (|d|^2 + 1) with d = beta + tr(m) - 2.
ORVALIS_KERNEL void compute_PMWF_coeff(const Matrices &m, Matrices &w, float beta) {
  for (int k = 0; k < kTransformBins; ++k) w.store(k, pmwf_coefficients(m.load(k), beta));
}

}  // namespace orvalis
