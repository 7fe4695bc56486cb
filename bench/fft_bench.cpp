// FFT benchmark: our forward complex (interleaved, stride 2) and real
// (packed half-complex) transforms against FFTW's out-of-place dft/r2c plans
// (FFTW_ESTIMATE, and FFTW_MEASURE as a further column), in one run.
//
//   fft_bench [--csv] [--quick] [--only n] [--narrow]
// --narrow keeps the kernels on their SSE2 variant (for comparing the two).
//
// --csv prints rows kind,n,qdm_ns,fftw_ns,ratio,fftw_measure_ns (ratio =
// ours / FFTW_ESTIMATE). Each time is the best of several batches of calls,
// per call, in nanoseconds of thread CPU time.

#include <fftw3.h>

#include <algorithm>
#include <ctime>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <vector>

#include "fft/fft.h"
#include "fft/wide_lanes.h"

namespace {

double g_batch_seconds = 0.02;
int g_batches = 7;

// CPU time of this thread in seconds: on a shared machine it leaves out the
// time the benchmark spends descheduled.
double ThreadSeconds() {
  timespec ts;
  clock_gettime(CLOCK_THREAD_CPUTIME_ID, &ts);
  return static_cast<double>(ts.tv_sec) + 1e-9 * static_cast<double>(ts.tv_nsec);
}

// Best per-call thread CPU time in ns over g_batches batches of about
// g_batch_seconds.
double TimeNs(const std::function<void()>& call) {
  call();  // warm up
  int64_t reps = 1;
  for (;;) {  // calibrate the batch size
    const double t0 = ThreadSeconds();
    for (int64_t i = 0; i < reps; ++i) call();
    const double s = ThreadSeconds() - t0;
    if (s >= g_batch_seconds / 4 || reps > (int64_t{1} << 30)) {
      reps = std::max<int64_t>(1, static_cast<int64_t>(reps * g_batch_seconds / std::max(s, 1e-9)));
      break;
    }
    reps *= 4;
  }
  double best = 1e300;
  for (int b = 0; b < g_batches; ++b) {
    const double t0 = ThreadSeconds();
    for (int64_t i = 0; i < reps; ++i) call();
    const double s = ThreadSeconds() - t0;
    best = std::min(best, s / static_cast<double>(reps));
  }
  return best * 1e9;
}

struct Row {
  const char* kind;
  int n;
  double qdm, fftw, fftw_measure;
};

Row BenchComplex(int n) {
  fftw_complex* in = fftw_alloc_complex(n);
  fftw_complex* out = fftw_alloc_complex(n);
  for (int i = 0; i < n; ++i) {
    in[i][0] = std::sin(0.37 * i) + 0.1;
    in[i][1] = std::cos(1.13 * i);
  }
  FftPlan* plan = FftPlanAcquire(n);
  const double* x = &in[0][0];
  double* y = &out[0][0];
  const double qdm = TimeNs([&] { (void)FftComplex(plan, x, x + 1, y, y + 1, 2, 2, n); });
  FftPlanRelease(plan);
  fftw_plan pe = fftw_plan_dft_1d(n, in, out, FFTW_FORWARD, FFTW_ESTIMATE);
  const double fe = TimeNs([&] { fftw_execute(pe); });
  fftw_destroy_plan(pe);
  std::vector<double> keep(x, x + 2 * n);  // MEASURE planning overwrites the input
  fftw_plan pm = fftw_plan_dft_1d(n, in, out, FFTW_FORWARD, FFTW_MEASURE);
  std::memcpy(in, keep.data(), sizeof(double) * 2 * n);
  const double fm = TimeNs([&] { fftw_execute(pm); });
  fftw_destroy_plan(pm);
  fftw_free(in);
  fftw_free(out);
  return {"complex", n, qdm, fe, fm};
}

Row BenchReal(int n) {
  double* in = fftw_alloc_real(n);
  double* out = fftw_alloc_real(n);
  fftw_complex* cout = fftw_alloc_complex(n / 2 + 1);
  for (int i = 0; i < n; ++i) in[i] = std::sin(0.37 * i) + 0.1;
  FftPlan* plan = FftPlanAcquire(n);
  const double qdm = TimeNs([&] { (void)FftReal(plan, in, out, 1, 1, n); });
  FftPlanRelease(plan);
  fftw_plan pe = fftw_plan_dft_r2c_1d(n, in, cout, FFTW_ESTIMATE);
  const double fe = TimeNs([&] { fftw_execute(pe); });
  fftw_destroy_plan(pe);
  std::vector<double> keep(in, in + n);
  fftw_plan pm = fftw_plan_dft_r2c_1d(n, in, cout, FFTW_MEASURE);
  std::memcpy(in, keep.data(), sizeof(double) * n);
  const double fm = TimeNs([&] { fftw_execute(pm); });
  fftw_destroy_plan(pm);
  fftw_free(in);
  fftw_free(out);
  fftw_free(cout);
  return {"real", n, qdm, fe, fm};
}

}  // namespace

int main(int argc, char** argv) {
  bool csv = false;
  int only = 0;
  for (int i = 1; i < argc; ++i) {
    if (std::strcmp(argv[i], "--csv") == 0) {
      csv = true;
    } else if (std::strcmp(argv[i], "--quick") == 0) {
      g_batch_seconds = 0.005;
      g_batches = 3;
    } else if (std::strcmp(argv[i], "--narrow") == 0) {
      fftk::SetWideLanes(false);
    } else if (std::strcmp(argv[i], "--only") == 0 && i + 1 < argc) {
      only = std::atoi(argv[++i]);
    } else {
      std::fprintf(stderr, "usage: %s [--csv] [--quick] [--only n] [--narrow]\n", argv[0]);
      return 2;
    }
  }
  std::vector<int> lengths;
  for (int n = 8; n <= 65536; n *= 2) lengths.push_back(n);
  for (int n : {1000, 1536, 1763, 2438, 30030, 1009, 4999, 10007}) lengths.push_back(n);
  if (only > 0) lengths.assign(1, only);

  if (csv) {
    std::printf("kind,n,qdm_ns,fftw_ns,ratio,fftw_measure_ns\n");
  } else {
    std::printf("%-8s %7s %12s %12s %7s %14s %7s\n", "kind", "n", "qdm ns", "fftw est ns",
                "ratio", "fftw meas ns", "ratio");
  }
  for (const char* kind : {"complex", "real"}) {
    for (int n : lengths) {
      const Row r = std::strcmp(kind, "complex") == 0 ? BenchComplex(n) : BenchReal(n);
      if (csv) {
        std::printf("%s,%d,%.1f,%.1f,%.3f,%.1f\n", r.kind, r.n, r.qdm, r.fftw, r.qdm / r.fftw,
                    r.fftw_measure);
      } else {
        std::printf("%-8s %7d %12.1f %12.1f %7.2f %14.1f %7.2f\n", r.kind, r.n, r.qdm, r.fftw,
                    r.qdm / r.fftw, r.fftw_measure, r.qdm / r.fftw_measure);
      }
      std::fflush(stdout);
    }
  }
  return 0;
}
