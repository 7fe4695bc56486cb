// Principal-component AR on long records at the textbook order (p = n/3, k = 8
// components, complex records of 8 damped modes at 30 dB SNR): the dense
// route, the Krylov route, and the share of the degree-p polynomial's roots,
// which both routes pay alike. One thread: run with OPENBLAS_NUM_THREADS=1.
//
//   build/release/bench/pcar_long [max n, 16384] [dense max n, 8192]
#include <chrono>
#include <cmath>
#include <complex>
#include <cstdio>
#include <cstdlib>
#include <numbers>
#include <random>
#include <vector>

#include "estimation/estimation.h"
#include "numeric/numeric.h"

namespace {

using Cx = std::complex<double>;

std::vector<Cx> Record(int32_t n) {
  std::mt19937_64 gen(1);
  std::normal_distribution<double> g(0.0, std::pow(10.0, -30.0 / 20.0) / std::sqrt(2.0));
  std::vector<Cx> x(static_cast<size_t>(n));
  for (int32_t t = 0; t < n; ++t) {
    Cx v(0.0, 0.0);
    for (int m = 0; m < 8; ++m)
      v += std::exp(Cx(-2.0 / n, 2.0 * std::numbers::pi * (0.05 + 0.11 * m)) * double(t));
    x[size_t(t)] = v + Cx(g(gen), g(gen));
  }
  return x;
}

double Seconds(std::chrono::steady_clock::time_point t0) {
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - t0).count();
}

}  // namespace

int main(int argc, char** argv) {
  const int32_t maxN = argc > 1 ? std::atoi(argv[1]) : 16384;
  const int32_t denseMaxN = argc > 2 ? std::atoi(argv[2]) : 8192;
  constexpr int32_t k = 8;
  std::printf("%7s %6s %10s %10s %10s %12s %10s\n", "n", "p", "dense s", "krylov s", "roots s",
              "roots/krylov", "max |da|");
  for (int32_t n = 4096; n <= maxN; n *= 2) {
    const int32_t p = n / 3;
    const std::vector<Cx> x = Record(n);
    std::vector<Cx> a[2], roots(static_cast<size_t>(p)), poly(static_cast<size_t>(p) + 1);
    double t[2] = {NAN, NAN};
    for (int route = 0; route < 2; ++route) {
      if (route == 0 && n > denseMaxN) continue;
      a[route].assign(static_cast<size_t>(p) + 1, Cx(0.0, 0.0));
      const auto t0 = std::chrono::steady_clock::now();
      const StatusCode st =
          PcarSolverComplex(x.data(), n, p, k, route ? PcarSolver::kKrylov : PcarSolver::kDense,
                            a[route].data(), roots.data());
      t[route] = Seconds(t0);
      if (st != status::kOk) std::printf("n %d route %d: status %d\n", n, route, st);
    }
    // The roots alone, of the fitted polynomial (ascending powers).
    for (int32_t i = 0; i <= p; ++i) poly[size_t(i)] = a[1][size_t(p - i)];
    const auto t0 = std::chrono::steady_clock::now();
    (void)PolyRootsComplex(poly.data(), p + 1, 1000, roots.data());
    const double tr = Seconds(t0);
    double da = NAN;
    if (!a[0].empty()) {
      da = 0.0;
      for (int32_t i = 0; i <= p; ++i)
        da = std::max(da, std::abs(a[0][size_t(i)] - a[1][size_t(i)]));
    }
    std::printf("%7d %6d %10.3f %10.3f %10.3f %12.2f %10.1e\n", n, p, t[0], t[1], tr, tr / t[1],
                da);
    std::fflush(stdout);
  }
  return 0;
}
