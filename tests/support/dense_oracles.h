// Reference dense linear algebra for the tests, written as plain loops in long
// double so that it shares nothing with the CBLAS/LAPACK paths it checks.
// Matrices are row-major, element (i, j) of an m-by-n matrix at i*n + j.
#pragma once

#include <cmath>
#include <complex>
#include <cstdint>
#include <random>
#include <type_traits>
#include <vector>

namespace qdm_test {

using Cx = std::complex<double>;
using CxL = std::complex<long double>;

template <typename T>
constexpr bool kIsCx = !std::is_same_v<T, double>;

inline long double Re(double v) { return v; }
inline long double Re(Cx v) { return v.real(); }
inline CxL Widen(Cx v) { return CxL(v.real(), v.imag()); }
inline long double Widen(double v) { return v; }
inline double Narrow(long double v) { return static_cast<double>(v); }
inline Cx Narrow(CxL v) { return Cx(static_cast<double>(v.real()), static_cast<double>(v.imag())); }
inline double Conj(double v) { return v; }
inline Cx Conj(Cx v) { return std::conj(v); }

// Uniform entries in [-1, 1] (both parts for complex).
template <typename T>
std::vector<T> RandomMatrix(int64_t rows, int64_t cols, uint32_t seed) {
  std::mt19937_64 gen(seed);
  std::uniform_real_distribution<double> d(-1.0, 1.0);
  std::vector<T> a(static_cast<size_t>(rows * cols));
  for (auto& v : a) {
    if constexpr (kIsCx<T>) {
      const double re = d(gen);
      v = T(re, d(gen));
    } else {
      v = d(gen);
    }
  }
  return a;
}

// C = A (m-by-k) * B (k-by-n).
template <typename T>
std::vector<T> NaiveProduct(const T* A, const T* B, int64_t m, int64_t k, int64_t n) {
  std::vector<T> c(static_cast<size_t>(m * n));
  for (int64_t i = 0; i < m; ++i) {
    for (int64_t j = 0; j < n; ++j) {
      decltype(Widen(T())) s = 0;
      for (int64_t l = 0; l < k; ++l) s += Widen(A[i * k + l]) * Widen(B[l * n + j]);
      c[static_cast<size_t>(i * n + j)] = Narrow(s);
    }
  }
  return c;
}

// The n-by-m conjugate transpose of the m-by-n A (plain transpose for real A).
template <typename T>
std::vector<T> NaiveAdjoint(const T* A, int64_t m, int64_t n) {
  std::vector<T> t(static_cast<size_t>(m * n));
  for (int64_t i = 0; i < m; ++i) {
    for (int64_t j = 0; j < n; ++j) t[static_cast<size_t>(j * m + i)] = Conj(A[i * n + j]);
  }
  return t;
}

// Frobenius norms.
template <typename T>
double FrobNorm(const T* a, int64_t count) {
  long double s = 0;
  for (int64_t i = 0; i < count; ++i) s += static_cast<long double>(std::norm(a[i]));
  return static_cast<double>(std::sqrt(s));
}
template <typename T>
double FrobDiff(const T* a, const T* b, int64_t count) {
  long double s = 0;
  for (int64_t i = 0; i < count; ++i) s += static_cast<long double>(std::norm(a[i] - b[i]));
  return static_cast<double>(std::sqrt(s));
}

// ||I - Q^H Q||_F for the m-by-c matrix Q (orthonormal columns expected).
template <typename T>
double OrthonormalityError(const T* Q, int64_t m, int64_t c) {
  const std::vector<T> qh = NaiveAdjoint(Q, m, c);
  const std::vector<T> g = NaiveProduct(qh.data(), Q, c, m, c);
  long double s = 0;
  for (int64_t i = 0; i < c; ++i) {
    for (int64_t j = 0; j < c; ++j) {
      const T e = g[static_cast<size_t>(i * c + j)] - T(i == j ? 1.0 : 0.0);
      s += static_cast<long double>(std::norm(e));
    }
  }
  return static_cast<double>(std::sqrt(s));
}

constexpr double kEps = 2.220446049250313e-16;

}  // namespace qdm_test
