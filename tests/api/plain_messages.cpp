// The words of an argument refusal: each bad call below must return its code
// and leave a message that names the argument, its value and the limit, as a
// caller would write them by hand. A success clears the message; a cut buffer
// still ends in a NUL and the length returned is the whole message's.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "estimation/entry_checks.h"
#include "qdm_api.h"

namespace {

constexpr int32_t kN = 309;  // floor(2n/3) = 206

struct Buffers {
  std::vector<double> x = std::vector<double>(2 * kN);
  std::vector<double> out = std::vector<double>(8 * 4096, -1.0);
  int32_t count = 0;
  double d1 = 0, d2 = 0, d3 = 0;
  Buffers() {
    for (int32_t t = 0; t < kN; ++t) {
      x[2 * t] = std::cos(0.4 * t) + 0.3 * std::sin(1.3 * t);
      x[2 * t + 1] = std::sin(0.4 * t);
    }
  }
  double* o(int k) { return out.data() + 4096 * k; }
  qdm_complex* c(int k) { return reinterpret_cast<qdm_complex*>(o(k)); }
  const qdm_complex* cx() const { return reinterpret_cast<const qdm_complex*>(x.data()); }
};

struct BadCall {
  const char* what;
  int32_t code;
  std::function<int32_t(Buffers&)> call;
  std::string message;  // exactly
};

const BadCall kBadCalls[] = {
    {"covariance order above the bound", QDM_ERR_COUNT,
     [](Buffers& b) { return qdm_covariance_real(b.x.data(), kN, 300, b.o(0), b.c(1), &b.d1); },
     "order 300 is above floor(2n/3) = 206 (n = 309)"},
    {"covariance order 0", QDM_ERR_COUNT,
     [](Buffers& b) { return qdm_covariance_complex(b.cx(), kN, 0, b.c(0), b.c(1), &b.d1); },
     "order 0 is below 1"},
    {"no samples", QDM_ERR_EMPTY_INPUT,
     [](Buffers& b) { return qdm_covariance_real(b.x.data(), 0, 4, b.o(0), b.c(1), &b.d1); },
     "n 0 is below 1"},
    {"null poles", QDM_ERR_NULL_POINTER,
     [](Buffers& b) { return qdm_covariance_real(b.x.data(), kN, 4, b.o(0), nullptr, &b.d1); },
     "poles is null"},
    {"null samples", QDM_ERR_NULL_POINTER,
     [](Buffers& b) { return qdm_covariance_real(nullptr, kN, 4, b.o(0), b.c(1), &b.d1); },
     "x is null"},
    {"NaN sample", QDM_ERR_NON_FINITE,
     [](Buffers& b) {
       b.x[40] = NAN;
       return qdm_covariance_real(b.x.data(), kN, 4, b.o(0), b.c(1), &b.d1);
     },
     "x[40] is not finite: nan"},
    {"complex sample with an infinite imaginary part", QDM_ERR_NON_FINITE,
     [](Buffers& b) {
       b.x[2 * 17 + 1] = -INFINITY;
       return qdm_covariance_complex(b.cx(), kN, 4, b.c(0), b.c(1), &b.d1);
     },
     "x[17] has an imaginary part that is not finite: -inf"},
    {"pcar order negative", QDM_ERR_ORDER,
     [](Buffers& b) { return qdm_pcar_real(b.x.data(), kN, -3, 1, b.o(0), b.c(1)); },
     "order -3 is below 0"},
    {"pcar components 0", QDM_ERR_COUNT,
     [](Buffers& b) { return qdm_pcar_real(b.x.data(), kN, 12, 0, b.o(0), b.c(1)); },
     "components 0 is below 1"},
    {"pcar components above the order", QDM_ERR_COUNT_ABOVE_ORDER,
     [](Buffers& b) { return qdm_pcar_complex(b.cx(), kN, 12, 13, b.c(0), b.c(1)); },
     "components 13 is above order = 12"},
    {"pcar solver unknown", QDM_ERR_SOLVER,
     [](Buffers& b) { return qdm_pcar_solver_real(b.x.data(), kN, 12, 2, -1, b.o(0), b.c(1)); },
     "solver -1 is not one of QDM_SOLVER_AUTO, QDM_SOLVER_DENSE, QDM_SOLVER_KRYLOV (0, 1, 2)"},
    {"prony rate negative", QDM_ERR_SAMPLE_RATE,
     [](Buffers& b) {
       return qdm_prony_real(b.x.data(), kN, 4, -2.5, 0, b.o(0), b.o(1), b.o(2), b.o(3), &b.count);
     },
     "fs -2.5 is not positive"},
    {"prony rate infinite", QDM_ERR_NON_FINITE,
     [](Buffers& b) {
       return qdm_prony_complex(b.cx(), kN, 4, INFINITY, b.o(0), b.o(1), b.o(2), b.o(3), &b.count);
     },
     "fs inf is not finite"},
    {"prony rate as typed", QDM_ERR_SAMPLE_RATE,
     [](Buffers& b) {
       return qdm_prony_real(b.x.data(), kN, 4, -0.1, 0, b.o(0), b.o(1), b.o(2), b.o(3), &b.count);
     },
     "fs -0.1 is not positive"},
    {"pencil above the bound", QDM_ERR_ORDER,
     [](Buffers& b) {
       return qdm_matrix_pencil_real(b.x.data(), kN, 207, 4, 1.0, 0, b.o(0), b.o(1), b.o(2), b.o(3),
                                     &b.count, &b.d1);
     },
     "pencil 207 is above floor(2n/3) = 206 (n = 309)"},
    {"pencil's M above L", QDM_ERR_COUNT_ABOVE_ORDER,
     [](Buffers& b) {
       return qdm_matrix_pencil_complex(b.cx(), kN, 10, 11, 1.0, b.o(0), b.o(1), b.o(2), b.o(3),
                                        &b.count, &b.d1);
     },
     "order 11 is above pencil = 10"},
    {"pencil null mse", QDM_ERR_NULL_POINTER,
     [](Buffers& b) {
       return qdm_matrix_pencil_real(b.x.data(), kN, 100, 4, 1.0, 0, b.o(0), b.o(1), b.o(2), b.o(3),
                                     &b.count, nullptr);
     },
     "mse is null"},
    {"mdl min order 0", QDM_ERR_MIN_ORDER,
     [](Buffers& b) { return qdm_mdl_order_real(b.x.data(), kN, 20, 0, &b.count); },
     "min_order 0 is below 1"},
    {"mdl upper not above min", QDM_ERR_MDL_UPPER,
     [](Buffers& b) { return qdm_mdl_order_complex(b.cx(), kN, 5, 5, &b.count); },
     "pencil 5 is not above min_order = 5"},
    {"mdl upper above the bound", QDM_ERR_MDL_UPPER,
     [](Buffers& b) { return qdm_mdl_order_real(b.x.data(), kN, 250, 1, &b.count); },
     "pencil 250 is above floor(2n/3) = 206 (n = 309)"},
    {"spectrum of one point", QDM_ERR_SPECTRUM_SIZE,
     [](Buffers& b) {
       return qdm_covariance_psd_real(b.x.data(), kN, 4, 1, 1.0, b.o(0), &b.d1, &b.d2, &b.d3);
     },
     "points 1 is below 2"},
    {"spectrum beyond 2^30", QDM_ERR_SPECTRUM_SIZE,
     [](Buffers& b) {
       return qdm_covariance_psd_real(b.x.data(), kN, 4, (1 << 30) + 1, 1.0, b.o(0), &b.d1, &b.d2,
                                      &b.d3);
     },
     "points 1073741825 is above 2^30 = 1073741824"},
    {"spectrum shorter than the polynomial", QDM_ERR_SPECTRUM_TOO_SHORT,
     [](Buffers& b) {
       return qdm_covariance_psd_complex(b.cx(), kN, 200, 100, 1.0, b.o(0), &b.d1, &b.d2, &b.d3);
     },
     "points 100 gives fewer spectrum values than order + 1 = 201"},
    {"pcar spectrum components above the order", QDM_ERR_COUNT_ABOVE_ORDER,
     [](Buffers& b) {
       return qdm_pcar_psd_real(b.x.data(), kN, 8, 256, 9, 1.0, 0, b.o(0), b.o(1), b.o(2), &b.count,
                                b.o(3), &b.d1, &b.d2, &b.d3);
     },
     "components 9 is above order = 8"},
    {"pcar spectrum rate 0", QDM_ERR_SAMPLE_RATE,
     [](Buffers& b) {
       return qdm_pcar_psd_complex(b.cx(), kN, 8, 256, 2, 0.0, b.o(0), b.o(1), b.o(2), &b.count,
                                   b.o(3), &b.d1, &b.d2, &b.d3);
     },
     "fs 0 is not positive"},
    {"spectrum over the work bound", QDM_ERR_WORK_LIMIT,
     [](Buffers& b) {
       return qdm_covariance_psd_real(b.x.data(), kN, 4, 1 << 30, 1.0, b.o(0), &b.d1, &b.d2, &b.d3);
     },
     "work memory 51539666624 bytes is above QDM_MAX_WORK_BYTES = 8589934592 (n = 309)"},
    {"AR spectrum coefficient NaN", QDM_ERR_NON_FINITE,
     [](Buffers& b) {
       const double a[3] = {1.0, 0.5, NAN};
       return qdm_ar_psd_real(a, 2, 1.0, 64, 1.0, 1, b.o(0), b.o(1), b.o(2), &b.count);
     },
     "a[2] is not finite: nan"},
    {"AR spectrum negative variance", QDM_ERR_OPTION,
     [](Buffers& b) {
       const double a[3] = {1.0, 0.5, 0.1};
       return qdm_ar_psd_real(a, 2, -1.0, 64, 1.0, 1, b.o(0), b.o(1), b.o(2), &b.count);
     },
     "noise_variance -1 is below 0"},
    {"AR spectrum one-sided complex", QDM_ERR_OPTION,
     [](Buffers& b) {
       const double a[6] = {1.0, 0.0, 0.5, 0.0, 0.1, 0.0};
       return qdm_ar_psd_complex(reinterpret_cast<const qdm_complex*>(a), 2, 1.0, 64, 1.0, 1,
                                 b.o(0), b.o(1), b.o(2), &b.count);
     },
     "onesided 1 is not 0 for complex coefficients"},
    {"layout of an odd length", QDM_ERR_SPECTRUM_SIZE,
     [](Buffers& b) { return qdm_spectrum_layout(b.o(0), nullptr, 63, 1.0, 1, b.o(1), &b.count); },
     "length 63 is not even"},
};

std::string Message() {
  char text[512];
  const int32_t length = qdm_last_error_message(text, sizeof text);
  EXPECT_EQ(length, int32_t(std::strlen(text)));
  return text;
}

TEST(PlainMessages, EachRefusalNamesItsArgumentValueAndLimit) {
  for (const BadCall& c : kBadCalls) {
    Buffers b;
    EXPECT_EQ(c.call(b), c.code) << c.what;
    EXPECT_EQ(Message(), c.message) << c.what;
    // A good call after it clears the message.
    Buffers good;
    ASSERT_EQ(qdm_covariance_real(good.x.data(), kN, 4, good.o(0), good.c(1), &good.d1), QDM_OK);
    EXPECT_EQ(Message(), "") << c.what;
  }
}

TEST(PlainMessages, OtherFailuresGiveTheStatusText) {
  Buffers b;
  std::vector<double> zeros(64, 0.0);  // a zero record's pole at 0: a non-finite damping
  const int32_t s =
      qdm_prony_real(zeros.data(), 64, 2, 1.0, 0, b.o(0), b.o(1), b.o(2), b.o(3), &b.count);
  ASSERT_LT(s, 0);
  EXPECT_EQ(Message(), qdm_status_text(s));
}

TEST(PlainMessages, TheBufferIsCutAsSnprintfCutsIt) {
  Buffers b;
  ASSERT_EQ(qdm_covariance_real(b.x.data(), kN, 300, b.o(0), b.c(1), &b.d1), QDM_ERR_COUNT);
  const std::string whole = "order 300 is above floor(2n/3) = 206 (n = 309)";
  for (int32_t size : {0, 1, 2, 10, int32_t(whole.size()), int32_t(whole.size()) + 1}) {
    char text[64];
    std::memset(text, 'z', sizeof text);
    EXPECT_EQ(qdm_last_error_message(size == 0 ? nullptr : text, size), int32_t(whole.size()));
    if (size > 0) {
      EXPECT_EQ(std::string(text), whole.substr(0, size_t(size) - 1)) << size;
    }
    EXPECT_EQ(text[size], 'z') << "wrote past size " << size;
  }
  // Reading the message leaves it in place.
  EXPECT_EQ(Message(), whole);
}

// The checks are written once: asking for the reason never changes the code,
// and every refusal, and only a refusal, gives one.
TEST(PlainMessages, AFailureRecordNeverChangesACheck) {
  using checks::Bound;
  const int32_t values[] = {INT32_MIN, -1, 0, 1, 2, 3, 5, 8, 13, 20, 21, 1 << 30, INT32_MAX};
  const double rates[] = {-1.0, 0.0, 1.0, NAN};
  int refused = 0;
  for (Bound bound : {Bound::kHost, Bound::kWide}) {
    for (int32_t n : {0, 1, 2, 30, INT32_MAX}) {
      for (int32_t p : values) {
        for (int32_t k : values) {
          for (double r : rates) {
            const StatusCode plain[] = {checks::Prony(n, p, r, bound),
                                        checks::Covariance(n, p, bound),
                                        checks::Pcar(n, p, k, bound),
                                        checks::Pencil(n, p, k, r, bound),
                                        checks::Mdl(n, p, k, bound),
                                        checks::CovSpectrum(n, p, k, r, bound),
                                        checks::PcarSpectrum(n, p, k, 64, r, bound)};
            checks::Failure f[7];
            const StatusCode told[] = {checks::Prony(n, p, r, bound, &f[0]),
                                       checks::Covariance(n, p, bound, &f[1]),
                                       checks::Pcar(n, p, k, bound, &f[2]),
                                       checks::Pencil(n, p, k, r, bound, &f[3]),
                                       checks::Mdl(n, p, k, bound, &f[4]),
                                       checks::CovSpectrum(n, p, k, r, bound, &f[5]),
                                       checks::PcarSpectrum(n, p, k, 64, r, bound, &f[6])};
            for (int i = 0; i < 7; ++i) {
              ASSERT_EQ(told[i], plain[i]) << i << " n " << n << " p " << p << " k " << k;
              ASSERT_EQ(f[i].argument != nullptr, plain[i] != status::kOk) << i;
              refused += plain[i] != status::kOk;
            }
          }
        }
      }
    }
  }
  EXPECT_GT(refused, 1000);
}

}  // namespace
