// Direct O(n) per bin DFT in long double: the oracle for the FFT tests. It
// shares nothing with the engine (no plans, no kernels, no recurrences).
#pragma once

#include <cmath>
#include <cstdint>
#include <random>
#include <vector>

namespace testing_dft {

// Reproducible test input: count values uniform in [-1, 1).
inline std::vector<double> RandomVector(size_t count, uint64_t seed) {
  std::mt19937_64 rng(seed);
  std::uniform_real_distribution<double> uni(-1.0, 1.0);
  std::vector<double> v(count);
  for (double& x : v) x = uni(rng);
  return v;
}

// Forward DFT bins X[k], k in `bins`, of x = re + i im (n values each), in
// long double. outRe/outIm get one entry per bin.
inline void DirectDft(const std::vector<double>& re, const std::vector<double>& im,
                      const std::vector<int64_t>& bins, std::vector<long double>* outRe,
                      std::vector<long double>* outIm) {
  const int64_t n = static_cast<int64_t>(re.size());
  const long double two_pi = 6.283185307179586476925286766559005768L;
  std::vector<long double> c(n), s(n);
  for (int64_t j = 0; j < n; ++j) {
    c[j] = std::cos(two_pi * j / n);
    s[j] = -std::sin(two_pi * j / n);
  }
  outRe->assign(bins.size(), 0.0L);
  outIm->assign(bins.size(), 0.0L);
  for (size_t b = 0; b < bins.size(); ++b) {
    const int64_t k = bins[b];
    long double sr = 0.0L, si = 0.0L;
    int64_t idx = 0;  // j*k mod n
    for (int64_t j = 0; j < n; ++j) {
      const long double xr = re[j], xi = im[j];
      sr += xr * c[idx] - xi * s[idx];
      si += xr * s[idx] + xi * c[idx];
      idx += k;
      if (idx >= n) idx -= n;
    }
    (*outRe)[b] = sr;
    (*outIm)[b] = si;
  }
}

}  // namespace testing_dft
