// Algebra of 2x2 complex matrices in single precision, one frequency bin at a time.
//
// No product conjugates: for a Hermitian one the caller conjugates an operand. Each part of a
// complex product takes one fused multiply-add; sums of products are then added without. Nothing
// guards against a singular matrix.
#pragma once

#include "Voice_Engine/ns/float_fft_kernel.h"

namespace orvalis {

using Bin = Complex<float>;

/// A row or a column of two.
struct Pair {
  Bin first;
  Bin second;
};

/// Row by row: (m11, m12; m21, m22).
struct Matrix {
  Bin m11, m12;
  Bin m21, m22;
};

ORVALIS_KERNEL Bin operator+(Bin a, Bin b) { return {a.re + b.re, a.im + b.im}; }
ORVALIS_KERNEL Bin operator-(Bin a, Bin b) { return {a.re - b.re, a.im - b.im}; }
ORVALIS_KERNEL Bin operator-(Bin a) { return {-a.re, -a.im}; }

ORVALIS_KERNEL Bin operator*(Bin a, Bin b) {
  return {std::fma(a.re, b.re, -(a.im * b.im)), std::fma(a.re, b.im, a.im * b.re)};
}

/// |a|^2, two rounded squares.
ORVALIS_KERNEL float power(Bin a) { return a.re * a.re + a.im * a.im; }

ORVALIS_KERNEL Pair conj(Pair a) { return {conj(a.first), conj(a.second)}; }

ORVALIS_KERNEL Matrix operator-(const Matrix &a, const Matrix &b) {
  return {a.m11 - b.m11, a.m12 - b.m12, a.m21 - b.m21, a.m22 - b.m22};
}

ORVALIS_KERNEL Matrix mul_2by2_matrix(const Matrix &a, const Matrix &b) {
  return {a.m11 * b.m11 + a.m12 * b.m21, a.m11 * b.m12 + a.m12 * b.m22,
          a.m21 * b.m11 + a.m22 * b.m21, a.m21 * b.m12 + a.m22 * b.m22};
}

/// Row times column.
ORVALIS_KERNEL Bin mul_1by2_2by1_matrix(const Pair &a, const Pair &b) {
  return a.first * b.first + a.second * b.second;
}

/// Row times matrix, a row.
ORVALIS_KERNEL Pair mul_1by2_2by2_matrix(const Pair &a, const Matrix &b) {
  return {a.first * b.m11 + a.second * b.m21, a.first * b.m12 + a.second * b.m22};
}

/// Column times row, a matrix.
ORVALIS_KERNEL Matrix mul_2by1_1by2_matrix(const Pair &a, const Pair &b) {
  return {a.first * b.first, a.first * b.second, a.second * b.first, a.second * b.second};
}

/// a^-1: the adjugate times the determinant's conjugate, over the determinant's power. A singular
/// matrix gives infinities or not-a-numbers.
ORVALIS_KERNEL Matrix inv_matrix(const Matrix &a) {
  const Bin determinant = a.m11 * a.m22 - a.m12 * a.m21;
  const float n = power(determinant);
  const Complex<double> d = widened(determinant);
  const auto over_determinant = [n, d](Bin x) -> Bin {
    const Complex<double> w = widened(x);
    const Bin product = rounded({w.re * d.re + w.im * d.im, w.im * d.re - w.re * d.im});
    return {product.re / n, product.im / n};
  };
  return {over_determinant(a.m22), over_determinant(-a.m12), over_determinant(-a.m21),
          over_determinant(a.m11)};
}

/// Coefficients of the parametric multichannel Wiener filter from m = Phi_vv^-1 Phi_yy:
/// (m - I) conj(d) / (|d|^2 + 1) with d = beta + tr(m) - 2. The first column is the filter that
/// estimates the speech at the first microphone. beta trades distortion for suppression. The added
/// 1 bounds the coefficients where d is small.
/// Source: M. Souden, J. Benesty, S. Affes, "On optimal frequency-domain multichannel linear
/// filtering for noise reduction", 2010.
ORVALIS_KERNEL Matrix compute_PMWF_coeff(const Matrix &m, float beta) {
  const Bin d = {static_cast<float>(static_cast<double>(m.m11.re) + m.m22.re - 2.0 + beta),
                 m.m11.im + m.m22.im};
  const double denominator = power(d) + 1.0;
  const auto coefficient = [d, denominator](Bin x) -> Bin {
    const Bin product = x * conj(d);
    return {static_cast<float>(product.re / denominator),
            static_cast<float>(product.im / denominator)};
  };
  const Bin one = {1, 0};
  return {coefficient(m.m11 - one), coefficient(m.m12), coefficient(m.m21),
          coefficient(m.m22 - one)};
}

/// A matrix for each bin, its four elements row by row, real and imaginary parts apart.
struct Matrices {
  float re[4 * kTransformBins];
  float im[4 * kTransformBins];

  ORVALIS_KERNEL Matrix load(int bin) const {
    const float *x = re + 4 * bin;
    const float *y = im + 4 * bin;
    return {{x[0], y[0]}, {x[1], y[1]}, {x[2], y[2]}, {x[3], y[3]}};
  }

  ORVALIS_KERNEL void store(int bin, const Matrix &m) {
    const Bin elements[] = {m.m11, m.m12, m.m21, m.m22};
    for (int i = 0; i < 4; ++i) {
      re[4 * bin + i] = elements[i].re;
      im[4 * bin + i] = elements[i].im;
    }
  }
};

}  // namespace orvalis
