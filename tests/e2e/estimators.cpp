// The estimators' answers through the exports against independent oracles: real and
// complex, noise-free, rank-deficient and noisy records and the 64-sample test record.
#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <random>

#include "support/ar_oracles.h"
#include "support/export_table.h"
#include "support/qdm_host.h"

// Cases name only the fields they check.
#pragma GCC diagnostic ignored "-Wmissing-field-initializers"

namespace {

using namespace qdmtest;
using namespace ar_oracle;
constexpr double kNaN = NAN, kPi = 3.14159265358979323846;

struct Case {
  std::string name;
  Family family;
  bool cx;  // complex export, else a real one on the real parts of x
  std::vector<C> x;
  Scalars s;
  uint8_t flag = 0;
  int32_t status = 0;
  std::vector<C> coef;      // AR coefficients a[0..p]
  std::vector<C> poles;     // each found among the roots
  std::vector<Mode> modes;  // exactly these modes
  bool ordered = false;     // modes in this order, else matched by frequency and damping
  double tol = 1e-8;        // coefficients, poles, modes
  double extra = kNaN, extraTol = 1e-20;           // noise variance, mse or amplitude-fit error
  std::vector<C> spectrumOf;                       // the AR vector whose spectrum is expected
  int32_t count = -1, orderLo = -1, orderHi = -1;  // modes reported, MDL order range
};

std::vector<C> FromPredictor(std::vector<C> w) {
  for (C& v : w) v = -v;
  return w.insert(w.begin(), C(1)), w;
}

double MeanSquaredResidual(const std::vector<C>& x, const std::vector<C>& a) {
  double sum = 0;
  for (size_t t = a.size() - 1; t < x.size(); ++t) {
    C e = 0;
    for (size_t k = 0; k < a.size(); ++k) e += a[k] * x[t - k];
    sum += std::norm(e);
  }
  return sum / double(x.size() + 1 - a.size());
}

std::vector<C> Poles(const std::vector<Mode>& modes, double fs, bool pairs) {
  std::vector<C> z;
  for (const Mode& m : modes) {
    z.push_back(Pole(m, fs));
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
  using V = std::vector<C>;
  using Modes = std::vector<Mode>;
  std::vector<Case> cases;
  auto add = [&](std::string name, Family f, bool cx, V x, Scalars s, Case k = {}) {
    k.name = std::move(name), k.family = f, k.cx = cx, k.x = std::move(x), k.s = s;
    cases.push_back(std::move(k));
  };
  constexpr Family kCov = Family::kCovariance, kPcar = Family::kPcar, kProny = Family::kProny,
                   kPencil = Family::kPencil, kMdl = Family::kMdl, kCovPsd = Family::kCovSpectrum,
                   kPcarPsd = Family::kPcarSpectrum;
  V marple, marpleRe, A, b;
  std::ifstream in(std::filesystem::path(__FILE__).parent_path() / "../data/marple64.csv");
  double re, im;  // "re,im" rows
  for (char comma; in >> re >> comma >> im;) marple.emplace_back(re, im), marpleRe.emplace_back(re);
  const double kFs = 1000.0;

  const V realPoles = {std::polar(0.97, 0.6), std::polar(0.97, -0.6), C(0.8)};
  const V cxPoles = {std::polar(.95, .3), std::polar(.7, -1.2), std::polar(.99, 2.5), {-.6, .1}};
  const V aReal = MonicFromRoots(realPoles), aCx = MonicFromRoots(cxPoles);
  const V realAr = ArRecord(aReal, {1.0, -0.5, 0.25}, 40);
  add("exact AR(3)", kCov, false, realAr, {40, 3}, {.coef = aReal, .poles = realPoles, .extra = 0});
  add("exact complex AR(4)", kCov, true, ArRecord(aCx, {{1, 0.5}, {-0.5, 1}, {0.25, -2}, {2}}, 33),
      {33, 4}, {.coef = aCx, .poles = cxPoles, .extra = 0});
  add("constant", kCov, false, V(9, C(-2)), {9, 1},
      {.coef = {1, -1}, .poles = {1}, .tol = 1e-14, .extra = 0, .extraTol = 1e-28});
  for (const bool cx : {false, true}) {
    add("zeros (rank 0)", kCov, cx, V(15), {15, 4},
        {.coef = {1, 0, 0, 0, 0}, .poles = V(4), .tol = 0, .extra = 0, .extraTol = 0});
  }
  V wide(64);  // fewer equations than unknowns: the minimum-norm predictor
  for (int t = 0; t < 64; ++t) wide[t] = C(std::sin(1.3 * t * t + 0.2), std::cos(0.7 * t * t + 1));
  ForwardSystem(wide, 42, &A, &b);
  const V aWide = FromPredictor(LeastSquares(A, 22, 42, b));
  add("wide system", kCov, true, wide, {64, 42},
      {.coef = aWide, .extra = MeanSquaredResidual(wide, aWide), .extraTol = 1e-8});
  for (int p : {2, 8, 15}) {  // the test record against an independent least-squares solve
    for (const bool real : {true, false}) {
      const V& x = real ? marpleRe : marple;
      ForwardSystem(x, p, &A, &b);
      const V a = FromPredictor(LeastSquares(A, 64 - p, p, b));
      const double mse = MeanSquaredResidual(x, a);
      add("test record p=" + std::to_string(p), kCov, !real, x, {64, p},
          {.coef = a, .tol = 1e-9, .extra = mse, .extraTol = 1e-9 * mse});
    }
  }

  // Noise-free, p = 9 above the rank: the signal poles are among the roots.
  const Modes cxUndamped = {{1.0, 0.4, 0.0, 60.0}, {0.7, -2.0, 0.0, -185.0}};
  const Modes cosUndamped = {{1.0, 0.2, 0.0, 75.0}, {0.5, -0.9, 0.0, 260.0}};
  add("rank 2 of 9", kPcar, true, Signal(cxUndamped, 50, kFs), {50, 9, 2},
      {.poles = Poles(cxUndamped, kFs, false)});
  add("rank 4 of 9", kPcar, false, Signal(cosUndamped, 50, kFs, true), {50, 9, 4},
      {.poles = Poles(cosUndamped, kFs, true)});
  for (const bool real : {true, false}) {  // all components: forward over conjugated backward rows
    const V& x = real ? marpleRe : marple;
    ForwardSystem(x, 6, &A, &b);
    for (int i = 0; i < 58; ++i) {
      for (int j = 0; j < 6; ++j) A.push_back(std::conj(x[i + 1 + j]));
      b.push_back(std::conj(x[i]));
    }
    add("test record k = p", kPcar, !real, x, {64, 6, 6},
        {.coef = FromPredictor(LeastSquares(A, 116, 6, b)), .tol = 1e-9});
  }

  const Modes cx3 = {{1.0, 0.3, -0.01, 20.0}, {0.5, -2.0, -0.05, -55.0}, {2.0, 1.2, 0.0, 87.5}};
  const Modes tone = {{0.6, -0.9, 0.0, 1000.0}};
  const V toneX = Signal(tone, 48, 48000.0, true);
  add("3 damped modes", kProny, true, Signal(cx3, 24, 250.0), {24, 3, 0, 0, 250}, {.modes = cx3});
  add("cosine, real flag", kProny, false, toneX, {48, 2, 0, 0, 48000.0},
      {.flag = 1, .modes = Halves(tone, false)});
  for (const bool cx : {false, true}) {
    add("cosine, both members", kProny, cx, toneX, {48, 2, 0, 0, 48e3},
        {.modes = Halves(tone, true)});
  }
  // A pole on the negative axis (angle pi) is no member of a pair: dropped with the flag.
  V negX = Signal({{1.2, 0.5, -0.02, 80.0}}, 30, kFs, true);
  for (int t = 0; t < 30; ++t) negX[t] += 0.3 * std::pow(-0.7, t);
  add("cosine and negative pole", kProny, false, negX, {30, 3, 0, 0, kFs},
      {.flag = 1, .modes = {{0.6, 0.5, -0.02, 80.0}}});

  // ---- matrix pencil (q >= 2L factors a reduced R, q < L takes the wide path) ---------------
  const Modes cx3p = {{1.0, 0.5, -0.01, 50.0}, {0.6, -2.2, -0.04, -130.0}, {0.3, 1.3, 0.0, 275.0}};
  const Modes cosines = {{2.0, 0.7, -0.02, 80.0}, {1.0, -1.0, -0.005, 310.0}};
  const V cosX = Signal(cosines, 40, kFs, true);
  for (int L : {10, 25}) {
    const std::string at = " L=" + std::to_string(L);
    add("3 damped modes" + at, kPencil, true, Signal(cx3p, 45, kFs), {45, L + 2, 3, 0, kFs},
        {.modes = cx3p, .extra = 0});
    for (const bool cx : {false, true}) {
      add("damped cosines" + at, kPencil, cx, cosX, {40, L, 4, 0, kFs},
          {.modes = Halves(cosines, true), .extra = 0});
    }
    add("damped cosines, real flag" + at, kPencil, false, cosX, {40, L, 4, 0, kFs},
        {.flag = 1, .modes = Halves(cosines, false), .extra = 0});
  }
  std::mt19937 gen(51);
  std::vector<double> noise(128);  // uniform in [-1e-3, 1e-3]
  for (double& v : noise) v = 1e-3 * (double(gen()) / 2147483648.0 - 1);
  const V noise30(noise.begin(), noise.begin() + 30);
  for (const bool cx : {false, true}) {  // M above r = 10
    add("noise, M > r", kPencil, cx, noise30, {30, 20, 14, 0, kFs}, {.count = 10});
  }

  V xc =
      Signal({{1.0, 0.5, -0.01, 50.0}, {0.6, -2.2, -0.03, -130.0}, {0.4, 1.3, 0, 275.0}}, 64, kFs);
  V xr = Signal({{1.0, 0.3, -0.01, 70.0}, {0.7, 1.9, -0.02, 240.0}}, 64, kFs, true);
  for (int t = 0; t < 64; ++t) xc[t] += C(noise[t], noise[64 + t]), xr[t] += noise[t];
  add("3 modes, noisy", kMdl, true, xc, {64, 16, 1}, {.orderLo = 3, .orderHi = 3});
  add("2 cosines, noisy", kMdl, false, xr, {64, 16, 2}, {.orderLo = 4, .orderHi = 4});
  V x7(7);  // n = 7: L = 4 tries order 3; L = 3 = floor(n/2) runs as L' = 2 and never does
  for (int t = 0; t < 7; ++t) x7[t] = pow(.9, t) + .5 * pow(.6, t) + .8 * pow(-.7, t);
  add("n=7 L=4", kMdl, false, x7, {7, 4, 1}, {.orderLo = 3, .orderHi = 3});
  add("n=7 L=4", kMdl, true, x7, {7, 4, 2}, {.orderLo = 3, .orderHi = 3});
  for (const bool cx : {false, true}) {
    add("n=7 L=3", kMdl, cx, x7, {7, 3, 1}, {.orderLo = 1, .orderHi = 2});
    // minOrder above r = n - L: nothing scored, the result is left as it was.
    add("no candidate", kMdl, cx, noise30, {30, 20, 12},
        {.orderLo = kStaleOrder, .orderHi = kStaleOrder});
  }

  // ---- covariance spectra: the spectrum of the exact model, N the power of two >= m ---------
  const V a2 = MonicFromRoots({std::polar(0.95, 0.4 * kPi), std::polar(0.95, -0.4 * kPi)});
  const V a4 = MonicFromRoots(
      {std::polar(0.97, 0.6), std::polar(0.9, -2.1), std::polar(0.8, 2.8), {-0.3, 0.2}});
  const V x2 = ArRecord(a2, {1.0, 1.37}, 60);
  for (const bool cx : {false, true}) {
    add("AR(2) resonance", kCovPsd, cx, x2, {60, 2, 200, 0, kFs}, {.extra = 0, .spectrumOf = a2});
    add("AR(2), m = 3", kCovPsd, cx, x2, {60, 2, 3, 0, kFs}, {.extra = 0, .spectrumOf = a2});
    add("NaN rate", kCovPsd, cx, x2, {60, 2, 64, 0, kNaN}, {.extra = 0, .spectrumOf = a2});
    add("order 0 refused", kCovPsd, cx, x2, {60, 0, 64, 0, kFs}, {.status = HostCode(12)});
  }
  const V x4 = ArRecord(a4, {{1, .5}, {1.37, .29}, {1.74, -.34}, {2.1, -1.4}}, 60);
  add("complex AR(4)", kCovPsd, true, x4, {60, 4, 200, 0, kFs}, {.extra = 0, .spectrumOf = a4});
  // p + 1 = 4 coefficients on a grid of 2: they wrap by assignment (a[2], a[3] win).
  add("AR(3) on 2 points", kCovPsd, false, realAr, {40, 3, 2, 0, kFs},
      {.extra = 0, .spectrumOf = aReal});

  // ---- PCAR spectra: modes nearest the unit circle, nearest first ------------------------
  // k = p: exact coefficients, but the last pick repeats the first root (chosen roots are
  // masked with the largest distance): spectrum only. p above the rank: exact signal roots.
  const Modes cx3u = {{1.0, 0.4, 0.0, 7.3}, {0.6, -1.2, 0.0, -21.9}, {0.3, 2.5, 0.0, 33.4}};
  const V cx3uX = Signal(cx3u, 64, 100.0);
  add("3 exponentials, k = p", kPcarPsd, true, cx3uX, {64, 3, 256, 3, 100.0},
      {.spectrumOf = MonicFromRoots(Poles(cx3u, 100.0, false)), .count = 3});
  add("3 exponentials, p = 10", kPcarPsd, true, cx3uX, {64, 10, 256, 3, 100.0},
      {.modes = cx3u, .extra = 0});
  const double d = std::log(0.9);  // a pole and its reflection 1/conj(z): distances 0, 0.1, 1/9
  const Modes refl = {{0.5, -1.0, -d, 10.0}, {0.7, 0.2, 0.0, 31.0}, {1.0, 0.4, d, 10.0}};
  add("distance order", kPcarPsd, true, Signal(refl, 40, 100.0), {40, 6, 128, 3, 100.0},
      {.modes = {refl[1], refl[2], refl[0]}, .ordered = true, .extra = 0});
  const Modes cos2 = {{1.5, 0.3, 0.0, 120.0}, {0.8, -1.0, 0.0, 310.0}};
  const V cos2X = Signal(cos2, 80, kFs, true), aCos2 = MonicFromRoots(Poles(cos2, kFs, true));
  for (const uint8_t flag : {0, 1}) {
    add("2 cosines", kPcarPsd, false, cos2X, {80, 8, 512, 4, kFs},
        {.flag = flag, .modes = Halves(cos2, flag == 0), .extra = 0});
  }
  add("2 cosines, k = p", kPcarPsd, false, cos2X, {80, 4, 512, 4, kFs}, {.spectrumOf = aCos2});
  add("2 cosines, NaN rate", kPcarPsd, false, cos2X, {80, 4, 64, 4, kNaN},
      {.spectrumOf = aCos2, .count = 4});
  return cases;
}

TEST(Estimators, AnswersAgreeWithTheirOracles) {
  for (const Case& k : Cases()) {
    const Export& x = *std::find_if(Exports().begin(), Exports().end(), [&](const Export& e) {
      return e.family == k.family && e.complexData == k.cx;
    });
    const std::string where = std::string(x.name) + ": " + k.name;
    SCOPED_TRACE(where);
    std::vector<double> re;
    for (const C& v : k.x) re.push_back(v.real());
    Call c{k.cx ? HostArray::Complex(k.x) : HostArray::Real(re)};
    c.flag = k.flag;
    const Scalars& s = k.s;
    ASSERT_EQ(x.invoke(Qdm(), c, s), k.status);
    if (k.status != 0) ExpectEmptied(x, c, where, true);
    if (k.status != 0) continue;
    std::vector<C> coef, roots;
    std::vector<Mode> modes;
    std::vector<double> db;
    double extra = kNaN;
    const bool spectrum = x.family == Family::kPcarSpectrum || x.family == Family::kCovSpectrum;
    switch (x.family) {
      case Family::kCovariance:
      case Family::kPcar:
        roots = c.out[0].Complexes(), extra = c.d[0];
        if (x.complexData) coef = c.out[1].Complexes();
        for (double v : x.complexData ? std::vector<double>() : c.out[1].Reals()) coef.push_back(v);
        ASSERT_EQ(coef.size(), size_t(s.a) + 1);
        ASSERT_EQ(roots.size(), size_t(s.a));
        EXPECT_EQ(coef[0], C(1));
        for (const C& z : roots) {  // every root is a zero of the returned polynomial
          C v = 0, scale = 0;
          for (const C& a : coef) v = v * z + a, scale = scale * std::abs(z) + std::abs(a);
          EXPECT_LE(std::abs(v), 1e-9 * scale.real()) << z;
        }
        break;
      case Family::kProny:
      case Family::kPencil:
      case Family::kPcarSpectrum: {
        const int32_t n = c.out[0].Count();
        for (int i = 1; i < (spectrum ? 3 : 4); ++i) EXPECT_EQ(c.out[i].Count(), n);
        const std::vector<double> amp = c.out[0].Reals(), ph = c.out[1].Reals(),
                                  damp = spectrum ? std::vector<double>(n, kNaN) : c.out[2].Reals(),
                                  f = c.out[spectrum ? 2 : 3].Reals();
        for (int32_t i = 0; i < n; ++i) modes.push_back({amp[i], ph[i], damp[i], f[i]});
        for (const Mode& m : modes) EXPECT_EQ(std::isnan(m.freq), std::isnan(s.fs));
        extra = c.d[spectrum ? 2 : 0];
        if (spectrum) db = c.out[3].Reals();
        break;
      }
      case Family::kCovSpectrum:
        db = c.out[0].Reals(), extra = c.d[2];
        break;
      case Family::kMdl:
        EXPECT_TRUE(c.order >= k.orderLo && c.order <= k.orderHi) << c.order;
        break;
    }
    if (!k.coef.empty()) {
      EXPECT_LE(RelativeError(coef, k.coef), k.tol);
    }
    for (const C& z : k.poles) {
      double best = INFINITY;
      for (const C& r : roots) best = std::min(best, std::abs(r - z));
      EXPECT_LE(best, k.tol) << z;
    }
    if (k.count >= 0) {
      EXPECT_EQ(int32_t(modes.size()), k.count);
    }
    std::vector<Mode> want = k.modes;  // matched in order of frequency unless ordered
    const auto byFreq = [](const Mode& u, const Mode& v) { return u.freq < v.freq; };
    if (!k.ordered) std::sort(want.begin(), want.end(), byFreq);
    if (!k.ordered) std::sort(modes.begin(), modes.end(), byFreq);
    if (!want.empty()) {
      ASSERT_EQ(modes.size(), want.size());
    }
    for (size_t i = 0; i < want.size(); ++i) {
      const Mode &g = modes[i], &w = want[i];
      EXPECT_NEAR(g.amp, w.amp, k.tol * std::max(1.0, w.amp)) << "mode " << i;
      EXPECT_NEAR(std::remainder(g.phase - w.phase, 2 * kPi), 0.0, k.tol) << "mode " << i;
      if (!spectrum) {
        EXPECT_NEAR(g.damp, w.damp, k.tol) << "mode " << i;
      }
      EXPECT_NEAR(g.freq, w.freq, k.tol * std::max(1.0, std::abs(w.freq))) << "mode " << i;
    }
    if (x.family == Family::kPencil && k.flag == 0) {  // mse: the modes' misfit to the record
      double sum = 0;
      for (int t = 0; t < s.n; ++t) {
        C model = 0;
        for (const Mode& m : modes) model += std::polar(m.amp, m.phase) * pow(Pole(m, s.fs), t);
        sum += std::norm((x.complexData ? k.x[t] : C(re[t])) - model);
      }
      EXPECT_NEAR(extra, sum / s.n, 1e-8 * sum / s.n + 1e-20);
    }
    if (!std::isnan(k.extra)) {
      EXPECT_NEAR(extra, k.extra, k.extraTol);
    }
    if (spectrum) {
      const int32_t N = SpectrumN(s.b);
      ASSERT_EQ(int32_t(db.size()), N);
      EXPECT_TRUE(std::isnan(s.fs) ? std::isnan(c.d[0]) && std::isnan(c.d[1])
                                   : c.d[0] == -s.fs / 2 && c.d[1] == s.fs / N);
      EXPECT_NEAR(*std::max_element(db.begin(), db.end()), 0.0, 1e-12);
      for (int j = 1; !x.complexData && j < N / 2; ++j)  // real data: symmetric about N/2
        EXPECT_NEAR(db[N / 2 - j], db[N / 2 + j], 1e-9) << j;
      if (!k.spectrumOf.empty()) {  // coefficients beyond N replace earlier ones in their slot
        std::vector<C> onGrid(std::min<size_t>(k.spectrumOf.size(), size_t(N)));
        for (size_t i = 0; i < k.spectrumOf.size(); ++i) onGrid[i % size_t(N)] = k.spectrumOf[i];
        const std::vector<double> wantDb = SpectrumDb(onGrid, N);
        for (int j = 0; j < N; ++j) EXPECT_NEAR(db[j], wantDb[j], 1e-6) << "bin " << j;
      }
    }
  }
}

}  // namespace
