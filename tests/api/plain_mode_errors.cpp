// Error bars of modes on the plain face: every refusal with its code and
// nothing written, every allocation and LAPACK failure reported with zeroed
// outputs, and records outside the direct range giving the scaled results.
// (The values themselves are checked against numpy in the Python tests.)
#include <gtest/gtest.h>

#include <cmath>
#include <functional>
#include <limits>
#include <string>
#include <utility>
#include <vector>

#include "numeric/lapack_boundary.h"
#include "numeric/work.h"
#include "qdm_api.h"
#include "support/fault_sweep.h"

namespace {

constexpr double kSentinel = -7.0;
constexpr double kNan = std::numeric_limits<double>::quiet_NaN();

// One call: the record (interleaved when complex), the modes, the outputs.
struct Call {
  bool complex = true;
  std::vector<double> x;
  int32_t n = 0;
  double fs = 100.0;
  int32_t real_signal = 1;
  int32_t modes = 2;
  std::vector<double> amplitude, phase, damping, frequency;
  std::vector<double> se[4];
  double variance = kSentinel;
  int32_t status = 0;
};

// Two damped modes at 10 and 23 Hz (fs 100) in a little deterministic noise.
Call Valid(bool complex, int32_t n = 96) {
  Call c;
  c.complex = complex;
  c.n = n;
  c.amplitude = {1.0, 0.5};
  c.phase = {0.3, -1.0};
  c.damping = {-0.01, -0.02};
  c.frequency = {10.0, 23.0};
  for (int32_t t = 0; t < n; ++t) {
    double re = 0.0, im = 0.0;
    for (int i = 0; i < 2; ++i) {
      const double e = c.amplitude[i] * std::exp(c.damping[i] * t);
      const double w = 2.0 * M_PI * c.frequency[i] * t / c.fs + c.phase[i];
      re += (complex ? 1.0 : 2.0) * e * std::cos(w);
      im += e * std::sin(w);
    }
    const double noise = 0.01 * std::sin(1.7 * t * t + 0.3);
    c.x.push_back(re + noise);
    if (complex) c.x.push_back(im - noise);
  }
  for (auto& s : c.se) s.assign(2, kSentinel);
  return c;
}

void Errors(Call& c, bool nullOutput = false) {
  const auto in_ = [](const std::vector<double>& v) { return v.empty() ? nullptr : v.data(); };
  const double* in[4] = {in_(c.amplitude), in_(c.phase), in_(c.damping), in_(c.frequency)};
  double* out[4] = {c.se[0].data(), c.se[1].data(), c.se[2].data(),
                    nullOutput ? nullptr : c.se[3].data()};
  const double* x = c.x.empty() ? nullptr : c.x.data();
  c.status = c.complex
                 ? qdm_mode_errors_complex(reinterpret_cast<const qdm_complex*>(x), c.n, c.fs,
                                           c.modes, in[0], in[1], in[2], in[3], out[0], out[1],
                                           out[2], out[3], &c.variance)
                 : qdm_mode_errors_real(x, c.n, c.fs, c.real_signal, c.modes, in[0], in[1], in[2],
                                        in[3], out[0], out[1], out[2], out[3], &c.variance);
}

bool All(const Call& c, double v) {
  for (const auto& s : c.se)
    for (double e : s)
      if (!(e == v)) return false;
  return c.variance == v;
}

struct Refusal {
  const char* name;
  std::function<void(Call&)> change;
  int32_t code;
};

const std::vector<Refusal> kRefusals = {
    {"no samples", [](Call& c) { c.n = 0; }, QDM_ERR_EMPTY_INPUT},
    {"negative n", [](Call& c) { c.n = -5; }, QDM_ERR_EMPTY_INPUT},
    {"no modes", [](Call& c) { c.modes = 0; }, QDM_ERR_NO_MODES},
    {"negative modes", [](Call& c) { c.modes = -1; }, QDM_ERR_NO_MODES},
    {"zero rate", [](Call& c) { c.fs = 0.0; }, QDM_ERR_SAMPLE_RATE},
    {"negative rate", [](Call& c) { c.fs = -1.0; }, QDM_ERR_SAMPLE_RATE},
    {"null record", [](Call& c) { c.x.clear(); }, QDM_ERR_NULL_POINTER},
    {"null modes", [](Call& c) { c.phase.clear(); }, QDM_ERR_NULL_POINTER},
    {"huge mode count", [](Call& c) { c.modes = 1 << 20; }, QDM_ERR_WORK_LIMIT},
    {"NaN sample", [](Call& c) { c.x[3] = kNan; }, QDM_ERR_NON_FINITE},
    {"infinite sample", [](Call& c) { c.x[0] = HUGE_VAL; }, QDM_ERR_NON_FINITE},
    {"NaN rate", [](Call& c) { c.fs = kNan; }, QDM_ERR_NON_FINITE},
    {"NaN amplitude", [](Call& c) { c.amplitude[1] = kNan; }, QDM_ERR_MODE_VALUES},
    {"infinite frequency", [](Call& c) { c.frequency[0] = -HUGE_VAL; }, QDM_ERR_MODE_VALUES},
    {"NaN damping", [](Call& c) { c.damping[0] = kNan; }, QDM_ERR_MODE_VALUES},
    {"too few samples", [](Call& c) { c.n = 4; }, QDM_ERR_TOO_FEW_SAMPLES},
};

TEST(PlainModeErrors, EveryRefusalHasItsCodeAndWritesNothing) {
  for (const bool complex : {false, true}) {
    for (const Refusal& r : kRefusals) {
      Call c = Valid(complex);
      r.change(c);
      Errors(c);
      const std::string where = std::string(complex ? "complex " : "real ") + r.name;
      EXPECT_EQ(c.status, r.code) << where;
      EXPECT_TRUE(All(c, kSentinel)) << where;
    }
    Call c = Valid(complex);
    Errors(c, true);
    EXPECT_EQ(c.status, QDM_ERR_NULL_POINTER);
  }
}

TEST(PlainModeErrors, ARefusalNamesItsArgumentAndASuccessClearsIt) {
  const std::pair<std::function<void(Call&)>, std::string> rows[] = {
      {[](Call& c) { c.modes = 0; }, "modes 0 is below 1"},
      {[](Call& c) { c.fs = -1.0; }, "fs -1 is not positive"},
      {[](Call& c) { c.phase.clear(); }, "phase is null"},
      {[](Call& c) { c.x[3] = kNan; }, "x[1] has an imaginary part"},
      {[](Call&) {}, ""}};
  for (const auto& [change, says] : rows) {
    Call c = Valid(true);
    change(c);
    Errors(c);
    char text[200];
    qdm_last_error_message(text, sizeof text);
    EXPECT_EQ(std::string(text).substr(0, says.size()), says) << text;
    if (says.empty()) {
      EXPECT_STREQ(text, "");
    }
  }
}

TEST(PlainModeErrors, RealModesMustComeInPairsWithoutRealSignal) {
  Call c = Valid(false);
  c.real_signal = 0;
  Errors(c);
  EXPECT_EQ(c.status, QDM_ERR_MODE_VALUES);
  // n = 8 holds the two cosines' 8 parameters only with a ninth sample.
  c = Valid(false, 8);
  Errors(c);
  EXPECT_EQ(c.status, QDM_ERR_TOO_FEW_SAMPLES);
  c = Valid(false, 9);
  Errors(c);
  EXPECT_EQ(c.status, QDM_OK);
}

TEST(PlainModeErrors, EqualModesGiveNanErrorsAndTheWarning) {
  for (const bool complex : {false, true}) {
    Call c = Valid(complex);
    c.frequency[1] = c.frequency[0];
    c.damping[1] = c.damping[0];
    Errors(c);
    EXPECT_EQ(c.status, QDM_WARN_BOUND_SINGULAR);
    for (const auto& s : c.se) EXPECT_TRUE(std::isnan(s[0]) && std::isnan(s[1]));
    EXPECT_TRUE(std::isfinite(c.variance));
  }
}

// Scaling the record and the amplitudes by 2^k scales the amplitude errors by
// 2^k and the noise variance by 4^k, and leaves the others: also beyond the
// range where the squares would overflow or underflow.
TEST(PlainModeErrors, ScaledRecordsGiveScaledErrors) {
  for (const bool complex : {false, true}) {
    Call base = Valid(complex);
    Errors(base);
    ASSERT_EQ(base.status, QDM_OK);
    for (const int k : {-450, -200, 200, 450}) {
      Call c = Valid(complex);
      for (double& v : c.x) v = std::ldexp(v, k);
      for (double& a : c.amplitude) a = std::ldexp(a, k);
      Errors(c);
      ASSERT_EQ(c.status, QDM_OK) << k;
      for (int i = 0; i < 2; ++i) {
        EXPECT_DOUBLE_EQ(c.se[0][i], std::ldexp(base.se[0][i], k)) << k;
        for (int q = 1; q < 4; ++q) EXPECT_DOUBLE_EQ(c.se[q][i], base.se[q][i]) << k;
      }
      EXPECT_DOUBLE_EQ(c.variance, std::ldexp(base.variance, 2 * k)) << k;
    }
  }
}

TEST(PlainModeErrors, AGrowingModeThatOverflowsIsAnExtremeValue) {
  Call c = Valid(true, 2000);
  c.damping[0] = 0.5;  // e^{0.5 t} passes the double range near t = 1420
  Errors(c);
  EXPECT_EQ(c.status, QDM_ERR_EXTREME_VALUE);
  EXPECT_TRUE(All(c, 0.0));
}

// Each allocation failed once and from then on, and each LAPACK driver call
// made to report INFO 1 or -1 (several blocks, so several tpqrt calls): a call
// fails exactly when its fault was reached, with zeroed outputs and no block
// left allocated, and otherwise gives the clean result.
TEST(PlainModeErrors, EveryFaultIsReported) {
  int64_t faulted = 0;
  FaultSweep(
      [](bool complex) {
        Call c = Valid(complex, 4500);
        Errors(c);
        return c;
      },
      [](const Call& c, const Call& clean, const std::string& where) {
        EXPECT_EQ(c.status, QDM_OK) << where;
        for (int q = 0; q < 4; ++q) EXPECT_EQ(c.se[q], clean.se[q]) << where;
      },
      [](const Call& c, bool) { return All(c, 0.0); }, &faulted);
  EXPECT_GT(faulted, 20);
}

}  // namespace
