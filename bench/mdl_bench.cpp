// MDL order search at a large upper order: the search as it runs (fast scores,
// full fits only where a decision is close), the search with every candidate
// fitted in full, and the m x m eigenproblems alone, which both searches
// share and which no change to the fits can remove. One record per form: a
// few damped modes in white noise, n samples.
//
//   mdl_bench [N [UPPER]]        (default 1024 341)
//
// Times are process CPU seconds of one search each (best of two), and the
// chosen orders, one line per form.
#include <chrono>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <functional>
#include <random>
#include <vector>

#include "estimation/estimation.h"
#include "numeric/numeric.h"

namespace {

double ProcessSeconds() {
  timespec ts;
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &ts);
  return static_cast<double>(ts.tv_sec) + 1e-9 * static_cast<double>(ts.tv_nsec);
}

double BestOfTwo(const std::function<void()>& run) {
  double best = 1e300;
  for (int k = 0; k < 2; ++k) {
    const double t0 = ProcessSeconds();
    run();
    best = std::min(best, ProcessSeconds() - t0);
  }
  return best;
}

// The candidates' eigenproblems alone, blocks taken as the search takes them.
template <typename T>
void Eigenproblems(const T* x, int32_t n, int32_t L, bool complexForm) {
  const int32_t Lp = (L == n / 2) ? L - 1 : L;
  const int32_t r = std::min(n - Lp, Lp);
  const int32_t pencilL = complexForm ? Lp : r;
  std::vector<T> K(static_cast<size_t>(pencilL) * pencilL), block(static_cast<size_t>(r) * r);
  std::vector<Complex> poles(static_cast<size_t>(r));
  StatusCode st = status::kOk;
  if constexpr (std::is_same_v<T, Complex>) {
    st = PencilMatrixComplex(x, n, pencilL, pencilL, K.data());
  } else {
    st = PencilMatrixReal(x, n, pencilL, pencilL, K.data());
  }
  if (st != 0) std::fprintf(stderr, "pencil: %d\n", st);
  for (int32_t m = 1; m <= r; ++m) {
    for (int32_t i = 0; i < m; ++i) {
      std::memcpy(block.data() + static_cast<size_t>(i) * m, K.data() + static_cast<size_t>(i) * r,
                  static_cast<size_t>(m) * sizeof(T));
    }
    if constexpr (std::is_same_v<T, Complex>) {
      st = EigGeneralComplex(block.data(), m, 0, poles.data(), nullptr);
    } else {
      st = EigGeneralReal(block.data(), m, 0, poles.data(), nullptr);
    }
    if (st != 0) std::fprintf(stderr, "eig: %d\n", st);
  }
}

}  // namespace

int main(int argc, char** argv) {
  const int32_t n = argc > 1 ? std::atoi(argv[1]) : 1024;
  const int32_t L = argc > 2 ? std::atoi(argv[2]) : 341;
  std::mt19937_64 rng(7);
  std::normal_distribution<double> g(0.0, 0.1);
  std::vector<double> xr(static_cast<size_t>(n));
  std::vector<Complex> xc(static_cast<size_t>(n));
  for (int32_t t = 0; t < n; ++t) {
    const double tt = t;
    xr[t] = std::cos(0.3 * tt) * std::pow(0.99, tt) + 0.5 * std::cos(1.1 * tt + 0.2) +
            0.3 * std::sin(2.0 * tt) * std::pow(0.998, tt) + g(rng);
    xc[t] = std::polar(1.0, 0.3 * tt) + 0.5 * std::exp(-0.01 * tt) * std::polar(1.0, 1.1 * tt) +
            Complex(g(rng), g(rng));
  }
  std::printf("n = %d, upper order %d\n", n, L);
  std::printf("%-8s %10s %10s %10s %8s %11s %11s\n", "form", "full s", "fast s", "eig s", "speedup",
              "eig share", "orders");
  for (int form = 0; form < 2; ++form) {
    const bool cx = form == 1;
    int32_t full = -1, fast = -1;
    const double tFull = BestOfTwo([&] {
      full = 0;
      const StatusCode st = cx ? MdlOrderFullComplex(xc.data(), n, L, 1, &full)
                               : MdlOrderFullReal(xr.data(), n, L, 1, &full);
      if (st != 0) std::fprintf(stderr, "full: %d\n", st);
    });
    const double tFast = BestOfTwo([&] {
      fast = 0;
      const StatusCode st =
          cx ? MdlOrderComplex(xc.data(), n, L, 1, &fast) : MdlOrderReal(xr.data(), n, L, 1, &fast);
      if (st != 0) std::fprintf(stderr, "fast: %d\n", st);
    });
    const double tEig = BestOfTwo([&] {
      if (cx) {
        Eigenproblems(xc.data(), n, L, true);
      } else {
        Eigenproblems(xr.data(), n, L, false);
      }
    });
    std::printf("%-8s %10.3f %10.3f %10.3f %7.2fx %10.0f%% %5d %5d\n", cx ? "complex" : "real",
                tFull, tFast, tEig, tFull / tFast, 100.0 * tEig / tFull, full, fast);
  }
  return 0;
}
