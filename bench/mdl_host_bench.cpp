// The MDL order search through the host face: both MDL exports on the records
// of mdl_bench, called as a host calls them (the library loaded with dlopen,
// arrays owned by the emulated host run-time). Run it on two builds of libqdm
// to compare them.
//
//   mdl_host_bench LIBQDM [N [UPPER]]        (default 1024 341)
//
// Prints, per export, the chosen order and the best of two calls in process
// CPU seconds.
#include <algorithm>
#include <cmath>
#include <complex>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <random>
#include <vector>

#include "support/qdm_host.h"

namespace {

double ProcessSeconds() {
  timespec ts;
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &ts);
  return static_cast<double>(ts.tv_sec) + 1e-9 * static_cast<double>(ts.tv_nsec);
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 2) {
    std::fprintf(stderr, "usage: %s LIBQDM [N [UPPER]]\n", argv[0]);
    return 2;
  }
  const int32_t n = argc > 2 ? std::atoi(argv[2]) : 1024;
  const int32_t L = argc > 3 ? std::atoi(argv[3]) : 341;
  // The records of mdl_bench, drawn the same way.
  std::mt19937_64 rng(7);
  std::normal_distribution<double> g(0.0, 0.1);
  std::vector<double> xr(static_cast<size_t>(n));
  std::vector<std::complex<double>> xc(static_cast<size_t>(n));
  for (int32_t t = 0; t < n; ++t) {
    const double tt = t;
    xr[t] = std::cos(0.3 * tt) * std::pow(0.99, tt) + 0.5 * std::cos(1.1 * tt + 0.2) +
            0.3 * std::sin(2.0 * tt) * std::pow(0.998, tt) + g(rng);
    xc[t] = std::polar(1.0, 0.3 * tt) + 0.5 * std::exp(-0.01 * tt) * std::polar(1.0, 1.1 * tt) +
            std::complex<double>(g(rng), g(rng));
  }
  const qdmtest::QdmApi q = qdmtest::LoadQdm(argv[1]);
  const qdmtest::HostArray R = qdmtest::HostArray::Real(xr);
  const qdmtest::HostArray C = qdmtest::HostArray::Complex(xc);
  std::printf("%s\nn = %d, upper order %d\n", argv[1], n, L);
  for (int form = 0; form < 2; ++form) {
    double best = 1e300;
    int32_t order = 0, status = 0;
    for (int k = 0; k < 2; ++k) {
      const double t0 = ProcessSeconds();
      status = form == 0 ? q.QdmReMinDescriptLenH(R, L, 1, &order)
                         : q.QdmCxMinDescriptLenH(C, L, 1, &order);
      best = std::min(best, ProcessSeconds() - t0);
    }
    std::printf("%-22s status %d order %d  %.3f s\n",
                form == 0 ? "QdmReMinDescriptLenH" : "QdmCxMinDescriptLenH", status, order, best);
  }
  return 0;
}
