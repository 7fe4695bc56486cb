// The two-sided power spectrum of a real sequence and the cosine-sum data
// windows, both on top of the transform drivers and plan list.

#include <cmath>

#include "fft/plan.h"
#include "numeric/work.h"

namespace {

constexpr double kPi = 3.14159265358979323846264338327950288;

struct WindowCoefficients {
  int32_t count;
  double a[7];
};

// Cosine-sum windows by kind; a count of 0 marks a kind that does not exist.
constexpr WindowCoefficients kWindows[] = {
    {1, {1.0}},
    {2, {0.5, 0.5}},
    {2, {0.54, 0.46}},
    {3, {0.42323, 0.49755, 0.07922}},
    {3, {0.4265907136715391, 0.4965606190885641, 0.07684866723989682}},
    {3, {0.42, 0.5, 0.08}},
    {5, {0.215578948, 0.41663158, 0.277263158, 0.083578947, 0.006947368}},
    {4, {0.35875, 0.48829, 0.14128, 0.01168}},
    {7,
     {0.27105140069342415, 0.43329793923448606, 0.21812299954311062, 0.0659254463880309,
      0.010811742098372268, 0.0007765848252250934, 1.3887217350903198e-05}},
    {5, {0.323215218, 0.471492057, 0.17553428, 0.028497078, 0.001261367}},
    {0, {}},
    {4, {0.3635819, 0.4891775, 0.1365995, 0.0106411}},
};
constexpr int32_t kWindowKinds = sizeof(kWindows) / sizeof(kWindows[0]);

}  // namespace

StatusCode PowerSpectrumReal(double* x, int32_t n) {
  if (n < 1) return status::kBadSize;
  if (n == 1) {
    x[0] = x[0] * x[0];
    return status::kOk;
  }
  WorkArray<double> transform = AllocWork<double>(static_cast<size_t>(n));
  if (!transform) return status::kNoMemory;
  FftPlan* plan = FftPlanAcquire(n);
  if (plan == nullptr) return status::kNoMemory;
  const StatusCode st = FftReal(plan, x, transform.get(), 1, 1, n);
  if (st == status::kOk) {
    const double* y = transform.get();
    const double s = 1.0 / (static_cast<double>(n) * static_cast<double>(n));
    x[0] = y[0] * y[0] * s;
    for (int32_t k = 1; 2 * k < n; ++k) {
      x[k] = x[n - k] = (y[k] * y[k] + y[n - k] * y[n - k]) * s;
    }
    if (n % 2 == 0) x[n / 2] = y[n / 2] * y[n / 2] * s;
  }
  FftPlanRelease(plan);
  return st;
}

StatusCode ApplyWindow(double* x, int32_t n, int32_t kind, int32_t flag) {
  if (n < 1) return status::kBadSize;
  if (kind < 0 || kind >= kWindowKinds || kWindows[kind].count == 0) return status::kBadOption;
  const WindowCoefficients& win = kWindows[kind];
  const int32_t c = win.count;
  if (n == 1 || c == 1) return status::kOk;
  // Per coefficient k: alpha, beta of the recurrence for angle 2 pi k/n, and the
  // running cos(2 pi k i/n), sin(2 pi k i/n).
  WorkArray<double> work = AllocWork<double>(4 * static_cast<size_t>(c));
  if (!work) return status::kNoMemory;
  double* alpha = work.get();
  double* beta = alpha + c;
  double* cs = beta + c;
  double* sn = cs + c;
  double b[7];
  const double norm = flag != 0 ? win.a[0] : 1.0;
  double w0 = 0.0;
  for (int32_t k = 0; k < c; ++k) {
    b[k] = ((k % 2 == 0) ? win.a[k] : -win.a[k]) / norm;
    const double half = std::sin(kPi * k / n);
    alpha[k] = 2.0 * half * half;
    beta[k] = std::sin(2.0 * kPi * k / n);
    cs[k] = 1.0;
    sn[k] = 0.0;
    w0 += b[k];
  }
  x[0] *= w0;
  // w[i] = w[n-i]; for even n the middle element gets w[n/2].
  for (int32_t i = 1; 2 * i <= n; ++i) {
    double w = 0.0;
    for (int32_t k = 0; k < c; ++k) {
      const double next_c = cs[k] - (alpha[k] * cs[k] + beta[k] * sn[k]);
      const double next_s = sn[k] - (alpha[k] * sn[k] - beta[k] * cs[k]);
      cs[k] = next_c;
      sn[k] = next_s;
      w += b[k] * next_c;
    }
    x[i] *= w;
    if (2 * i < n) x[n - i] *= w;
  }
  return status::kOk;
}
