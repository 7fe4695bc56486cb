// What the estimators answer, through the exports: one table of records and
// exports with the expected coefficients, poles, modes, spectra, fit errors
// and orders, from independent oracles (defining recursions and mode sums,
// least squares solved apart in long double, the AR polynomial evaluated term
// by term on the grid). Real and complex data, noise-free, rank-deficient and
// noisy records, and the 64-sample complex test record.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <complex>
#include <filesystem>
#include <fstream>
#include <limits>
#include <sstream>
#include <string>
#include <vector>

#include "support/ar_oracles.h"
#include "support/damped_modes.h"
#include "support/export_table.h"
#include "support/qdm_host.h"

// Cases name only the fields they check.
#pragma GCC diagnostic ignored "-Wmissing-field-initializers"

namespace {

using namespace qdmtest;
using ar_oracle::C;
using damped_modes::Mode;
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kPi = 3.14159265358979323846;

struct Case {
  std::string name;
  const char* exportName;
  std::vector<C> x;  // a real export takes the real parts
  Scalars s;
  uint8_t flag = 0;
  int32_t status = 0;
  std::vector<C> coef;           // AR coefficients a[0..p]
  std::vector<C> poles;          // each found among the roots (all of them when p given)
  std::vector<Mode> modes;       // exactly these modes (damping NaN: not reported)
  bool ordered = false;          // modes in this order, else matched by frequency and damping
  double tol = 1e-8;             // coefficients, poles, modes
  double extra = kNaN;           // noise variance, mse or amplitude-fit error
  double extraTol = 1e-20;
  std::vector<C> spectrumOf;     // the AR vector whose spectrum is expected
  int32_t count = -1;            // modes reported
  int32_t orderLo = -1, orderHi = -1;  // MDL order range
};

const Export& Find(const char* name) {
  for (const Export& x : Exports())
    if (std::string(x.name) == name) return x;
  throw std::runtime_error(name);
}

std::vector<C> Complexify(const std::vector<double>& v) { return {v.begin(), v.end()}; }

std::vector<C> Marple() {
  std::ifstream in(std::filesystem::path(__FILE__).parent_path().parent_path() / "data" /
                   "marple64.csv");
  std::vector<C> x;
  std::string line;
  while (std::getline(in, line)) {
    std::istringstream row(line);
    double re = 0, im = 0;
    char comma = 0;
    if (row >> re >> comma >> im) x.emplace_back(re, im);
  }
  return x;
}

// a[0] = 1, a[k] = -w[k-1].
std::vector<C> FromPredictor(const std::vector<C>& w) {
  std::vector<C> a{C(1)};
  for (const C& v : w) a.push_back(-v);
  return a;
}

double MeanSquaredResidual(const std::vector<C>& x, const std::vector<C>& a) {
  const int p = int(a.size()) - 1, n = int(x.size());
  double sum = 0;
  for (int t = p; t < n; ++t) {
    C e = 0;
    for (int k = 0; k <= p; ++k) e += a[k] * x[t - k];
    sum += std::norm(e);
  }
  return sum / (n - p);
}

// Forward rows over conjugated backward rows, solved apart.
std::vector<C> ForwardBackwardSolve(const std::vector<C>& x, int p) {
  const int n = int(x.size()), q = n - p;
  std::vector<C> A, b;
  ar_oracle::ForwardSystem(x, p, &A, &b);
  for (int i = 0; i < q; ++i) {
    for (int j = 0; j < p; ++j) A.push_back(std::conj(x[i + 1 + j]));
    b.push_back(std::conj(x[i]));
  }
  return ar_oracle::TallSolve(A, 2 * q, p, b);
}

std::vector<C> Poles(const std::vector<Mode>& modes, double fs, bool pairs) {
  std::vector<C> z;
  for (const Mode& m : modes) {
    z.push_back(damped_modes::Pole(m, fs));
    if (pairs) z.push_back(std::conj(z.back()));
  }
  return z;
}

// A cosine of amplitude a is the two exponentials a/2 e^{+-i phase} at +-f.
std::vector<Mode> Halves(const std::vector<Mode>& cosines, bool both) {
  std::vector<Mode> out;
  for (const Mode& m : cosines) {
    out.push_back({m.amp / 2, m.phase, m.damp, m.freq});
    if (both) out.push_back({m.amp / 2, -m.phase, m.damp, -m.freq});
  }
  return out;
}

std::vector<Case> Cases() {
  std::vector<Case> cases;
  auto add = [&](Case k) { cases.push_back(std::move(k)); };
  const std::vector<C> marple = Marple();
  std::vector<C> marpleRe;
  for (const C& v : marple) marpleRe.emplace_back(v.real(), 0.0);

  // ---- covariance AR --------------------------------------------------------------------
  const std::vector<C> realPoles = {std::polar(0.97, 0.6), std::polar(0.97, -0.6), C(0.8)};
  const std::vector<C> aReal = ar_oracle::MonicFromRoots(realPoles);
  const std::vector<C> realAr = ar_oracle::ArRecord<C>(aReal, {1.0, -0.5, 0.25}, 40);
  const std::vector<C> cxPoles = {std::polar(0.95, 0.3), std::polar(0.7, -1.2),
                                  std::polar(0.99, 2.5), C(-0.6, 0.1)};
  const std::vector<C> aCx = ar_oracle::MonicFromRoots(cxPoles);
  const std::vector<C> cxAr =
      ar_oracle::ArRecord<C>(aCx, {{1, 0.5}, {-0.5, 1}, {0.25, -2}, {2, 0}}, 33);
  add({.name = "exact AR(3)", .exportName = "QdmReCovarianceH", .x = realAr, .s = {40, 3},
       .coef = aReal, .poles = realPoles, .extra = 0});
  add({.name = "exact AR(3)", .exportName = "QdmCxCovarianceH", .x = realAr, .s = {40, 3},
       .coef = aReal, .poles = realPoles, .extra = 0});
  add({.name = "exact complex AR(4)", .exportName = "QdmCxCovarianceH", .x = cxAr,
       .s = {33, 4}, .coef = aCx, .poles = cxPoles, .extra = 0});
  add({.name = "constant", .exportName = "QdmReCovarianceH", .x = std::vector<C>(9, C(-2)),
       .s = {9, 1}, .coef = {1, -1}, .poles = {1}, .tol = 1e-14, .extra = 0, .extraTol = 1e-28});
  for (const char* e : {"QdmReCovarianceH", "QdmCxCovarianceH"}) {
    add({.name = "zeros (rank 0)", .exportName = e, .x = std::vector<C>(15), .s = {15, 4},
         .coef = {1, 0, 0, 0, 0}, .poles = std::vector<C>(4), .tol = 0, .extra = 0, .extraTol = 0});
  }
  {  // fewer equations than unknowns: the minimum-norm predictor
    std::vector<C> x(64), A, b;
    for (int t = 0; t < 64; ++t) x[t] = C(std::sin(1.3 * t * t + 0.2), std::cos(0.7 * t * t + 1));
    ar_oracle::ForwardSystem(x, 42, &A, &b);
    const std::vector<C> a = FromPredictor(ar_oracle::MinNormSolve(A, 22, 42, b));
    add({.name = "wide system", .exportName = "QdmCxCovarianceH", .x = x, .s = {64, 42},
         .coef = a, .extra = MeanSquaredResidual(x, a), .extraTol = 1e-8});
  }
  for (int p : {2, 8, 15}) {  // the test record against an independent least-squares solve
    for (const bool real : {true, false}) {
      const std::vector<C>& x = real ? marpleRe : marple;
      std::vector<C> A, b;
      ar_oracle::ForwardSystem(x, p, &A, &b);
      const std::vector<C> a = FromPredictor(ar_oracle::TallSolve(A, 64 - p, p, b));
      const double mse = MeanSquaredResidual(x, a);
      add({.name = "test record p=" + std::to_string(p),
           .exportName = real ? "QdmReCovarianceH" : "QdmCxCovarianceH", .x = x, .s = {64, p},
           .coef = a, .tol = 1e-9, .extra = mse, .extraTol = 1e-9 * mse});
    }
  }

  // ---- principal-component AR --------------------------------------------------------------
  const double kFs = 1000.0;
  const std::vector<Mode> cxUndamped = {{1.0, 0.4, 0.0, 60.0}, {0.7, -2.0, 0.0, -185.0}};
  const std::vector<Mode> cosUndamped = {{1.0, 0.2, 0.0, 75.0}, {0.5, -0.9, 0.0, 260.0}};
  // Noise-free, p = 9 above the rank: the signal poles are among the roots.
  add({.name = "rank 2 of 9", .exportName = "QdmCxPCARH",
       .x = damped_modes::ComplexSignal(cxUndamped, 50, kFs), .s = {50, 9, 2},
       .poles = Poles(cxUndamped, kFs, false)});
  add({.name = "rank 4 of 9", .exportName = "QdmRePCARH",
       .x = Complexify(damped_modes::RealSignal(cosUndamped, 50, kFs)), .s = {50, 9, 4},
       .poles = Poles(cosUndamped, kFs, true)});
  for (const bool real : {true, false}) {  // every component kept: forward-backward least squares
    const std::vector<C>& x = real ? marpleRe : marple;
    add({.name = "test record k = p", .exportName = real ? "QdmRePCARH" : "QdmCxPCARH", .x = x,
         .s = {64, 6, 6}, .coef = FromPredictor(ForwardBackwardSolve(x, 6)), .tol = 1e-9});
  }

  // ---- Prony -----------------------------------------------------------------------------
  const std::vector<Mode> cx3 = {{1.0, 0.3, -0.01, 20.0}, {0.5, -2.0, -0.05, -55.0},
                                 {2.0, 1.2, 0.0, 87.5}};
  add({.name = "3 damped modes", .exportName = "QdmCxPronyH",
       .x = damped_modes::ComplexSignal(cx3, 24, 250.0), .s = {24, 3, 0, 0, 250.0}, .modes = cx3});
  const std::vector<Mode> tone = {{0.6, -0.9, 0.0, 1000.0}};
  const std::vector<C> toneX = Complexify(damped_modes::RealSignal(tone, 48, 48000.0));
  add({.name = "cosine, real flag", .exportName = "QdmRePronyH", .x = toneX,
       .s = {48, 2, 0, 0, 48000.0}, .flag = 1, .modes = Halves(tone, false)});
  for (const char* e : {"QdmRePronyH", "QdmCxPronyH"}) {
    add({.name = "cosine, both members", .exportName = e, .x = toneX,
         .s = {48, 2, 0, 0, 48000.0}, .modes = Halves(tone, true)});
  }
  {  // a pole on the negative axis (angle pi) is no member of a pair: dropped with the flag
    std::vector<C> x = Complexify(damped_modes::RealSignal({{1.2, 0.5, -0.02, 80.0}}, 30, kFs));
    for (int t = 0; t < 30; ++t) x[t] += 0.3 * std::pow(-0.7, t);
    add({.name = "cosine and negative pole", .exportName = "QdmRePronyH", .x = x,
         .s = {30, 3, 0, 0, kFs}, .flag = 1, .modes = {{0.6, 0.5, -0.02, 80.0}}});
  }

  // ---- matrix pencil (q >= 2L factors a reduced R, q < L takes the wide path) ---------------
  const std::vector<Mode> cxPencil = {{1.0, 0.5, -0.01, 50.0}, {0.6, -2.2, -0.04, -130.0},
                                      {0.3, 1.3, 0.0, 275.0}};
  for (int L : {12, 28}) {
    add({.name = "3 damped modes L=" + std::to_string(L), .exportName = "QdmCxMatrixPencilH",
         .x = damped_modes::ComplexSignal(cxPencil, 45, kFs), .s = {45, L, 3, 0, kFs},
         .modes = cxPencil, .extra = 0});
  }
  const std::vector<Mode> cosines = {{2.0, 0.7, -0.02, 80.0}, {1.0, -1.0, -0.005, 310.0}};
  const std::vector<C> cosX = Complexify(damped_modes::RealSignal(cosines, 40, kFs));
  for (int L : {10, 25}) {
    for (const char* e : {"QdmReMatrixPencilH", "QdmCxMatrixPencilH"}) {
      add({.name = "damped cosines L=" + std::to_string(L), .exportName = e, .x = cosX,
           .s = {40, L, 4, 0, kFs}, .modes = Halves(cosines, true), .extra = 0});
    }
    add({.name = "damped cosines, real flag, L=" + std::to_string(L),
         .exportName = "QdmReMatrixPencilH", .x = cosX, .s = {40, L, 4, 0, kFs}, .flag = 1,
         .modes = Halves(cosines, false), .extra = 0});
  }
  const std::vector<C> noise30 = Complexify(damped_modes::Noise(30, 1.0, 3));
  for (const char* e : {"QdmReMatrixPencilH", "QdmCxMatrixPencilH"}) {  // M above r = 10
    add({.name = "noise, M > r", .exportName = e, .x = noise30, .s = {30, 20, 14, 0, kFs},
         .count = 10});
  }

  // ---- MDL -------------------------------------------------------------------------------
  const std::vector<Mode> mdl3 = {{1.0, 0.5, -0.01, 50.0}, {0.6, -2.2, -0.03, -130.0},
                                  {0.4, 1.3, 0.0, 275.0}};
  const std::vector<Mode> mdlCos = {{1.0, 0.3, -0.01, 70.0}, {0.7, 1.9, -0.02, 240.0}};
  std::vector<C> xc = damped_modes::ComplexSignal(mdl3, 64, kFs);
  std::vector<C> xr = Complexify(damped_modes::RealSignal(mdlCos, 64, kFs));
  add({.name = "3 modes", .exportName = "QdmCxMinDescriptLenH", .x = xc, .s = {64, 20, 1},
       .orderLo = 3, .orderHi = 3});
  add({.name = "2 cosines", .exportName = "QdmReMinDescriptLenH", .x = xr, .s = {64, 20, 1},
       .orderLo = 4, .orderHi = 4});
  const std::vector<double> nr = damped_modes::Noise(64, 1e-3, 51), ni = damped_modes::Noise(64, 1e-3, 52);
  for (int t = 0; t < 64; ++t) {
    xc[t] += C(nr[t], ni[t]);
    xr[t] += nr[t];
  }
  add({.name = "3 modes, noisy", .exportName = "QdmCxMinDescriptLenH", .x = xc, .s = {64, 16, 1},
       .orderLo = 3, .orderHi = 3});
  add({.name = "2 cosines, noisy", .exportName = "QdmReMinDescriptLenH", .x = xr,
       .s = {64, 16, 2}, .orderLo = 4, .orderHi = 4});
  for (const char* e : {"QdmReMinDescriptLenH", "QdmCxMinDescriptLenH"}) {
    // minOrder above r = n - L: nothing scored, the result is left as it was.
    add({.name = "no candidate", .exportName = e, .x = noise30, .s = {30, 20, 12},
         .orderLo = kStaleOrder, .orderHi = kStaleOrder});
  }
  {  // n = 7: L = 4 tries order 3; L = 3 = floor(n/2) runs as L' = 2 and never does
    std::vector<C> x(7);
    for (int t = 0; t < 7; ++t) x[t] = std::pow(0.9, t) + 0.5 * std::pow(0.6, t) + 0.8 * std::pow(-0.7, t);
    add({.name = "n=7 L=4", .exportName = "QdmReMinDescriptLenH", .x = x, .s = {7, 4, 1},
         .orderLo = 3, .orderHi = 3});
    add({.name = "n=7 L=4", .exportName = "QdmCxMinDescriptLenH", .x = x, .s = {7, 4, 2},
         .orderLo = 3, .orderHi = 3});
    for (const char* e : {"QdmReMinDescriptLenH", "QdmCxMinDescriptLenH"}) {
      add({.name = "n=7 L=3", .exportName = e, .x = x, .s = {7, 3, 1}, .orderLo = 1, .orderHi = 2});
    }
  }

  // ---- covariance spectra: the spectrum of the exact model, N the power of two >= m ---------
  const std::vector<C> a1 = {1, -0.9};
  const std::vector<C> a2 = ar_oracle::MonicFromRoots({std::polar(0.95, 0.4 * kPi), std::polar(0.95, -0.4 * kPi)});
  const std::vector<C> a4 = ar_oracle::MonicFromRoots(
      {std::polar(0.97, 0.6), std::polar(0.9, -2.1), std::polar(0.8, 2.8), C(-0.3, 0.2)});
  const std::vector<C> x1 = ar_oracle::ArRecord<C>(a1, {1.0}, 60);
  const std::vector<C> x2 = ar_oracle::ArRecord<C>(a2, {1.0, 1.37}, 60);
  const std::vector<C> x4 = ar_oracle::ArRecord<C>(a4, {{1, 0.5}, {1.37, 0.29}, {1.74, -0.34}, {2.1, -1.4}}, 60);
  for (const char* e : {"QdmReCovPowerSpectrH", "QdmCxCovPowerSpectrH"}) {
    add({.name = "AR(1)", .exportName = e, .x = x1, .s = {60, 1, 200, 0, kFs}, .extra = 0,
         .spectrumOf = a1});
    add({.name = "AR(2) resonance", .exportName = e, .x = x2, .s = {60, 2, 200, 0, kFs},
         .extra = 0, .spectrumOf = a2});
    add({.name = "AR(2), m = 3", .exportName = e, .x = x2, .s = {60, 2, 3, 0, kFs}, .extra = 0,
         .spectrumOf = a2});
    add({.name = "NaN rate", .exportName = e, .x = x2, .s = {60, 2, 64, 0, kNaN}, .extra = 0,
         .spectrumOf = a2});
    add({.name = "order 0 refused by the estimator", .exportName = e, .x = x2,
         .s = {60, 0, 64, 0, kFs}, .status = HostCode(12)});
  }
  add({.name = "complex AR(4)", .exportName = "QdmCxCovPowerSpectrH", .x = x4,
       .s = {60, 4, 200, 0, kFs}, .extra = 0, .spectrumOf = a4});
  // p + 1 = 4 coefficients on a grid of 2: they wrap by assignment (a[2], a[3] win).
  add({.name = "AR(3) on 2 points", .exportName = "QdmReCovPowerSpectrH", .x = realAr,
       .s = {40, 3, 2, 0, kFs}, .extra = 0, .spectrumOf = aReal});

  // ---- PCAR spectra: modes nearest the unit circle, nearest first ------------------------
  // With k = p the coefficients are exact, but the last pick repeats the first
  // root (chosen roots are masked with the largest distance): spectrum only.
  // With p above the rank the signal roots are exact and the nearest ones.
  const std::vector<Mode> cx3u = {{1.0, 0.4, 0.0, 7.3}, {0.6, -1.2, 0.0, -21.9},
                                  {0.3, 2.5, 0.0, 33.4}};
  const std::vector<C> cx3uX = damped_modes::ComplexSignal(cx3u, 64, 100.0);
  add({.name = "3 exponentials, k = p", .exportName = "QdmCxPCARPowerSpectrumH", .x = cx3uX,
       .s = {64, 3, 256, 3, 100.0},
       .spectrumOf = ar_oracle::MonicFromRoots(Poles(cx3u, 100.0, false)), .count = 3});
  add({.name = "3 exponentials, p = 10", .exportName = "QdmCxPCARPowerSpectrumH", .x = cx3uX,
       .s = {64, 10, 256, 3, 100.0}, .modes = cx3u, .extra = 0});
  {  // a pole and its reflection 1/conj(z): distances 0, 0.1 and 1/9
    const double d = std::log(0.9);
    const std::vector<Mode> m = {{0.5, -1.0, -d, 10.0}, {0.7, 0.2, 0.0, 31.0}, {1.0, 0.4, d, 10.0}};
    std::vector<Mode> nearestFirst = {m[1], m[2], m[0]};
    for (Mode& v : nearestFirst) v.damp = kNaN;
    add({.name = "distance order", .exportName = "QdmCxPCARPowerSpectrumH",
         .x = damped_modes::ComplexSignal(m, 40, 100.0), .s = {40, 6, 128, 3, 100.0},
         .modes = nearestFirst, .ordered = true, .extra = 0});
  }
  const std::vector<Mode> cos2 = {{1.5, 0.3, 0.0, 120.0}, {0.8, -1.0, 0.0, 310.0}};
  const std::vector<C> cos2X = Complexify(damped_modes::RealSignal(cos2, 80, kFs));
  const std::vector<C> aCos2 = ar_oracle::MonicFromRoots(Poles(cos2, kFs, true));
  for (const uint8_t flag : {0, 1}) {
    add({.name = "2 cosines", .exportName = "QdmRePCARPowerSpectrumH", .x = cos2X,
         .s = {80, 8, 512, 4, kFs}, .flag = flag, .modes = Halves(cos2, flag == 0), .extra = 0});
  }
  add({.name = "2 cosines, k = p", .exportName = "QdmRePCARPowerSpectrumH", .x = cos2X,
       .s = {80, 4, 512, 4, kFs}, .spectrumOf = aCos2});
  add({.name = "2 cosines, NaN rate", .exportName = "QdmRePCARPowerSpectrumH", .x = cos2X,
       .s = {80, 4, 64, 4, kNaN}, .spectrumOf = aCos2, .count = 4});
  for (Case& k : cases) {
    for (Mode& m : k.modes)
      if (k.exportName == std::string("QdmCxPCARPowerSpectrumH") ||
          k.exportName == std::string("QdmRePCARPowerSpectrumH"))
        m.damp = kNaN;
  }
  return cases;
}

// The spectrum in dB of a on the L-point grid; coefficients beyond L replace
// earlier ones in their slot.
std::vector<double> ExpectedSpectrum(const std::vector<C>& a, int32_t L) {
  std::vector<C> onGrid(std::min<size_t>(a.size(), size_t(L)));
  for (size_t i = 0; i < a.size(); ++i) onGrid[i % size_t(L)] = a[i];
  return ar_oracle::SpectrumDb(onGrid, L);
}

void ExpectNear(double got, double want, double tol, const std::string& what) {
  EXPECT_NEAR(got, want, tol * std::max(1.0, std::abs(want))) << what;
}

TEST(Estimators, AnswersAgreeWithTheirOracles) {
  for (const Case& k : Cases()) {
    const Export& x = Find(k.exportName);
    const std::string where = std::string(k.exportName) + ": " + k.name;
    SCOPED_TRACE(where);
    std::vector<double> re;
    for (const C& v : k.x) re.push_back(v.real());
    Call c{x.complexData ? HostArray::Complex(k.x) : HostArray::Real(re)};
    c.flag = k.flag;
    const int32_t st = x.invoke(Qdm(), c, k.s);
    ASSERT_EQ(st, k.status);
    if (st != 0) {
      ExpectEmptied(x, c, where, true);
      continue;
    }
    const Scalars& s = k.s;
    std::vector<C> coef, roots;
    std::vector<Mode> modes;
    std::vector<double> db;
    double extra = kNaN;
    switch (x.family) {
      case Family::kCovariance:
      case Family::kPcar: {
        roots = c.out[0].Complexes();
        if (x.complexData) {
          coef = c.out[1].Complexes();
        } else {
          for (double v : c.out[1].Reals()) coef.emplace_back(v);
        }
        if (x.family == Family::kCovariance) extra = c.d[0];
        ASSERT_EQ(coef.size(), size_t(s.a) + 1);
        ASSERT_EQ(roots.size(), size_t(s.a));
        EXPECT_EQ(coef[0], C(1));
        for (const C& z : roots) {  // every root is a zero of the returned polynomial
          C v = 0;
          double scale = 0;
          for (const C& a : coef) {
            v = v * z + a;
            scale = scale * std::abs(z) + std::abs(a);
          }
          EXPECT_LE(std::abs(v), 1e-9 * scale) << z;
        }
        break;
      }
      case Family::kProny:
      case Family::kPencil:
      case Family::kPcarSpectrum: {
        const bool spectrum = x.family == Family::kPcarSpectrum;
        const int32_t n = c.out[0].Count();
        for (int i = 1; i < (spectrum ? 3 : 4); ++i) EXPECT_EQ(c.out[i].Count(), n);
        const std::vector<double> amp = c.out[0].Reals(), ph = c.out[1].Reals();
        const std::vector<double> damp = spectrum ? std::vector<double>(n, kNaN) : c.out[2].Reals();
        const std::vector<double> f = c.out[spectrum ? 2 : 3].Reals();
        for (int32_t i = 0; i < n; ++i) modes.push_back({amp[i], ph[i], damp[i], f[i]});
        if (x.family == Family::kPencil) extra = c.d[0];
        if (spectrum) {
          extra = c.d[2];
          db = c.out[3].Reals();
        }
        if (std::isnan(s.fs)) {
          for (const Mode& m : modes) EXPECT_TRUE(std::isnan(m.freq));
        }
        break;
      }
      case Family::kCovSpectrum:
        db = c.out[0].Reals();
        extra = c.d[2];
        break;
      case Family::kMdl:
        EXPECT_GE(c.order, k.orderLo);
        EXPECT_LE(c.order, k.orderHi);
        break;
    }
    if (!k.coef.empty()) {
      EXPECT_LE(ar_oracle::RelativeError(coef, k.coef), k.tol);
    }
    if (!k.poles.empty()) {
      for (const C& z : k.poles) {
        double best = INFINITY;
        for (const C& r : roots) best = std::min(best, std::abs(r - z));
        EXPECT_LE(best, k.tol) << z;
      }
      if (k.poles.size() == roots.size()) {
        EXPECT_LE(ar_oracle::MatchDistance(k.poles, roots), k.tol);
      }
    }
    if (k.count >= 0) {
      EXPECT_EQ(int32_t(modes.size()), k.count);
    }
    if (!k.modes.empty()) {
      ASSERT_EQ(modes.size(), k.modes.size());
      std::vector<bool> used(modes.size(), false);
      for (size_t i = 0; i < k.modes.size(); ++i) {
        const Mode& w = k.modes[i];
        size_t j = i;
        if (!k.ordered) {  // nearest unused mode in frequency and damping
          double best = INFINITY;
          for (size_t g = 0; g < modes.size(); ++g) {
            const double dd = std::isnan(w.damp) ? 0.0 : modes[g].damp - w.damp;
            const double dist = std::hypot(modes[g].freq - w.freq, dd);
            if (!used[g] && dist < best) best = dist, j = g;
          }
        }
        used[j] = true;
        const Mode& g = modes[j];
        const std::string m = "mode " + std::to_string(i);
        ExpectNear(g.amp, w.amp, k.tol, m + " amplitude");
        EXPECT_NEAR(damped_modes::PhaseDiff(g.phase, w.phase), 0.0, k.tol) << m;
        if (!std::isnan(w.damp)) ExpectNear(g.damp, w.damp, k.tol, m + " damping");
        ExpectNear(g.freq, w.freq, k.tol, m + " frequency");
      }
    }
    if (x.family == Family::kPencil && k.flag == 0) {
      // The mse is the mean squared misfit of the reported modes to the record.
      double sum = 0;
      for (int t = 0; t < s.n; ++t) {
        C model = 0;
        for (const Mode& m : modes)
          model += std::polar(m.amp, m.phase) * std::exp(C(m.damp, 2 * kPi * m.freq / s.fs) * double(t));
        sum += std::norm((x.complexData ? k.x[t] : C(re[t])) - model);
      }
      EXPECT_NEAR(extra, sum / s.n, 1e-8 * sum / s.n + 1e-20);
    }
    if (!std::isnan(k.extra)) {
      EXPECT_NEAR(extra, k.extra, k.extraTol);
    }
    if (x.family == Family::kCovSpectrum || x.family == Family::kPcarSpectrum) {
      const int32_t N = SpectrumN(s.b);
      ASSERT_EQ(int32_t(db.size()), N);
      if (std::isnan(s.fs)) {
        EXPECT_TRUE(std::isnan(c.d[0]) && std::isnan(c.d[1]));
      } else {
        EXPECT_EQ(c.d[0], -s.fs / 2);
        EXPECT_EQ(c.d[1], s.fs / N);
      }
      EXPECT_NEAR(*std::max_element(db.begin(), db.end()), 0.0, 1e-12);
      if (!x.complexData) {  // real data: symmetric about DC at N/2, index 0 the Nyquist bin
        for (int j = 1; j < N / 2; ++j) EXPECT_NEAR(db[N / 2 - j], db[N / 2 + j], 1e-9) << j;
      }
      if (!k.spectrumOf.empty()) {
        const std::vector<double> want = ExpectedSpectrum(k.spectrumOf, N);
        for (int j = 0; j < N; ++j) EXPECT_NEAR(db[j], want[j], 1e-6) << "bin " << j;
      }
    }
  }
}

}  // namespace
