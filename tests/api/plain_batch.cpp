// Batches: every fit's batch twin against its single-record function called on
// each record, over strided, padded, overlapping and repeated layouts and any
// thread count; bad records in the middle; the checks that concern every
// record; no memory for one record.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "numeric/work.h"
#include "qdm_api.h"

namespace {

constexpr int32_t kN = 96;
constexpr double kFs = 100.0;

// Every output of one fit over `count` records, row by row: doubles (complex
// values as pairs) and 32-bit integers, each with its values per record.
struct Outputs {
  std::vector<std::vector<double>> d;
  std::vector<std::vector<int32_t>> k;
  std::vector<int> d_row, k_row;
  Outputs(int64_t count, std::vector<int> doubles, std::vector<int> ints)
      : d_row(std::move(doubles)), k_row(std::move(ints)) {
    for (int r : d_row) d.emplace_back(size_t(count * r), -7.0);  // a value no fit writes
    for (int r : k_row) k.emplace_back(size_t(count * r), -7);
  }
  double* D(size_t j, int64_t i) { return d[j].data() + i * d_row[j]; }
  int32_t* K(size_t j, int64_t i) { return k[j].data() + i * k_row[j]; }
};

bool BitEqual(const Outputs& a, const Outputs& b) {
  for (size_t j = 0; j < a.d.size(); ++j) {
    if (std::memcmp(a.d[j].data(), b.d[j].data(), a.d[j].size() * sizeof(double)) != 0)
      return false;
  }
  for (size_t j = 0; j < a.k.size(); ++j) {
    if (a.k[j] != b.k[j]) return false;
  }
  return true;
}

// One fit: its output rows for either data type, its single-record call on
// record x into row i, and its batch call.
struct Fit {
  const char* name;
  std::function<Outputs(int64_t count, bool cx)> outputs;
  std::function<int32_t(const double* x, bool cx, Outputs& o, int64_t i)> single;
  std::function<int32_t(const double* x, int64_t count, int64_t distance, bool cx, Outputs& o,
                        int32_t* status, int32_t threads)>
      batch;
};

const qdm_complex* C(const double* x) { return reinterpret_cast<const qdm_complex*>(x); }
qdm_complex* C(double* x) { return reinterpret_cast<qdm_complex*>(x); }

constexpr int32_t kP = 4, kPcarP = 6, kK = 2, kL = 32, kMdlL = 20, kPoints = 64;

std::vector<Fit> Fits() {
  std::vector<Fit> f;
  f.push_back(
      {"covariance",
       [](int64_t c, bool cx) {
         return Outputs(c, {(kP + 1) * (cx ? 2 : 1), 2 * kP, 1}, {});
       },
       [](const double* x, bool cx, Outputs& o, int64_t i) {
         return cx ? qdm_covariance_complex(C(x), kN, kP, C(o.D(0, i)), C(o.D(1, i)), o.D(2, i))
                   : qdm_covariance_real(x, kN, kP, o.D(0, i), C(o.D(1, i)), o.D(2, i));
       },
       [](const double* x, int64_t c, int64_t d, bool cx, Outputs& o, int32_t* s, int32_t t) {
         return cx ? qdm_covariance_batch_complex(C(x), kN, c, d, kP, C(o.D(0, 0)), C(o.D(1, 0)),
                                                  o.D(2, 0), s, t)
                   : qdm_covariance_batch_real(x, kN, c, d, kP, o.D(0, 0), C(o.D(1, 0)), o.D(2, 0),
                                               s, t);
       }});
  f.push_back(
      {"pcar",
       [](int64_t c, bool cx) {
         return Outputs(c, {(kPcarP + 1) * (cx ? 2 : 1), 2 * kPcarP}, {});
       },
       [](const double* x, bool cx, Outputs& o, int64_t i) {
         return cx ? qdm_pcar_solver_complex(C(x), kN, kPcarP, kK, QDM_SOLVER_AUTO, C(o.D(0, i)),
                                             C(o.D(1, i)))
                   : qdm_pcar_solver_real(x, kN, kPcarP, kK, QDM_SOLVER_AUTO, o.D(0, i),
                                          C(o.D(1, i)));
       },
       [](const double* x, int64_t c, int64_t d, bool cx, Outputs& o, int32_t* s, int32_t t) {
         return cx ? qdm_pcar_batch_complex(C(x), kN, c, d, kPcarP, kK, QDM_SOLVER_AUTO,
                                            C(o.D(0, 0)), C(o.D(1, 0)), s, t)
                   : qdm_pcar_batch_real(x, kN, c, d, kPcarP, kK, QDM_SOLVER_AUTO, o.D(0, 0),
                                         C(o.D(1, 0)), s, t);
       }});
  f.push_back(
      {"prony",
       [](int64_t c, bool) {
         return Outputs(c, {kP, kP, kP, kP}, {1});
       },
       [](const double* x, bool cx, Outputs& o, int64_t i) {
         return cx ? qdm_prony_complex(C(x), kN, kP, kFs, o.D(0, i), o.D(1, i), o.D(2, i),
                                       o.D(3, i), o.K(0, i))
                   : qdm_prony_real(x, kN, kP, kFs, 1, o.D(0, i), o.D(1, i), o.D(2, i), o.D(3, i),
                                    o.K(0, i));
       },
       [](const double* x, int64_t c, int64_t d, bool cx, Outputs& o, int32_t* s, int32_t t) {
         return cx ? qdm_prony_batch_complex(C(x), kN, c, d, kP, kFs, o.D(0, 0), o.D(1, 0),
                                             o.D(2, 0), o.D(3, 0), o.K(0, 0), s, t)
                   : qdm_prony_batch_real(x, kN, c, d, kP, kFs, 1, o.D(0, 0), o.D(1, 0), o.D(2, 0),
                                          o.D(3, 0), o.K(0, 0), s, t);
       }});
  f.push_back(
      {"matrix_pencil",
       [](int64_t c, bool) {
         return Outputs(c, {kP, kP, kP, kP, 1}, {1});
       },
       [](const double* x, bool cx, Outputs& o, int64_t i) {
         return cx ? qdm_matrix_pencil_solver_complex(C(x), kN, kL, kP, kFs, QDM_SOLVER_AUTO,
                                                      o.D(0, i), o.D(1, i), o.D(2, i), o.D(3, i),
                                                      o.K(0, i), o.D(4, i))
                   : qdm_matrix_pencil_solver_real(x, kN, kL, kP, kFs, 0, QDM_SOLVER_AUTO,
                                                   o.D(0, i), o.D(1, i), o.D(2, i), o.D(3, i),
                                                   o.K(0, i), o.D(4, i));
       },
       [](const double* x, int64_t c, int64_t d, bool cx, Outputs& o, int32_t* s, int32_t t) {
         return cx ? qdm_matrix_pencil_batch_complex(C(x), kN, c, d, kL, kP, kFs, QDM_SOLVER_AUTO,
                                                     o.D(0, 0), o.D(1, 0), o.D(2, 0), o.D(3, 0),
                                                     o.K(0, 0), o.D(4, 0), s, t)
                   : qdm_matrix_pencil_batch_real(x, kN, c, d, kL, kP, kFs, 0, QDM_SOLVER_AUTO,
                                                  o.D(0, 0), o.D(1, 0), o.D(2, 0), o.D(3, 0),
                                                  o.K(0, 0), o.D(4, 0), s, t);
       }});
  f.push_back(
      {"mdl_order", [](int64_t c, bool) { return Outputs(c, {}, {1}); },
       [](const double* x, bool cx, Outputs& o, int64_t i) {
         *o.K(0, i) = 0;
         return cx ? qdm_mdl_order_complex(C(x), kN, kMdlL, 1, o.K(0, i))
                   : qdm_mdl_order_real(x, kN, kMdlL, 1, o.K(0, i));
       },
       [](const double* x, int64_t c, int64_t d, bool cx, Outputs& o, int32_t* s, int32_t t) {
         std::fill(o.k[0].begin(), o.k[0].end(), 0);
         return cx ? qdm_mdl_order_batch_complex(C(x), kN, c, d, kMdlL, 1, o.K(0, 0), s, t)
                   : qdm_mdl_order_batch_real(x, kN, c, d, kMdlL, 1, o.K(0, 0), s, t);
       }});
  f.push_back(
      {"covariance_psd",
       [](int64_t c, bool) {
         return Outputs(c, {kPoints, 1, 1, 1}, {});
       },
       [](const double* x, bool cx, Outputs& o, int64_t i) {
         return cx ? qdm_covariance_psd_complex(C(x), kN, kP, kPoints, kFs, o.D(0, i), o.D(1, i),
                                                o.D(2, i), o.D(3, i))
                   : qdm_covariance_psd_real(x, kN, kP, kPoints, kFs, o.D(0, i), o.D(1, i),
                                             o.D(2, i), o.D(3, i));
       },
       [](const double* x, int64_t c, int64_t d, bool cx, Outputs& o, int32_t* s, int32_t t) {
         return cx ? qdm_covariance_psd_batch_complex(C(x), kN, c, d, kP, kPoints, kFs, o.D(0, 0),
                                                      o.D(1, 0), o.D(2, 0), o.D(3, 0), s, t)
                   : qdm_covariance_psd_batch_real(x, kN, c, d, kP, kPoints, kFs, o.D(0, 0),
                                                   o.D(1, 0), o.D(2, 0), o.D(3, 0), s, t);
       }});
  f.push_back(
      {"pcar_psd",
       [](int64_t c, bool) {
         return Outputs(c, {kK, kK, kK, kPoints, 1, 1, 1}, {1});
       },
       [](const double* x, bool cx, Outputs& o, int64_t i) {
         return cx ? qdm_pcar_psd_complex(C(x), kN, kPcarP, kPoints, kK, kFs, o.D(0, i), o.D(1, i),
                                          o.D(2, i), o.K(0, i), o.D(3, i), o.D(4, i), o.D(5, i),
                                          o.D(6, i))
                   : qdm_pcar_psd_real(x, kN, kPcarP, kPoints, kK, kFs, 0, o.D(0, i), o.D(1, i),
                                       o.D(2, i), o.K(0, i), o.D(3, i), o.D(4, i), o.D(5, i),
                                       o.D(6, i));
       },
       [](const double* x, int64_t c, int64_t d, bool cx, Outputs& o, int32_t* s, int32_t t) {
         return cx ? qdm_pcar_psd_batch_complex(C(x), kN, c, d, kPcarP, kPoints, kK, kFs, o.D(0, 0),
                                                o.D(1, 0), o.D(2, 0), o.K(0, 0), o.D(3, 0),
                                                o.D(4, 0), o.D(5, 0), o.D(6, 0), s, t)
                   : qdm_pcar_psd_batch_real(x, kN, c, d, kPcarP, kPoints, kK, kFs, 0, o.D(0, 0),
                                             o.D(1, 0), o.D(2, 0), o.K(0, 0), o.D(3, 0), o.D(4, 0),
                                             o.D(5, 0), o.D(6, 0), s, t);
       }});
  return f;
}

// `values` doubles of two damped tones and a little noise that changes along
// the buffer, so that every record (every window) differs.
std::vector<double> Signal(size_t values) {
  std::vector<double> v(values);
  uint64_t state = 12345;
  for (size_t t = 0; t < values; ++t) {
    state = state * 6364136223846793005ULL + 1442695040888963407ULL;
    const double noise = double(state >> 11) * 0x1p-53 - 0.5;
    const double u = double(t);
    v[t] = std::exp(-0.004 * u) * std::cos(0.61 * u) + 0.5 * std::cos(1.7 * u + 0.3) + 0.05 * noise;
  }
  return v;
}

// The single-record results of each record, in rows.
Outputs Expected(const Fit& fit, const double* x, int64_t count, int64_t distance, bool cx,
                 std::vector<int32_t>* status) {
  Outputs o = fit.outputs(count, cx);
  status->assign(size_t(count), 0);
  for (int64_t i = 0; i < count; ++i) {
    (*status)[size_t(i)] = fit.single(x + i * distance * (cx ? 2 : 1), cx, o, i);
  }
  return o;
}

std::string LastMessage() {
  char text[512];
  qdm_last_error_message(text, sizeof text);
  return text;
}

// Rows of a count-by-n array, padded rows, overlapping windows and one record
// repeated, on one thread, two, and one per processor.
TEST(PlainBatch, EveryFitEqualsItsSingleCallsOnEveryLayoutAndThreadCount) {
  constexpr int64_t kCount = 5;
  for (const Fit& fit : Fits()) {
    for (const bool cx : {false, true}) {
      for (const int64_t distance : {int64_t{kN}, int64_t{kN} + 3, int64_t{kN} / 2, int64_t{0}}) {
        const std::vector<double> x = Signal(size_t(((kCount - 1) * distance + kN) * (cx ? 2 : 1)));
        std::vector<int32_t> want;
        const Outputs expected = Expected(fit, x.data(), kCount, distance, cx, &want);
        for (const int32_t threads : {1, 2, 0}) {
          const std::string where = std::string(fit.name) + (cx ? " complex" : " real") +
                                    " distance " + std::to_string(distance) + " threads " +
                                    std::to_string(threads);
          Outputs got = fit.outputs(kCount, cx);
          std::vector<int32_t> status(kCount, -7);
          EXPECT_EQ(fit.batch(x.data(), kCount, distance, cx, got, status.data(), threads), QDM_OK)
              << where << ": " << LastMessage();
          EXPECT_EQ(status, want) << where;
          EXPECT_TRUE(BitEqual(got, expected)) << where;
          for (int32_t s : status) EXPECT_GE(s, 0) << where;
        }
      }
    }
  }
}

// A NaN record and an all-zero record in the middle have their own statuses,
// and every other record completes as it would alone.
TEST(PlainBatch, BadRecordsFailAloneAndTheFirstIsNamed) {
  constexpr int64_t kCount = 7;
  for (const Fit& fit : Fits()) {
    for (const bool cx : {false, true}) {
      const int width = cx ? 2 : 1;
      std::vector<double> x = Signal(size_t(kCount * kN * width));
      x[size_t((2 * kN + 5) * width)] = NAN;
      std::fill(x.begin() + 4 * kN * width, x.begin() + 5 * kN * width, 0.0);
      std::vector<int32_t> want;
      const Outputs expected = Expected(fit, x.data(), kCount, kN, cx, &want);
      const std::string where = std::string(fit.name) + (cx ? " complex" : " real");
      EXPECT_EQ(want[2], QDM_ERR_NON_FINITE) << where;
      Outputs got = fit.outputs(kCount, cx);
      std::vector<int32_t> status(kCount, -7);
      EXPECT_EQ(fit.batch(x.data(), kCount, kN, cx, got, status.data(), 2), QDM_WARN_RECORD_FAILED)
          << where;
      EXPECT_EQ(status, want) << where;
      EXPECT_TRUE(BitEqual(got, expected)) << where;
      EXPECT_EQ(LastMessage(), "record 2: x[5] is not finite: nan") << where;
      for (int64_t i : {0, 1, 3, 5, 6}) EXPECT_GE(status[size_t(i)], 0) << where << " " << i;
    }
  }
}

// What concerns every record is refused once, before any record is read, and
// nothing is written: the layout, then the single function's own checks.
TEST(PlainBatch, RefusalsOfTheWholeBatchWriteNothingAndNameTheArgument) {
  const std::vector<double> x = Signal(size_t(8 * kN * 2));
  struct Case {
    int64_t count, distance;
    int32_t threads, order;
    bool null_status;
    int32_t code;
    const char* message;
  };
  const Case cases[] = {
      {-1, kN, 1, kP, false, QDM_ERR_BATCH, "count -1 is negative"},
      {3, -1, 1, kP, false, QDM_ERR_BATCH, "distance -1 is negative"},
      {3, kN, -2, kP, false, QDM_ERR_BATCH, "threads -2 is negative"},
      {3, kN, 1, kP, true, QDM_ERR_NULL_POINTER, "status is null"},
      {int64_t{1} << 50, int64_t{1} << 20, 1, kP, false, QDM_ERR_BATCH,
       "count 1125899906842624 is above the records of this size the address space holds = "},
      {3, kN, 1, 65, false, QDM_ERR_COUNT, "order 65 is above floor(2n/3) = 64 (n = 96)"},
      {3, kN, 1, 0, false, QDM_ERR_COUNT, "order 0 is below 1"},
  };
  for (const Case& c : cases) {
    std::vector<double> coefficients(8 * 66, -7.0), poles(16 * 66, -7.0), variance(8, -7.0);
    std::vector<int32_t> status(8, -7);
    EXPECT_EQ(qdm_covariance_batch_real(x.data(), kN, c.count, c.distance, c.order,
                                        coefficients.data(), C(poles.data()), variance.data(),
                                        c.null_status ? nullptr : status.data(), c.threads),
              c.code)
        << c.message;
    EXPECT_EQ(LastMessage().rfind(c.message, 0), 0u) << LastMessage();
    for (double v : coefficients) ASSERT_EQ(v, -7.0) << c.message;
    for (double v : variance) ASSERT_EQ(v, -7.0) << c.message;
    for (int32_t s : status) ASSERT_EQ(s, -7) << c.message;
  }
  // A NaN rate concerns every record; a NaN sample only its own.
  std::vector<double> amplitude(3 * kP), phase(3 * kP), damping(3 * kP), frequency(3 * kP);
  std::vector<int32_t> modes(3), status(3, -7);
  EXPECT_EQ(qdm_prony_batch_real(x.data(), kN, 3, kN, kP, NAN, 0, amplitude.data(), phase.data(),
                                 damping.data(), frequency.data(), modes.data(), status.data(), 1),
            QDM_ERR_NON_FINITE);
  EXPECT_EQ(LastMessage(), "fs nan is not finite");
  EXPECT_EQ(status, std::vector<int32_t>(3, -7));
  // No records: the arguments are still checked, and nothing is written.
  EXPECT_EQ(qdm_prony_batch_real(x.data(), kN, 0, kN, kP, kFs, 0, amplitude.data(), phase.data(),
                                 damping.data(), frequency.data(), modes.data(), status.data(), 0),
            QDM_OK);
  EXPECT_EQ(status, std::vector<int32_t>(3, -7));
  EXPECT_EQ(qdm_prony_batch_real(x.data(), kN, 0, kN, kP, -1.0, 0, amplitude.data(), phase.data(),
                                 damping.data(), frequency.data(), modes.data(), status.data(), 0),
            QDM_ERR_SAMPLE_RATE);
}

// Memory that runs out inside one record fails that record alone: each
// allocation of a three-record batch made to fail in turn, on one thread.
TEST(PlainBatch, NoMemoryFailsOnlyTheRecordThatRanOutOfIt) {
  const Fit fit = Fits()[3];  // the pencil
  constexpr int64_t kCount = 3;
  const std::vector<double> x = Signal(size_t(kCount * kN));
  std::vector<int32_t> want;
  const Outputs clean = Expected(fit, x.data(), kCount, kN, false, &want);
  int64_t failed_records = 0;
  for (int64_t k = 1;; ++k) {
    Outputs got = fit.outputs(kCount, false);
    std::vector<int32_t> status(kCount, -7);
    NumAllocFailAt(k, false);
    const int32_t s = fit.batch(x.data(), kCount, kN, false, got, status.data(), 1);
    const bool reached = NumAllocAttempts() >= k;
    NumAllocFailAt(0, false);
    ASSERT_EQ(NumAllocOutstanding(), 0) << k;
    if (!reached) {
      EXPECT_EQ(s, QDM_OK);
      EXPECT_TRUE(BitEqual(got, clean));
      break;
    }
    EXPECT_EQ(s, QDM_WARN_RECORD_FAILED) << k;
    int failures = 0;
    for (int64_t i = 0; i < kCount; ++i) {
      const int32_t si = status[size_t(i)];
      if (si == QDM_ERR_NO_MEMORY) {
        ++failures;
        EXPECT_EQ(*got.K(0, i), 0) << k;
      } else {
        EXPECT_EQ(si, want[size_t(i)]) << k << " " << i;
        for (size_t j = 0; j < 4; ++j) {
          EXPECT_EQ(0, std::memcmp(got.D(j, i), clean.d[j].data() + i * kP, kP * sizeof(double)));
        }
      }
    }
    EXPECT_EQ(failures, 1) << k;
    ++failed_records;
  }
  EXPECT_GT(failed_records, 3 * 5);
}

// The error bars of a batch of pencil fits, each record with its own mode
// count: rows equal the single calls; a count of 0 or above the row is the
// record's own refusal.
TEST(PlainBatch, ModeErrorsTakeEachRecordsCount) {
  constexpr int64_t kCount = 4;
  for (const bool cx : {false, true}) {
    const int width = cx ? 2 : 1;
    const std::vector<double> x = Signal(size_t(kCount * kN * width));
    const Fit fit = Fits()[3];
    Outputs modes = fit.outputs(kCount, cx);
    std::vector<int32_t> fitted(kCount);
    ASSERT_EQ(fit.batch(x.data(), kCount, kN, cx, modes, fitted.data(), 1), QDM_OK);
    std::vector<int32_t> counts(modes.k[0]);
    counts[1] = 0;
    counts[3] = kP + 1;
    std::vector<double> se(4 * kCount * kP, -7.0), noise(kCount, -7.0);
    std::vector<int32_t> status(kCount, -7);
    const auto ses = [&](int q) { return se.data() + q * kCount * kP; };
    const int32_t s = cx ? qdm_mode_errors_batch_complex(
                               C(x.data()), kN, kCount, kN, kFs, kP, counts.data(), modes.D(0, 0),
                               modes.D(1, 0), modes.D(2, 0), modes.D(3, 0), ses(0), ses(1), ses(2),
                               ses(3), noise.data(), status.data(), 2)
                         : qdm_mode_errors_batch_real(
                               x.data(), kN, kCount, kN, kFs, 0, kP, counts.data(), modes.D(0, 0),
                               modes.D(1, 0), modes.D(2, 0), modes.D(3, 0), ses(0), ses(1), ses(2),
                               ses(3), noise.data(), status.data(), 2);
    EXPECT_EQ(s, QDM_WARN_RECORD_FAILED);
    EXPECT_EQ(status[1], QDM_ERR_NO_MODES);
    EXPECT_EQ(status[3], QDM_ERR_ROOM);
    for (int64_t i : {0, 2}) {
      double one[4][kP], v = 0.0;
      const double* in[4] = {modes.D(0, i), modes.D(1, i), modes.D(2, i), modes.D(3, i)};
      const int32_t m = counts[size_t(i)];
      const int32_t alone =
          cx ? qdm_mode_errors_complex(C(x.data() + i * kN * width), kN, kFs, m, in[0], in[1],
                                       in[2], in[3], one[0], one[1], one[2], one[3], &v)
             : qdm_mode_errors_real(x.data() + i * kN, kN, kFs, 0, m, in[0], in[1], in[2], in[3],
                                    one[0], one[1], one[2], one[3], &v);
      EXPECT_EQ(status[size_t(i)], alone);
      EXPECT_EQ(noise[size_t(i)], v);
      for (int q = 0; q < 4; ++q) {
        EXPECT_EQ(0, std::memcmp(ses(q) + i * kP, one[q], size_t(m) * sizeof(double))) << q;
      }
    }
  }
}

}  // namespace
