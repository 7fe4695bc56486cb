// The MDL order search passes over candidates whose bounded fast score rules
// them out; the order it chooses and the status it returns must be exactly
// those of the search that fits every candidate in full. Here both run over a
// table of records (real and complex; noise-free sums of modes, noisy ones,
// pure noise, constant, spike, ramp, alternating, growing; scales 1e-6 to
// 1e6; n from 8 to 2048; upper orders from small to the largest allowed).
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstdio>
#include <limits>
#include <string>
#include <vector>

#include "estimation/estimation.h"
#include "numeric/lapack_boundary.h"
#include "numeric/work.h"

namespace {

// A small generator of our own, so that every platform draws the same records.
struct Rng {
  uint64_t s;
  double Uniform() {  // (0, 1)
    s = s * 6364136223846793005ULL + 1442695040888963407ULL;
    return (static_cast<double>(s >> 11) + 0.5) / 9007199254740992.0;
  }
  double Normal() {
    const double u = Uniform(), v = Uniform();
    return std::sqrt(-2.0 * std::log(u)) * std::cos(6.283185307179586 * v);
  }
};

enum class Shape { kModes, kNoise, kConstant, kSpike, kRamp, kAlternating, kGrowing };

struct Record {
  Shape shape;
  int modes;     // kModes: how many
  bool damped;   // kModes: damped modes
  double snrDb;  // noise below the signal; infinity for none
  double scale;  // every sample multiplied by this
  int32_t n, upper, minOrder;
  uint64_t seed;
};

std::string Describe(const Record& r, bool complexForm) {
  static const char* kNames[] = {"modes", "noise",       "constant", "spike",
                                 "ramp",  "alternating", "growing"};
  char text[200];
  std::snprintf(text, sizeof text, "%s %s %d%s snr %g dB scale %g n %d upper %d min %d",
                complexForm ? "complex" : "real", kNames[static_cast<int>(r.shape)], r.modes,
                r.damped ? " damped" : "", r.snrDb, r.scale, r.n, r.upper, r.minOrder);
  return text;
}

// Samples as complex values; the real form takes the real parts (a real
// record's modes come in conjugate pairs, so its frequencies are drawn as such).
std::vector<Complex> Samples(const Record& r, bool complexForm) {
  Rng rng{r.seed * 0x9E3779B97F4A7C15ULL + (complexForm ? 1 : 0)};
  std::vector<Complex> x(static_cast<size_t>(r.n));
  struct Mode {
    Complex z, a;
  };
  std::vector<Mode> modes;
  for (int k = 0; k < r.modes; ++k) {
    const double f = 3.0 * rng.Uniform() - 0.02;  // angle in (-0.02, 2.98)
    const double radius = r.damped ? 1.0 - 0.05 * rng.Uniform() : 1.0;
    modes.push_back({std::polar(radius, complexForm ? f - 1.5 : f),
                     std::polar(0.5 + rng.Uniform(), 6.283185307179586 * rng.Uniform())});
  }
  double power = 0.0;
  for (int32_t t = 0; t < r.n; ++t) {
    Complex v;
    switch (r.shape) {
      case Shape::kModes:
        for (const Mode& m : modes) v += m.a * std::pow(m.z, t);
        break;
      case Shape::kNoise:
        v = Complex(rng.Normal(), rng.Normal());
        break;
      case Shape::kConstant:
        v = Complex(1.5, -0.5);
        break;
      case Shape::kSpike:
        v = t == r.n / 3 ? Complex(1.0, 1.0) : Complex(0.0, 0.0);
        break;
      case Shape::kRamp:
        v = Complex(t, 0.5 * t);
        break;
      case Shape::kAlternating:
        v = t % 2 == 0 ? Complex(1.0, 0.25) : Complex(-1.0, -0.25);
        break;
      case Shape::kGrowing:
        v = std::pow(Complex(1.04, 0.3), t) + Complex(rng.Normal(), rng.Normal()) * 0.01;
        break;
    }
    x[static_cast<size_t>(t)] = v;
    power += std::norm(complexForm ? v : Complex(v.real(), 0.0));
  }
  if (std::isfinite(r.snrDb)) {
    const double sigma =
        std::sqrt(power / r.n * std::pow(10.0, -r.snrDb / 10.0) / (complexForm ? 2.0 : 1.0));
    for (Complex& v : x) v += sigma * Complex(rng.Normal(), rng.Normal());
  }
  for (Complex& v : x) v *= r.scale;
  return x;
}

struct Outcome {
  StatusCode status;
  int32_t order;
};

Outcome Search(const std::vector<Complex>& x, const Record& r, bool complexForm, bool full) {
  Outcome o{status::kOk, -1};
  const int32_t n = r.n;
  if (complexForm) {
    o.status = full ? MdlOrderFullComplex(x.data(), n, r.upper, r.minOrder, &o.order)
                    : MdlOrderComplex(x.data(), n, r.upper, r.minOrder, &o.order);
  } else {
    std::vector<double> re(x.size());
    for (size_t t = 0; t < x.size(); ++t) re[t] = x[t].real();
    o.status = full ? MdlOrderFullReal(re.data(), n, r.upper, r.minOrder, &o.order)
                    : MdlOrderReal(re.data(), n, r.upper, r.minOrder, &o.order);
  }
  return o;
}

std::vector<Record> Table() {
  constexpr double kNone = std::numeric_limits<double>::infinity();
  std::vector<Record> table;
  uint64_t seed = 1;
  const Shape others[] = {Shape::kNoise, Shape::kRamp,        Shape::kConstant,
                          Shape::kSpike, Shape::kAlternating, Shape::kGrowing};
  // Every shape, scale and noise level on the short records, with a small upper
  // order and the largest one allowed (floor(2n/3)); from n = 128 on one
  // smallest order per scale, to bound the time.
  struct Size {
    int32_t n, upper;
  };
  const Size sizes[] = {{8, 2},   {8, 5},   {16, 4},   {16, 10},  {33, 6},  {33, 22},
                        {64, 12}, {64, 42}, {128, 24}, {128, 85}, {257, 40}};
  const double scales[] = {1e-6, 1.0, 1e6};
  for (const Size& z : sizes) {
    for (int s = 0; s < 3; ++s) {
      for (const int32_t minOrder : {1, 3}) {
        if (minOrder >= z.upper || (z.n >= 128 && minOrder != (s == 1 ? 3 : 1))) continue;
        for (const int modes : {1, 2, 5, 10, 20}) {
          if (2 * modes > z.upper + 6) continue;
          for (const bool damped : {false, true}) {
            for (const double snr : {kNone, 40.0, 20.0, 0.0}) {
              table.push_back(
                  {Shape::kModes, modes, damped, snr, scales[s], z.n, z.upper, minOrder, seed++});
            }
          }
        }
        for (const Shape shape : others) {
          table.push_back({shape, 0, false, kNone, scales[s], z.n, z.upper, minOrder, seed++});
        }
        table.push_back({Shape::kRamp, 0, false, 30.0, scales[s], z.n, z.upper, minOrder, seed++});
      }
    }
  }
  // Longer records: many candidates, most of them passed over.
  for (const int modes : {2, 10, 20}) {
    for (const bool damped : {false, true}) {
      for (const double snr : {kNone, 20.0, 0.0}) {
        table.push_back({Shape::kModes, modes, damped, snr, 1.0, 256, 170, 1, seed++});
      }
    }
  }
  for (const Shape shape : others) {
    table.push_back({shape, 0, false, kNone, 1.0, 256, 170, 1, seed++});
  }
  table.push_back({Shape::kModes, 3, true, 20.0, 1e6, 512, 341, 1, seed++});
  table.push_back({Shape::kNoise, 0, false, kNone, 1.0, 512, 341, 2, seed++});
  table.push_back({Shape::kModes, 20, false, kNone, 1.0, 512, 200, 1, seed++});
  for (const double scale : scales) {
    table.push_back({Shape::kModes, 8, true, 10.0, scale, 1024, 100, 1, seed++});
    table.push_back({Shape::kModes, 12, false, 40.0, scale, 2048, 48, 1, seed++});
    table.push_back({Shape::kModes, 4, true, kNone, scale, 2048, 40, 3, seed++});
  }
  return table;
}

TEST(MdlSearch, ChoosesTheOrderOfTheFullSearch) {
  int64_t records = 0, stops = 0, none = 0;
  int64_t fullAllocations = 0, fastAllocations = 0;  // long records only
  for (const Record& r : Table()) {
    for (const bool complexForm : {false, true}) {
      const std::vector<Complex> x = Samples(r, complexForm);
      NumAllocFailAt(0, false);
      const Outcome full = Search(x, r, complexForm, true);
      const int64_t fullAttempts = NumAllocAttempts();
      NumAllocFailAt(0, false);
      const Outcome fast = Search(x, r, complexForm, false);
      if (r.n >= 512) {
        fullAllocations += fullAttempts;
        fastAllocations += NumAllocAttempts();
      }
      ++records;
      stops += full.order >= 0 && full.order == r.minOrder;
      none += full.order < 0;
      EXPECT_EQ(fast.status, full.status) << Describe(r, complexForm);
      EXPECT_EQ(fast.order, full.order) << Describe(r, complexForm);
    }
  }
  std::printf("%lld records, %lld at the smallest order, %lld with no order\n",
              static_cast<long long>(records), static_cast<long long>(stops),
              static_cast<long long>(none));
  // A full fit takes a dozen work blocks, a fast score four: on the long
  // records most candidates must have been passed over unfitted.
  std::printf("work allocations on the long records: %lld fast, %lld full\n",
              static_cast<long long>(fastAllocations), static_cast<long long>(fullAllocations));
  EXPECT_LT(2 * fastAllocations, fullAllocations);
}

// Records the search cannot fit: the same status (and no order) from both
// searches. Arguments the checks refuse never reach a search; the faces' tests
// cover them.
TEST(MdlSearch, RefusesWhatTheFullSearchRefuses) {
  struct Case {
    const char* what;
    std::vector<double> x;
    int32_t upper, minOrder;
  };
  const double nan = std::numeric_limits<double>::quiet_NaN();
  const double inf = std::numeric_limits<double>::infinity();
  std::vector<double> ramp(30);
  for (int t = 0; t < 30; ++t) ramp[t] = t;
  std::vector<double> withNan = ramp, withInf = ramp, huge = ramp, zeros(30, 0.0);
  withNan[7] = nan;
  withInf[3] = inf;
  for (double& v : huge) v *= 1e300;
  const Case cases[] = {
      {"a NaN", withNan, 6, 1},
      {"an infinity", withInf, 6, 1},
      {"near overflow", huge, 8, 1},
      {"all zero", zeros, 8, 1},
  };
  for (const Case& c : cases) {
    const int32_t n = static_cast<int32_t>(c.x.size());
    std::vector<Complex> xc(c.x.size());
    for (size_t t = 0; t < c.x.size(); ++t) xc[t] = Complex(c.x[t], -0.5 * c.x[t]);
    int32_t a = -1, b = -1, ac = -1, bc = -1;
    const StatusCode full = MdlOrderFullReal(c.x.data(), n, c.upper, c.minOrder, &a);
    const StatusCode fast = MdlOrderReal(c.x.data(), n, c.upper, c.minOrder, &b);
    const StatusCode fullC = MdlOrderFullComplex(xc.data(), n, c.upper, c.minOrder, &ac);
    const StatusCode fastC = MdlOrderComplex(xc.data(), n, c.upper, c.minOrder, &bc);
    EXPECT_EQ(fast, full) << c.what;
    EXPECT_EQ(b, a) << c.what;
    EXPECT_EQ(fastC, fullC) << c.what;
    EXPECT_EQ(bc, ac) << c.what;
  }
}

// A failed Cholesky factorization or condition estimate leaves the candidate
// to the full fit. Each LAPACK call of the search's second half (where, on
// this record, no candidate gets the full fit: a failure there is either an
// eigenproblem's, which the search reports, or the fast score's) is made to
// fail in turn: the search reports the failure or chooses the clean order.
TEST(MdlSearch, AFailedFastScoreFallsBackToTheFullFit) {
  const Record r{Shape::kModes, 3, true, 20.0, 1.0, 96, 40, 1, 99};
  for (const bool complexForm : {false, true}) {
    const std::vector<Complex> x = Samples(r, complexForm);
    LapackFailAt(0, 0, false);
    const Outcome clean = Search(x, r, complexForm, false);
    const int64_t calls = LapackCalls();
    ASSERT_EQ(clean.status, 0);
    int64_t fellBack = 0;
    for (int64_t k = calls / 2; k <= calls; ++k) {
      LapackFailAt(k, 1, false);
      const Outcome o = Search(x, r, complexForm, false);
      LapackFailAt(0, 0, false);
      EXPECT_TRUE(o.status != 0 || o.order == clean.order) << "k=" << k;
      fellBack += o.status == 0;
    }
    EXPECT_GT(fellBack, 0) << "no fast score was failed";
  }
}

}  // namespace
