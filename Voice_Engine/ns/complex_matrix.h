// Algebra of 2x2 complex matrices in single precision, one frequency bin at a time.
//
// No routine conjugates: a Hermitian product takes an operand that its caller has conjugated.
// Complex products are formed with a fused multiply-add each part; several products of one element
// are formed so and then added. Nothing guards against a singular matrix.
#pragma once

#include "Voice_Engine/ns/float_transform.h"

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

ORVALIS_KERNEL Matrix operator*(const Matrix &a, const Matrix &b) {
  return {a.m11 * b.m11 + a.m12 * b.m21, a.m11 * b.m12 + a.m12 * b.m22,
          a.m21 * b.m11 + a.m22 * b.m21, a.m21 * b.m12 + a.m22 * b.m22};
}

ORVALIS_KERNEL Bin row_times_column(Pair row, Pair column) {
  return row.first * column.first + row.second * column.second;
}

ORVALIS_KERNEL Pair row_times_matrix(Pair row, const Matrix &m) {
  return {row.first * m.m11 + row.second * m.m21, row.first * m.m12 + row.second * m.m22};
}

ORVALIS_KERNEL Matrix column_times_row(Pair column, Pair row) {
  return {column.first * row.first, column.first * row.second, column.second * row.first,
          column.second * row.second};
}

/// The adjugate times the determinant's conjugate, over the determinant's power. A singular matrix
/// gives infinities or not-a-numbers.
ORVALIS_KERNEL Matrix inverse(const Matrix &a) {
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

/// Coefficients of the parametric multichannel Wiener filter from m = Phi_vv^-1 Phi_yy; the first
/// column is the filter that estimates the speech at the first microphone. beta trades distortion
/// for suppression. The 1 beside |d|^2 bounds the coefficients where d is small.
/// Source: M. Souden, J. Benesty, S. Affes, "On optimal frequency-domain multichannel linear
/// filtering for noise reduction", 2010.
ORVALIS_KERNEL Matrix pmwf_coefficients(const Matrix &m, float beta) {
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

}  // namespace orvalis
