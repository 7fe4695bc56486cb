// The stabilization diagram on the plain face: true modes standing in stable
// columns, each order equal to a separate pencil fit of that order, every
// refusal with its code and its words and nothing written, and every
// allocation and LAPACK failure reported with the table zeroed.
#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <cstdint>
#include <functional>
#include <limits>
#include <random>
#include <string>
#include <vector>

#include "numeric/lapack_boundary.h"
#include "numeric/work.h"
#include "qdm_api.h"
#include "support/fault_sweep.h"

namespace {

constexpr double kPi = 3.141592653589793;
constexpr double kSentinel = -7.0;
constexpr double kNan = std::numeric_limits<double>::quiet_NaN();

const double kFreq[3] = {-0.21, 0.06, 0.33};  // cycles per sample
const double kDamp[3] = {-0.004, -0.01, -0.002};

// Three unit damped complex exponentials in complex white noise, snr per mode.
std::vector<double> ThreeModes(int32_t n, unsigned seed, double snrDb) {
  std::mt19937_64 rng(seed);
  std::normal_distribution<double> noise(0.0, std::pow(10.0, -snrDb / 20.0) / std::sqrt(2.0));
  std::uniform_real_distribution<double> phase(-kPi, kPi);
  std::vector<std::complex<double>> x(static_cast<size_t>(n));
  for (int k = 0; k < 3; ++k) {
    const double p = phase(rng);
    for (int32_t t = 0; t < n; ++t) {
      x[size_t(t)] += std::exp(std::complex<double>(kDamp[k] * t, 2 * kPi * kFreq[k] * t + p));
    }
  }
  std::vector<double> v;
  for (auto& z : x) {
    v.push_back(z.real() + noise(rng));
    v.push_back(z.imag() + noise(rng));
  }
  return v;
}

// One call: the record (interleaved when complex), its arguments, the table.
struct Call {
  bool complex = true;
  std::vector<double> x;
  int32_t n = 0;
  int32_t pencil = 0;
  int32_t min_order = 1;
  int32_t max_order = 10;
  double fs = 1.0;
  int32_t real_signal = 0;
  double freq_tol = 0.01;
  double damping_tol = 0.05;
  int64_t room = 0;
  std::vector<int32_t> order, flags;
  std::vector<double> frequency, damping, amplitude;
  int64_t rows = -1;
  int32_t mdl = -1;
  int32_t status = 1;
  // Pointer overrides for the null cases.
  bool nullX = false, nullOrder = false, nullFlags = false, nullRows = false, nullMdl = false;
};

Call Valid(bool complex, int32_t n = 256, unsigned seed = 1) {
  Call c;
  c.complex = complex;
  c.n = n;
  std::vector<double> v = ThreeModes(n, seed, 25.0);
  if (complex) {
    c.x = v;
  } else {
    for (int32_t t = 0; t < n; ++t) c.x.push_back(v[2 * size_t(t)]);
  }
  c.pencil = n / 3;
  c.room = qdm_stabilization_rows(c.min_order, c.max_order);
  return c;
}

void Fit(Call& c) {
  const size_t room = c.room > 0 && c.room < 100000 ? size_t(c.room) : 1;
  c.order.assign(room, -1);
  c.flags.assign(room, -1);
  c.frequency.assign(room, kSentinel);
  c.damping.assign(room, kSentinel);
  c.amplitude.assign(room, kSentinel);
  const double* x = c.nullX ? nullptr : c.x.data();
  int32_t* order = c.nullOrder ? nullptr : c.order.data();
  int32_t* flags = c.nullFlags ? nullptr : c.flags.data();
  int64_t* rows = c.nullRows ? nullptr : &c.rows;
  int32_t* mdl = c.nullMdl ? nullptr : &c.mdl;
  if (c.complex) {
    c.status = qdm_stabilization_complex(reinterpret_cast<const qdm_complex*>(x), c.n, c.pencil,
                                         c.min_order, c.max_order, c.fs, c.freq_tol, c.damping_tol,
                                         c.room, order, c.frequency.data(), c.damping.data(),
                                         c.amplitude.data(), flags, rows, mdl);
  } else {
    c.status = qdm_stabilization_real(
        x, c.n, c.pencil, c.min_order, c.max_order, c.fs, c.real_signal, c.freq_tol, c.damping_tol,
        c.room, order, c.frequency.data(), c.damping.data(), c.amplitude.data(), flags, rows, mdl);
  }
}

std::string LastMessage() {
  char buf[256];
  qdm_last_error_message(buf, sizeof buf);
  return buf;
}

TEST(PlainStabilization, RowsFormula) {
  struct Case {
    int32_t lo, hi;
    int64_t rows;
  } cases[] = {{1, 1, 1},
               {1, 4, 10},
               {3, 5, 12},
               {0, 4, 0},
               {5, 4, 0},
               {1, 65536, int64_t{65536} * 65537 / 2},
               {2147483647, 2147483647, 2147483647}};
  for (const Case& k : cases) EXPECT_EQ(qdm_stabilization_rows(k.lo, k.hi), k.rows) << k.lo;
}

// For every order from 4 up, each true frequency has a stable pole within
// the tolerance; the MDL order is the face's own for the same record.
TEST(PlainStabilization, ThreeModesStandInStableColumns) {
  for (unsigned seed : {1u, 2u, 3u, 4u, 5u, 6u}) {
    Call c = Valid(true, 256, seed);
    c.max_order = 14;
    c.fs = 50.0;
    c.room = qdm_stabilization_rows(1, 14);
    Fit(c);
    ASSERT_EQ(c.status, QDM_OK) << seed;
    ASSERT_EQ(c.rows, c.room);
    for (int32_t m = 4; m <= 14; ++m) {
      for (double f : kFreq) {
        const double truth = f * c.fs;
        bool found = false;
        for (int64_t i = 0; i < c.rows; ++i) {
          found |= c.order[size_t(i)] == m && (c.flags[size_t(i)] & QDM_STABLE) &&
                   std::fabs(c.frequency[size_t(i)] - truth) <= 0.01 * std::fabs(truth);
        }
        EXPECT_TRUE(found) << "seed " << seed << " order " << m << " f " << truth;
      }
    }
    int32_t mdl = -1;
    ASSERT_EQ(
        qdm_mdl_order_complex(reinterpret_cast<const qdm_complex*>(c.x.data()), c.n, 14, 1, &mdl),
        QDM_OK);
    EXPECT_EQ(c.mdl, mdl);
  }
}

// Each order's poles are those of the pencil fit with that many modes and
// the same pencil parameter, matched pole by pole to rounding.
TEST(PlainStabilization, EachOrderIsThePencilFitOfThatOrder) {
  struct Case {
    bool complex;
    int32_t real_signal, pencil, lo, hi;
  } cases[] = {
      {true, 0, 85, 1, 10}, {true, 0, 120, 3, 12}, {false, 0, 85, 2, 9}, {false, 1, 100, 1, 10}};
  for (const Case& k : cases) {
    Call c = Valid(k.complex, 256, 9);
    c.real_signal = k.real_signal;
    c.pencil = k.pencil;
    c.min_order = k.lo;
    c.max_order = k.hi;
    c.room = qdm_stabilization_rows(k.lo, k.hi);
    Fit(c);
    ASSERT_EQ(c.status, QDM_OK);
    for (int32_t m = k.lo; m <= k.hi; ++m) {
      const size_t ms = static_cast<size_t>(m);
      std::vector<double> amp(ms), ph(ms), dm(ms), fr(ms);
      int32_t modes = 0;
      double mse = 0.0;
      const int32_t s =
          k.complex
              ? qdm_matrix_pencil_solver_complex(
                    reinterpret_cast<const qdm_complex*>(c.x.data()), c.n, k.pencil, m, 1.0,
                    QDM_SOLVER_DENSE, amp.data(), ph.data(), dm.data(), fr.data(), &modes, &mse)
              : qdm_matrix_pencil_solver_real(c.x.data(), c.n, k.pencil, m, 1.0, k.real_signal,
                                              QDM_SOLVER_DENSE, amp.data(), ph.data(), dm.data(),
                                              fr.data(), &modes, &mse);
      ASSERT_EQ(s, QDM_OK);
      int32_t rowsOfM = 0;
      for (int64_t i = 0; i < c.rows; ++i) {
        if (c.order[size_t(i)] != m) continue;
        ++rowsOfM;
        double best = HUGE_VAL;
        int32_t j = -1;
        for (int32_t q = 0; q < modes; ++q) {
          const double d = std::hypot(fr[size_t(q)] - c.frequency[size_t(i)],
                                      dm[size_t(q)] - c.damping[size_t(i)]);
          if (d < best) best = d, j = q;
        }
        EXPECT_LT(best, 1e-9) << "order " << m;
        EXPECT_NEAR(amp[size_t(j)], c.amplitude[size_t(i)], 1e-8 * (1 + amp[size_t(j)]));
      }
      EXPECT_EQ(rowsOfM, modes) << "order " << m;
    }
  }
}

struct BadCase {
  const char* name;
  std::function<void(Call&)> spoil;
  int32_t status;
  const char* words;  // the last-error message, or null for none checked
};

const BadCase kBad[] = {
    {"no samples", [](Call& c) { c.n = 0; }, QDM_ERR_EMPTY_INPUT, "n 0 is below 1"},
    {"pencil 0", [](Call& c) { c.pencil = 0; }, QDM_ERR_ORDER, "pencil 0 is below 1"},
    {"pencil above 2n/3", [](Call& c) { c.pencil = 171; }, QDM_ERR_ORDER,
     "pencil 171 is above floor(2n/3) = 170 (n = 256)"},
    {"min_order 0", [](Call& c) { c.min_order = 0; }, QDM_ERR_MIN_ORDER, "min_order 0 is below 1"},
    {"max_order not above", [](Call& c) { c.max_order = 1; }, QDM_ERR_MDL_UPPER,
     "max_order 1 is not above min_order = 1"},
    {"max_order above the pencil", [](Call& c) { c.pencil = 20, c.max_order = 21; },
     QDM_ERR_MDL_UPPER, "max_order 21 is above min(pencil, n - pencil) = 20"},
    {"max_order above n - pencil", [](Call& c) { c.pencil = 170, c.max_order = 87; },
     QDM_ERR_MDL_UPPER, "max_order 87 is above min(pencil, n - pencil) = 86"},
    {"fs 0", [](Call& c) { c.fs = 0.0; }, QDM_ERR_SAMPLE_RATE, "fs 0 is not positive"},
    {"negative freq_tol", [](Call& c) { c.freq_tol = -0.5; }, QDM_ERR_TOLERANCE,
     "freq_tol -0.5 is below 0"},
    {"negative damping_tol", [](Call& c) { c.damping_tol = -HUGE_VAL; }, QDM_ERR_TOLERANCE,
     "damping_tol -inf is below 0"},
    {"room too small", [](Call& c) { c.room = 54; }, QDM_ERR_ROOM,
     "room 54 is below qdm_stabilization_rows(min_order, max_order) = 55"},
    {"null x", [](Call& c) { c.nullX = true; }, QDM_ERR_NULL_POINTER, "x is null"},
    {"null order", [](Call& c) { c.nullOrder = true; }, QDM_ERR_NULL_POINTER, "order is null"},
    {"null flags", [](Call& c) { c.nullFlags = true; }, QDM_ERR_NULL_POINTER, "flags is null"},
    {"null rows", [](Call& c) { c.nullRows = true; }, QDM_ERR_NULL_POINTER, "rows is null"},
    {"null mdl_order", [](Call& c) { c.nullMdl = true; }, QDM_ERR_NULL_POINTER,
     "mdl_order is null"},
    {"NaN sample", [](Call& c) { c.x[7] = kNan; }, QDM_ERR_NON_FINITE, nullptr},
    {"infinite fs", [](Call& c) { c.fs = HUGE_VAL; }, QDM_ERR_NON_FINITE, "fs inf is not finite"},
    {"NaN freq_tol", [](Call& c) { c.freq_tol = kNan; }, QDM_ERR_NON_FINITE,
     "freq_tol nan is not finite"},
    {"NaN damping_tol", [](Call& c) { c.damping_tol = kNan; }, QDM_ERR_NON_FINITE,
     "damping_tol nan is not finite"},
};

bool Untouched(const Call& c) {
  for (size_t i = 0; i < c.order.size(); ++i) {
    if (c.order[i] != -1 || c.flags[i] != -1 || c.frequency[i] != kSentinel ||
        c.damping[i] != kSentinel || c.amplitude[i] != kSentinel)
      return false;
  }
  return true;
}

TEST(PlainStabilization, EveryRefusalHasItsCodeAndWordsAndWritesNothing) {
  for (const bool complex : {false, true}) {
    for (const BadCase& b : kBad) {
      Call c = Valid(complex);
      b.spoil(c);
      Fit(c);
      EXPECT_EQ(c.status, b.status) << b.name;
      if (b.words != nullptr) {
        EXPECT_EQ(LastMessage(), b.words) << b.name;
      }
      EXPECT_TRUE(Untouched(c)) << b.name;
    }
  }
}

bool AllZero(const Call& c) {
  for (size_t i = 0; i < c.order.size(); ++i) {
    if (c.order[i] != 0 || c.flags[i] != 0 || c.frequency[i] != 0.0 || c.damping[i] != 0.0 ||
        c.amplitude[i] != 0.0)
      return false;
  }
  return c.rows == 0 && c.mdl == 0;
}

// Every allocation and every LAPACK call, failed one at a time (and from
// the k-th on), is reported as an error with the table zeroed; past the last
// one the call gives the clean results.
TEST(PlainStabilization, EveryFaultIsReported) {
  int64_t faulted = 0;
  FaultSweep(
      [](bool complex) {
        Call c = Valid(complex, 96);
        c.max_order = 6;
        c.room = qdm_stabilization_rows(1, 6);
        Fit(c);
        return c;
      },
      [](const Call& c, const Call& clean, const std::string& where) {
        EXPECT_EQ(c.status, QDM_OK) << where;
        EXPECT_EQ(c.frequency, clean.frequency) << where;
        EXPECT_EQ(c.mdl, clean.mdl) << where;
      },
      [](const Call& c, bool) { return AllZero(c) && LastMessage() == qdm_status_text(c.status); },
      &faulted);
  EXPECT_GT(faulted, 50);
}

// A record far outside the direct range gives the same diagram, amplitudes
// scaled by the same power of two.
TEST(PlainStabilization, ExtremeRecordsScaleExactly) {
  for (const double f : {0x1p-700, 0x1p600}) {
    Call base = Valid(true, 128, 4);
    base.max_order = 8;
    base.room = qdm_stabilization_rows(1, 8);
    Fit(base);
    ASSERT_EQ(base.status, QDM_OK);
    Call c = base;
    for (double& v : c.x) v *= f;
    Fit(c);
    ASSERT_EQ(c.status, QDM_OK);
    EXPECT_EQ(c.frequency, base.frequency);
    EXPECT_EQ(c.flags, base.flags);
    for (size_t i = 0; i < c.amplitude.size(); ++i)
      EXPECT_EQ(c.amplitude[i], base.amplitude[i] * f);
  }
}

}  // namespace
