// Test oracles for the AR and exponential-mode estimators. They share no code
// with the library: records are generated from their defining recursions or
// sums, and least-squares answers are solved independently in long double.
#pragma once

#include <algorithm>
#include <cmath>
#include <complex>
#include <cstdint>
#include <limits>
#include <random>
#include <vector>

namespace ar_oracle {

using C = std::complex<double>;
using CL = std::complex<long double>;

// Monic polynomial prod (z - r_k), highest power first: result[0] = 1,
// result[k] is the coefficient of z^(p-k), i.e. the AR vector a[0..p].
inline std::vector<C> MonicFromRoots(const std::vector<C>& roots) {
  std::vector<CL> c{CL(1)};
  for (const C& r : roots) {
    std::vector<CL> next(c.size() + 1, CL(0));
    for (size_t k = 0; k < c.size(); ++k) {
      next[k] += c[k];
      next[k + 1] -= c[k] * CL(r);
    }
    c = next;
  }
  std::vector<C> out(c.size());
  for (size_t k = 0; k < c.size(); ++k) out[k] = C(double(c[k].real()), double(c[k].imag()));
  return out;
}

// AR spectrum in dB on the two-sided grid f_j = -fs/2 + j fs/L:
// 10 log10((1/|A(f_j)|^2) / peak), A(f) = sum a_k e^{-2 pi i f k / fs}, evaluated
// term by term in long double (no FFT).
inline std::vector<double> SpectrumDb(const std::vector<C>& a, int32_t L) {
  constexpr long double kPiL = 3.141592653589793238462643383279502884L;
  std::vector<long double> P(static_cast<size_t>(L));
  long double peak = 0;
  for (int32_t j = 0; j < L; ++j) {
    const long double f = -0.5L + static_cast<long double>(j) / L;  // in units of fs
    CL A(0);
    for (size_t k = 0; k < a.size(); ++k) {
      const long double w = -2 * kPiL * f * static_cast<long double>(k);
      A += CL(a[k].real(), a[k].imag()) * CL(std::cos(w), std::sin(w));
    }
    P[j] = 1 / std::norm(A);
    peak = std::max(peak, P[j]);
  }
  std::vector<double> db(static_cast<size_t>(L));
  for (int32_t j = 0; j < L; ++j) db[j] = double(10 * std::log10(P[j] / peak));
  return db;
}

// Record that follows x[t] = -(a[1] x[t-1] + ... + a[p] x[t-p]) exactly after
// the p given start values.
template <typename T>
std::vector<T> ArRecord(const std::vector<T>& a, const std::vector<T>& start, int n) {
  const size_t p = a.size() - 1;
  std::vector<T> x(n);
  for (size_t t = 0; t < size_t(n); ++t) {
    if (t < p) {
      x[t] = start[t];
      continue;
    }
    T acc = T(0);
    for (size_t k = 1; k <= p; ++k) acc -= a[k] * x[t - k];
    x[t] = acc;
  }
  return x;
}

// Largest distance from each expected point to a distinct found point, pairing
// greedily by nearness. Infinity when the counts differ.
inline double MatchDistance(std::vector<C> expected, std::vector<C> found) {
  if (expected.size() != found.size()) return std::numeric_limits<double>::infinity();
  double worst = 0.0;
  for (const C& e : expected) {
    size_t best = 0;
    for (size_t j = 1; j < found.size(); ++j) {
      if (std::abs(found[j] - e) < std::abs(found[best] - e)) best = j;
    }
    worst = std::max(worst, std::abs(found[best] - e));
    found.erase(found.begin() + long(best));
  }
  return worst;
}

// Minimum-norm solution of the wide system A w = b (rows < cols, full row
// rank): w = A^H (A A^H)^-1 b, by Gaussian elimination with partial pivoting
// in long double.
inline std::vector<C> MinNormSolve(const std::vector<C>& A, int rows, int cols,
                                   const std::vector<C>& b) {
  std::vector<CL> G(size_t(rows) * rows), y(rows);
  for (int i = 0; i < rows; ++i) {
    for (int j = 0; j < rows; ++j) {
      CL s = 0;
      for (int k = 0; k < cols; ++k) s += CL(A[i * cols + k]) * std::conj(CL(A[j * cols + k]));
      G[i * rows + j] = s;
    }
    y[i] = CL(b[i]);
  }
  for (int c = 0; c < rows; ++c) {
    int piv = c;
    for (int r = c + 1; r < rows; ++r) {
      if (std::abs(G[r * rows + c]) > std::abs(G[piv * rows + c])) piv = r;
    }
    for (int k = 0; k < rows; ++k) std::swap(G[c * rows + k], G[piv * rows + k]);
    std::swap(y[c], y[piv]);
    for (int r = c + 1; r < rows; ++r) {
      const CL f = G[r * rows + c] / G[c * rows + c];
      for (int k = c; k < rows; ++k) G[r * rows + k] -= f * G[c * rows + k];
      y[r] -= f * y[c];
    }
  }
  for (int r = rows - 1; r >= 0; --r) {
    CL s = y[r];
    for (int k = r + 1; k < rows; ++k) s -= G[r * rows + k] * y[k];
    y[r] = s / G[r * rows + r];
  }
  std::vector<C> w(cols);
  for (int k = 0; k < cols; ++k) {
    CL s = 0;
    for (int i = 0; i < rows; ++i) s += std::conj(CL(A[i * cols + k])) * y[i];
    w[k] = C(double(s.real()), double(s.imag()));
  }
  return w;
}

// Ordinary least squares of a tall full-rank system through the normal
// equations (A^H A) w = A^H b, formed and solved in long double (the extra
// precision covers the squared condition number for the small orders used).
inline std::vector<C> TallSolve(const std::vector<C>& A, int rows, int cols,
                                const std::vector<C>& b) {
  std::vector<CL> G(size_t(cols) * cols), y(cols);
  for (int i = 0; i < cols; ++i) {
    for (int j = 0; j < cols; ++j) {
      CL s = 0;
      for (int t = 0; t < rows; ++t) s += std::conj(CL(A[t * cols + i])) * CL(A[t * cols + j]);
      G[i * cols + j] = s;
    }
    CL s = 0;
    for (int t = 0; t < rows; ++t) s += std::conj(CL(A[t * cols + i])) * CL(b[t]);
    y[i] = s;
  }
  const int m = cols;
  for (int c = 0; c < m; ++c) {
    int piv = c;
    for (int q = c + 1; q < m; ++q) {
      if (std::abs(G[q * m + c]) > std::abs(G[piv * m + c])) piv = q;
    }
    for (int k = 0; k < m; ++k) std::swap(G[c * m + k], G[piv * m + k]);
    std::swap(y[c], y[piv]);
    for (int q = c + 1; q < m; ++q) {
      const CL f = G[q * m + c] / G[c * m + c];
      for (int k = c; k < m; ++k) G[q * m + k] -= f * G[c * m + k];
      y[q] -= f * y[c];
    }
  }
  std::vector<C> w(m);
  for (int q = m - 1; q >= 0; --q) {
    CL s = y[q];
    for (int k = q + 1; k < m; ++k) s -= G[q * m + k] * y[k];
    y[q] = s / G[q * m + q];
    w[q] = C(double(y[q].real()), double(y[q].imag()));
  }
  return w;
}

// Forward prediction system of order p written out from its definition.
inline void ForwardSystem(const std::vector<C>& x, int p, std::vector<C>* A, std::vector<C>* b) {
  const int n = int(x.size());
  const int q = n - p;
  A->assign(size_t(q) * p, C(0));
  b->assign(q, C(0));
  for (int t = p; t < n; ++t) {
    (*b)[t - p] = x[t];
    for (int k = 1; k <= p; ++k) (*A)[(t - p) * p + (k - 1)] = x[t - k];
  }
}

inline double RelativeError(const std::vector<C>& got, const std::vector<C>& want) {
  double num = 0, den = 0;
  for (size_t i = 0; i < want.size(); ++i) {
    num += std::norm(got[i] - want[i]);
    den += std::norm(want[i]);
  }
  return std::sqrt(num / (den > 0 ? den : 1.0));
}

}  // namespace ar_oracle
