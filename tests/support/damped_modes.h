// Test signals made of damped complex exponentials with known parameters, and
// matching of estimated modes against them. Header-only; no library code.
#pragma once

#include <cmath>
#include <complex>
#include <cstdint>
#include <vector>

namespace damped_modes {

constexpr double kTwoPi = 6.283185307179586;

// x[t] += amp * e^{i phase} * z^t with z = e^{damp + i 2 pi freq / fs}.
struct Mode {
  double amp;
  double phase;  // radians
  double damp;   // per sample, <= 0 for decay
  double freq;   // Hz
};

inline std::complex<double> Pole(const Mode& m, double fs) {
  return std::exp(std::complex<double>(m.damp, kTwoPi * m.freq / fs));
}

inline std::vector<std::complex<double>> ComplexSignal(const std::vector<Mode>& modes, int n,
                                                       double fs) {
  std::vector<std::complex<double>> x(static_cast<size_t>(n));
  for (const Mode& m : modes) {
    const std::complex<long double> z(std::exp(std::complex<long double>(
        m.damp, static_cast<long double>(kTwoPi) * m.freq / fs)));
    const std::complex<long double> c = std::polar<long double>(m.amp, m.phase);
    for (int t = 0; t < n; ++t) {
      const std::complex<long double> v = c * std::pow(z, static_cast<long double>(t));
      x[static_cast<size_t>(t)] += std::complex<double>(static_cast<double>(v.real()),
                                                        static_cast<double>(v.imag()));
    }
  }
  return x;
}

// Real signal sum of amp * e^{damp t} * cos(2 pi freq t / fs + phase): each mode
// is the pair (amp/2) e^{+-i phase} z^t, z and conj(z).
inline std::vector<double> RealSignal(const std::vector<Mode>& modes, int n, double fs) {
  std::vector<double> x(static_cast<size_t>(n));
  for (const Mode& m : modes) {
    for (int t = 0; t < n; ++t) {
      const long double lt = t;
      x[static_cast<size_t>(t)] += static_cast<double>(
          m.amp * std::exp(static_cast<long double>(m.damp) * lt) *
          std::cos(static_cast<long double>(kTwoPi) * m.freq * lt / fs + m.phase));
    }
  }
  return x;
}

// Deterministic uniform noise in [-a, a] (linear congruential; reproducible).
inline std::vector<double> Noise(int n, double a, uint32_t seed) {
  std::vector<double> v(static_cast<size_t>(n));
  uint64_t s = seed * 2654435761u + 12345u;
  for (auto& e : v) {
    s = s * 6364136223846793005ull + 1442695040888963407ull;
    e = a * (2.0 * static_cast<double>(s >> 11) / 9007199254740992.0 - 1.0);
  }
  return v;
}

// Wraps a phase difference into (-pi, pi].
inline double PhaseDiff(double a, double b) {
  double d = std::remainder(a - b, kTwoPi);
  return d;
}

}  // namespace damped_modes
