// Oracles for the AR and exponential-mode estimators, sharing no code with the
// library: records from their defining recursions and mode sums, least squares
// solved apart in long double, spectra evaluated term by term (no FFT).
#pragma once

#include <algorithm>
#include <cmath>
#include <complex>
#include <cstdint>
#include <vector>

namespace ar_oracle {

using C = std::complex<double>;
using CL = std::complex<long double>;
constexpr long double kTwoPiL = 6.283185307179586476925286766559L;

// x[t] += amp e^{i phase} z^t, z = e^{damp + i 2 pi freq / fs} (re: the damped cosines).
struct Mode {
  double amp, phase, damp, freq;  // phase in radians, damp per sample, freq in Hz
};

inline C Pole(const Mode& m, double fs) {
  return std::exp(C(m.damp, double(kTwoPiL) * m.freq / fs));
}

inline std::vector<C> Signal(const std::vector<Mode>& modes, int n, double fs, bool re = false) {
  std::vector<C> x(static_cast<size_t>(n));
  for (const Mode& m : modes) {
    const CL z = std::exp(CL(m.damp, kTwoPiL * m.freq / fs)),
             c = std::polar<long double>(m.amp, m.phase);
    for (int t = 0; t < n; ++t) x[size_t(t)] += C(c * std::pow(z, (long double)t));
  }
  for (C& v : x) v = re ? C(v.real()) : v;
  return x;
}

// The AR vector a[0..p] = prod (z - r_k), highest power first.
inline std::vector<C> MonicFromRoots(const std::vector<C>& roots) {
  std::vector<CL> c{CL(1)};
  for (const C& r : roots) {
    c.push_back(0);
    for (size_t k = c.size() - 1; k > 0; --k) c[k] -= c[k - 1] * CL(r);
  }
  return {c.begin(), c.end()};
}

// Follows x[t] = -(a[1] x[t-1] + ... + a[p] x[t-p]) after the p start values.
inline std::vector<C> ArRecord(const std::vector<C>& a, std::vector<C> x, int n) {
  for (size_t t = x.size(); t < size_t(n); ++t) {
    C acc = 0;
    for (size_t k = 1; k < a.size(); ++k) acc -= a[k] * x[t - k];
    x.push_back(acc);
  }
  return x;
}

// 10 log10(P / max P), P = 1 / |sum a_k e^{-2 pi i f k}|^2 on f_j = -1/2 + j/L.
inline std::vector<double> SpectrumDb(const std::vector<C>& a, int32_t L) {
  std::vector<long double> P(static_cast<size_t>(L));
  for (int32_t j = 0; j < L; ++j) {
    CL A = 0;
    const long double f = -0.5L + (long double)j / L;
    for (size_t k = 0; k < a.size(); ++k) A += CL(a[k]) * std::polar(1.0L, -kTwoPiL * f * k);
    P[j] = 1 / std::norm(A);
  }
  const long double peak = *std::max_element(P.begin(), P.end());
  std::vector<double> db;
  for (long double v : P) db.push_back(double(10 * std::log10(v / peak)));
  return db;
}

// Least squares of a full-rank A (rows x cols) with B = A when tall, A^H when wide:
// (B^H B) y = B^H b and w = y, or (B^H B) y = b and w = B y (minimum norm). B^H B is
// Hermitian positive definite: elimination needs no pivots.
inline std::vector<C> LeastSquares(const std::vector<C>& A, int rows, int cols,
                                   const std::vector<C>& b) {
  const bool tall = rows >= cols;
  const int m = tall ? cols : rows, inner = tall ? rows : cols;
  auto B = [&](int k, int i) { return tall ? CL(A[k * cols + i]) : conj(CL(A[i * cols + k])); };
  std::vector<CL> G(size_t(m) * m), y(m);
  for (int i = 0; i < m; ++i) {
    for (int k = 0; k < inner; ++k) {
      for (int j = 0; j < m; ++j) G[i * m + j] += std::conj(B(k, i)) * B(k, j);
      if (tall) y[i] += std::conj(B(k, i)) * CL(b[k]);
    }
    if (!tall) y[i] = CL(b[i]);
  }
  for (int c = 0; c < m; ++c) {
    for (int r = c + 1; r < m; ++r) {
      const CL f = G[r * m + c] / G[c * m + c];
      for (int k = c; k < m; ++k) G[r * m + k] -= f * G[c * m + k];
      y[r] -= f * y[c];
    }
  }
  for (int r = m - 1; r >= 0; --r) {
    for (int k = r + 1; k < m; ++k) y[r] -= G[r * m + k] * y[k];
    y[r] /= G[r * m + r];
  }
  std::vector<C> w(static_cast<size_t>(cols));
  for (int k = 0; k < cols; ++k) {
    CL s = tall ? y[k] : 0;
    for (int i = 0; !tall && i < rows; ++i) s += B(k, i) * y[i];
    w[k] = C(s);
  }
  return w;
}

// The forward prediction system of order p: rows t = p..n-1, b = x[t], A = x[t-1..t-p].
inline void ForwardSystem(const std::vector<C>& x, int p, std::vector<C>* A, std::vector<C>* b) {
  A->clear(), b->clear();
  for (size_t t = size_t(p); t < x.size(); ++t) {
    b->push_back(x[t]);
    for (int k = 1; k <= p; ++k) A->push_back(x[t - k]);
  }
}

inline double RelativeError(const std::vector<C>& got, const std::vector<C>& want) {
  double num = 0, den = 0;
  for (size_t i = 0; i < want.size(); ++i) num += norm(got[i] - want[i]), den += norm(want[i]);
  return std::sqrt(num / (den > 0 ? den : 1.0));
}

}  // namespace ar_oracle
