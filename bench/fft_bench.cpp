// FFT benchmark: our forward complex (interleaved, stride 2) and real
// (packed half-complex) transforms and the inverse real one (packed
// half-complex to real) against FFTW's out-of-place dft/r2c/c2r plans
// (FFTW_ESTIMATE, and FFTW_MEASURE as a further column), in one run.
//
//   fft_bench [--csv] [--quick] [--only n] [--narrow] [--estimate-only] [--profile kind]
// --narrow keeps the kernels on their SSE2 variant (for comparing the two).
// --estimate-only leaves out FFTW_MEASURE, whose planning takes seconds at the
// longest lengths (its columns then read 0).
// --profile runs only our transform of that kind (complex, real, inverse)
// at the --only length for about five seconds, for perf record.
// FFTW's c2r plans overwrite their input, so each of their calls restores it
// first and the time of that copy (measured alone) is taken off.
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
bool g_measure = true;

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
  double fm = 0.0;
  if (g_measure) {
    std::vector<double> keep(x, x + 2 * n);  // MEASURE planning overwrites the input
    fftw_plan pm = fftw_plan_dft_1d(n, in, out, FFTW_FORWARD, FFTW_MEASURE);
    std::memcpy(in, keep.data(), sizeof(double) * 2 * n);
    fm = TimeNs([&] { fftw_execute(pm); });
    fftw_destroy_plan(pm);
  }
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
  double fm = 0.0;
  if (g_measure) {
    std::vector<double> keep(in, in + n);
    fftw_plan pm = fftw_plan_dft_r2c_1d(n, in, cout, FFTW_MEASURE);
    std::memcpy(in, keep.data(), sizeof(double) * n);
    fm = TimeNs([&] { fftw_execute(pm); });
    fftw_destroy_plan(pm);
  }
  fftw_free(in);
  fftw_free(out);
  fftw_free(cout);
  return {"real", n, qdm, fe, fm};
}

Row BenchInverse(int n) {
  fftw_complex* cin = fftw_alloc_complex(n / 2 + 1);
  fftw_complex* keep = fftw_alloc_complex(n / 2 + 1);
  double* packed = fftw_alloc_real(n);
  double* out = fftw_alloc_real(n);
  // The same spectrum in both layouts: Re X_k, Im X_k at k and n - k packed.
  for (int k = 0; 2 * k <= n; ++k) {
    const double re = std::sin(0.37 * k) + 0.1;
    const double im = k == 0 || 2 * k == n ? 0.0 : std::cos(1.13 * k);
    keep[k][0] = re;
    keep[k][1] = im;
    packed[k] = re;
    if (k > 0 && 2 * k < n) packed[n - k] = im;
  }
  const size_t bytes = sizeof(fftw_complex) * static_cast<size_t>(n / 2 + 1);
  FftPlan* plan = FftPlanAcquire(n);
  const double qdm = TimeNs([&] { (void)FftHalfComplexToReal(plan, packed, out, 1, 1, n); });
  FftPlanRelease(plan);
  const double copy = TimeNs([&] { std::memcpy(cin, keep, bytes); });
  fftw_plan pe = fftw_plan_dft_c2r_1d(n, cin, out, FFTW_ESTIMATE);
  const double fe = TimeNs([&] {
    std::memcpy(cin, keep, bytes);
    fftw_execute(pe);
  });
  fftw_destroy_plan(pe);
  double fm = copy;
  if (g_measure) {
    fftw_plan pm = fftw_plan_dft_c2r_1d(n, cin, out, FFTW_MEASURE);
    fm = TimeNs([&] {
      std::memcpy(cin, keep, bytes);
      fftw_execute(pm);
    });
    fftw_destroy_plan(pm);
  }
  fftw_free(cin);
  fftw_free(keep);
  fftw_free(packed);
  fftw_free(out);
  return {"inverse", n, qdm, std::max(fe - copy, 1.0), g_measure ? std::max(fm - copy, 1.0) : 0.0};
}

// Our transform of one kind alone, about five seconds of calls.
int Profile(const char* kind, int n) {
  std::vector<double> x(2 * static_cast<size_t>(n)), y(2 * static_cast<size_t>(n));
  for (size_t i = 0; i < x.size(); ++i) x[i] = std::sin(0.37 * static_cast<double>(i)) + 0.1;
  FftPlan* plan = FftPlanAcquire(n);
  if (plan == nullptr) return 1;
  std::function<void()> call;
  if (std::strcmp(kind, "complex") == 0) {
    call = [&] { (void)FftComplex(plan, x.data(), x.data() + 1, y.data(), y.data() + 1, 2, 2, n); };
  } else if (std::strcmp(kind, "real") == 0) {
    call = [&] { (void)FftReal(plan, x.data(), y.data(), 1, 1, n); };
  } else if (std::strcmp(kind, "inverse") == 0) {
    call = [&] { (void)FftHalfComplexToReal(plan, x.data(), y.data(), 1, 1, n); };
  } else {
    FftPlanRelease(plan);
    return 2;
  }
  const double t0 = ThreadSeconds();
  int64_t calls = 0;
  while (ThreadSeconds() - t0 < 5.0) {
    for (int i = 0; i < 16; ++i) call();
    calls += 16;
  }
  std::printf("%s %d: %.1f ns per call\n", kind, n, (ThreadSeconds() - t0) * 1e9 / calls);
  FftPlanRelease(plan);
  return 0;
}

}  // namespace

int main(int argc, char** argv) {
  bool csv = false;
  int only = 0;
  const char* profile = nullptr;
  for (int i = 1; i < argc; ++i) {
    if (std::strcmp(argv[i], "--csv") == 0) {
      csv = true;
    } else if (std::strcmp(argv[i], "--quick") == 0) {
      g_batch_seconds = 0.005;
      g_batches = 3;
    } else if (std::strcmp(argv[i], "--estimate-only") == 0) {
      g_measure = false;
    } else if (std::strcmp(argv[i], "--narrow") == 0) {
      fftk::SetWideLanes(false);
    } else if (std::strcmp(argv[i], "--only") == 0 && i + 1 < argc) {
      only = std::atoi(argv[++i]);
    } else if (std::strcmp(argv[i], "--profile") == 0 && i + 1 < argc) {
      profile = argv[++i];
    } else {
      std::fprintf(stderr,
                   "usage: %s [--csv] [--quick] [--only n] [--narrow] [--estimate-only] "
                   "[--profile kind]\n",
                   argv[0]);
      return 2;
    }
  }
  if (profile != nullptr) {
    if (only <= 0 || Profile(profile, only) != 0) {
      std::fprintf(stderr, "--profile takes complex, real or inverse and needs --only n\n");
      return 2;
    }
    return 0;
  }
  // Powers of two to 2^20; the 2*3*5 lengths the long-record products take
  // (3, 5 and 15 times powers of two, and mixed 2^a 3^b 5^c); other lengths.
  std::vector<int> lengths;
  for (int n = 8; n <= (1 << 20); n *= 2) lengths.push_back(n);
  for (int n : {1536,  3072,   12288,   49152, 196608, 786432, 1280,   5120,   20480,
                81920, 327680, 1310720, 3840,  15360,  61440,  245760, 983040, 1000,
                2160,  6750,   18000,   50625, 93312,  253125, 472392, 1000000})
    lengths.push_back(n);
  for (int n : {1763, 2438, 30030, 1009, 4999, 10007}) lengths.push_back(n);
  if (only > 0) lengths.assign(1, only);

  if (csv) {
    std::printf("kind,n,qdm_ns,fftw_ns,ratio,fftw_measure_ns\n");
  } else {
    std::printf("%-8s %7s %12s %12s %7s %14s %7s\n", "kind", "n", "qdm ns", "fftw est ns", "ratio",
                "fftw meas ns", "ratio");
  }
  for (const char* kind : {"complex", "real", "inverse"}) {
    for (int n : lengths) {
      const Row r = std::strcmp(kind, "complex") == 0 ? BenchComplex(n)
                    : std::strcmp(kind, "real") == 0  ? BenchReal(n)
                                                      : BenchInverse(n);
      if (csv) {
        std::printf("%s,%d,%.1f,%.1f,%.3f,%.1f\n", r.kind, r.n, r.qdm, r.fftw, r.qdm / r.fftw,
                    r.fftw_measure);
      } else {
        std::printf("%-8s %7d %12.1f %12.1f %7.2f %14.1f %7.2f\n", r.kind, r.n, r.qdm, r.fftw,
                    r.qdm / r.fftw, r.fftw_measure,
                    r.fftw_measure > 0 ? r.qdm / r.fftw_measure : 0.0);
      }
      std::fflush(stdout);
    }
  }
  return 0;
}
