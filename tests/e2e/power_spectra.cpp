// The four spectrum exports, called as the host calls them: grid lengths,
// values against a direct evaluation of the AR polynomial, the real-data
// symmetry, argument errors, a NaN sampling rate, and the modes of the PCAR
// spectrum on exact sums of exponentials.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <complex>
#include <limits>
#include <vector>

#include "support/ar_oracles.h"
#include "support/qdm_host.h"

namespace {

using qdmtest::HostArray;
using qdmtest::HostCode;
using qdmtest::Qdm;
using C = std::complex<double>;
constexpr double kPi = 3.141592653589793;
constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

// A record that follows the AR recursion exactly after its start values;
// real when the coefficients are.
std::vector<C> ArRecord(const std::vector<C>& a, int n) {
  const size_t p = a.size() - 1;
  bool real = true;
  for (const C& v : a) real = real && v.imag() == 0.0;
  std::vector<C> x(n);
  for (size_t t = 0; t < size_t(n); ++t) {
    if (t < p) {
      x[t] = C(1.0 + 0.37 * double(t), real ? 0.0 : 0.5 - 0.21 * double(t * t));
      continue;
    }
    C acc(0);
    for (size_t k = 1; k <= p; ++k) acc -= a[k] * x[t - k];
    x[t] = acc;
  }
  return x;
}

std::vector<double> RealParts(const std::vector<C>& v) {
  std::vector<double> r;
  for (const C& c : v) r.push_back(c.real());
  return r;
}

// Deterministic mildly noisy records for the structural checks.
std::vector<C> NoisyComplex(int n) {
  std::vector<C> x(n);
  uint64_t s = 99;
  for (int t = 0; t < n; ++t) {
    s = s * 6364136223846793005ull + 1442695040888963407ull;
    const double u = static_cast<double>(s >> 11) * 0x1.0p-53 - 0.5;
    x[t] = std::polar(1.0, 0.9 * t) + 0.4 * std::polar(1.0, -2.2 * t) + C(0.05 * u, -0.03 * u);
  }
  return x;
}

struct SpectrumCall {
  int32_t status;
  double f0, df, extra;  // extra: noise variance or amplitude-fit error
  std::vector<double> db;
  std::vector<double> amp, phase, freq;
};

SpectrumCall CovSpectrum(const std::vector<C>& x, bool real, int32_t p, int32_t m, double fs) {
  HostArray data = real ? HostArray::Real(RealParts(x)) : HostArray::Complex(x);
  HostArray spectrum = HostArray::Filled(QDM_TYPE_DOUBLE, 3, 9.0);
  SpectrumCall c{};
  c.f0 = c.df = c.extra = -5.0;
  c.status = real ? Qdm().QdmReCovPowerSpectrH(data, p, m, fs, &c.f0, &c.df, spectrum, &c.extra)
                  : Qdm().QdmCxCovPowerSpectrH(data, p, m, fs, &c.f0, &c.df, spectrum, &c.extra);
  c.db = spectrum.Reals();
  return c;
}

SpectrumCall PcarSpectrum(const std::vector<C>& x, bool real, int32_t p, int32_t m, int32_t k,
                          double fs, uint8_t realFlag = 0) {
  HostArray data = real ? HostArray::Real(RealParts(x)) : HostArray::Complex(x);
  HostArray spectrum = HostArray::Filled(QDM_TYPE_DOUBLE, 3, 9.0);
  HostArray amp = HostArray::Filled(QDM_TYPE_DOUBLE, 2, 9.0);
  HostArray phase = HostArray::Filled(QDM_TYPE_DOUBLE, 2, 9.0);
  HostArray freq = HostArray::Filled(QDM_TYPE_DOUBLE, 2, 9.0);
  SpectrumCall c{};
  c.f0 = c.df = c.extra = -5.0;
  c.status = real ? Qdm().QdmRePCARPowerSpectrumH(data, p, m, k, fs, &realFlag, amp, phase, freq,
                                                  &c.f0, &c.df, spectrum, &c.extra)
                  : Qdm().QdmCxPCARPowerSpectrumH(data, p, m, k, fs, amp, phase, freq, &c.f0,
                                                  &c.df, spectrum, &c.extra);
  c.db = spectrum.Reals();
  c.amp = amp.Reals();
  c.phase = phase.Reals();
  c.freq = freq.Reals();
  return c;
}

// ---------------------------------------------------------------------------

TEST(SpectrumExports, LengthIsTheSmallestPowerOfTwoNotBelowTheRequest) {
  const std::vector<C> x = NoisyComplex(40);
  const struct { int32_t m, N; } cases[] = {{2, 2},     {3, 4},      {5, 8},
                                            {512, 512}, {513, 1024}, {1000, 1024}};
  for (const auto& c : cases) {
    for (const bool real : {false, true}) {
      // Order 1 keeps the p + 1 coefficients within the smallest grid.
      const SpectrumCall cov = CovSpectrum(x, real, 1, c.m, 50.0);
      const SpectrumCall pcar = PcarSpectrum(x, real, 1, c.m, 1, 50.0);
      for (const SpectrumCall* s : {&cov, &pcar}) {
        ASSERT_EQ(s->status, 0) << "m=" << c.m << (real ? " real" : " complex");
        EXPECT_EQ(static_cast<int32_t>(s->db.size()), c.N) << "m=" << c.m;
        EXPECT_EQ(s->f0, -25.0);
        EXPECT_EQ(s->df, 50.0 / c.N);
        EXPECT_NEAR(*std::max_element(s->db.begin(), s->db.end()), 0.0, 1e-12) << "m=" << c.m;
      }
    }
  }
}

TEST(SpectrumExports, CovarianceSpectrumOfAnExactArRecordIsItsModelsShape) {
  const double r = 0.95, th = 2 * kPi * 0.2;
  const struct {
    const char* name;
    std::vector<C> poles;
    bool real;
  } models[] = {
      {"AR(1)", {C(0.9, 0)}, true},
      {"AR(2) resonance", {std::polar(r, th), std::polar(r, -th)}, true},
      {"complex AR(4)",
       {std::polar(0.97, 0.6), std::polar(0.9, -2.1), std::polar(0.8, 2.8), C(-0.3, 0.2)},
       false},
  };
  for (const auto& model : models) {
    std::vector<C> a = ar_oracle::MonicFromRoots(model.poles);
    if (model.real)
      for (C& v : a) v = C(v.real(), 0.0);
    const int32_t p = static_cast<int32_t>(model.poles.size());
    const std::vector<C> x = ArRecord(a, 60);
    const std::vector<double> oracle = ar_oracle::SpectrumDb(a, 256);
    for (const bool real : {false, true}) {
      if (real && !model.real) continue;
      const SpectrumCall s = CovSpectrum(x, real, p, 200, 1000.0);
      ASSERT_EQ(s.status, 0) << model.name;
      ASSERT_EQ(s.db.size(), 256u);
      EXPECT_EQ(s.f0, -500.0);
      EXPECT_EQ(s.df, 1000.0 / 256);
      EXPECT_NEAR(s.extra, 0.0, 1e-20) << model.name << ": the record is exactly AR";
      EXPECT_NEAR(*std::max_element(s.db.begin(), s.db.end()), 0.0, 1e-12) << model.name;
      for (int j = 0; j < 256; ++j)
        EXPECT_NEAR(s.db[j], oracle[j], 1e-6) << model.name << (real ? " real" : " complex")
                                              << " j=" << j;
    }
  }
}

TEST(SpectrumExports, RealDataSpectrumIsSymmetricAboutDc) {
  const std::vector<C> x = NoisyComplex(50);
  for (const bool pcar : {false, true}) {
    const SpectrumCall s = pcar ? PcarSpectrum(x, true, 8, 128, 4, 10.0, 1)
                                : CovSpectrum(x, true, 8, 128, 10.0);
    ASSERT_EQ(s.status, 0);
    ASSERT_EQ(s.db.size(), 128u);
    for (int j = 1; j < 64; ++j) EXPECT_NEAR(s.db[64 - j], s.db[64 + j], 1e-9) << j;
    EXPECT_EQ(s.f0, -5.0);  // index 0: the Nyquist bin
  }
}

TEST(SpectrumExports, ArgumentErrorsEmptyTheOutputs) {
  const std::vector<C> x = NoisyComplex(30);  // floor(2n/3) = 20
  const std::vector<C> none;
  const struct {
    const char* name;
    const std::vector<C>* data;
    int32_t p, m, k;
    double fs;
    int32_t cov, pcar;
  } cases[] = {
      {"empty input", &none, 2, 16, 1, 1.0, HostCode(1), HostCode(1)},
      {"negative order", &x, -1, 16, 1, 1.0, HostCode(12), HostCode(11)},
      {"order above 2n/3", &x, 21, 16, 1, 1.0, HostCode(12), HostCode(11)},
      // The covariance estimator refuses order 0 after the entry check let it through.
      {"order zero", &x, 0, 16, 1, 1.0, HostCode(12), HostCode(13)},
      {"no components", &x, 4, 16, 0, 1.0, 0, HostCode(12)},
      {"components above order", &x, 4, 16, 5, 1.0, 0, HostCode(13)},
      {"spectrum size 1", &x, 4, 1, 2, 1.0, HostCode(17), HostCode(17)},
      {"rate zero", &x, 4, 16, 2, 0.0, HostCode(18), HostCode(18)},
      {"rate negative", &x, 4, 16, 2, -8.0, HostCode(18), HostCode(18)},
  };
  for (const auto& c : cases) {
    for (const bool real : {false, true}) {
      const SpectrumCall cov = CovSpectrum(*c.data, real, c.p, c.m, c.fs);
      EXPECT_EQ(cov.status, c.cov) << c.name;
      if (c.cov != 0) {
        EXPECT_TRUE(cov.db.empty()) << c.name;
        EXPECT_EQ(cov.f0, 0.0) << c.name;
        EXPECT_EQ(cov.df, 0.0) << c.name;
        EXPECT_EQ(cov.extra, 0.0) << c.name;
      }
      const SpectrumCall pcar = PcarSpectrum(*c.data, real, c.p, c.m, c.k, c.fs);
      EXPECT_EQ(pcar.status, c.pcar) << c.name;
      EXPECT_TRUE(pcar.db.empty()) << c.name;
      EXPECT_TRUE(pcar.amp.empty() && pcar.phase.empty() && pcar.freq.empty()) << c.name;
      EXPECT_EQ(pcar.f0, 0.0) << c.name;
      EXPECT_EQ(pcar.df, 0.0) << c.name;
    }
  }
}

TEST(SpectrumExports, NanSamplingRateGivesNanGridAndFiniteValues) {
  const std::vector<C> x = NoisyComplex(40);
  for (const bool real : {false, true}) {
    const SpectrumCall cov = CovSpectrum(x, real, 4, 64, kNaN);
    const SpectrumCall pcar = PcarSpectrum(x, real, 4, 64, 2, kNaN);
    const SpectrumCall ref = CovSpectrum(x, real, 4, 64, 1.0);
    for (const SpectrumCall* s : {&cov, &pcar}) {
      ASSERT_EQ(s->status, 0);
      EXPECT_TRUE(std::isnan(s->f0) && std::isnan(s->df));
      ASSERT_EQ(s->db.size(), 64u);
      for (const double v : s->db) EXPECT_TRUE(std::isfinite(v));
    }
    EXPECT_EQ(cov.db, ref.db);
    for (const double f : pcar.freq) EXPECT_TRUE(std::isnan(f));
  }
}

// Indices of the `count` highest local maxima of a periodic spectrum.
std::vector<int> HighestPeaks(const std::vector<double>& db, size_t count) {
  const int L = static_cast<int>(db.size());
  std::vector<std::pair<double, int>> peaks;
  for (int j = 0; j < L; ++j)
    if (db[j] >= db[(j + L - 1) % L] && db[j] > db[(j + 1) % L]) peaks.push_back({db[j], j});
  std::sort(peaks.rbegin(), peaks.rend());
  std::vector<int> out;
  for (size_t i = 0; i < peaks.size() && i < count; ++i) out.push_back(peaks[i].second);
  return out;
}

TEST(SpectrumExports, PcarSpectrumOfExactExponentialsFindsThem) {
  const double fs = 100.0;
  struct Mode {
    double amplitude, phase, frequency;
  };
  const std::vector<Mode> modes = {{1.0, 0.4, 7.3}, {0.6, -1.2, -21.9}, {0.3, 2.5, 33.4}};
  std::vector<C> x(64);
  for (int t = 0; t < 64; ++t)
    for (const Mode& m : modes)
      x[t] += std::polar(m.amplitude, m.phase) * std::polar(1.0, 2 * kPi * m.frequency * t / fs);

  const SpectrumCall s = PcarSpectrum(x, false, 10, 256, 3, fs);
  ASSERT_EQ(s.status, 0);
  ASSERT_EQ(s.db.size(), 256u);
  ASSERT_EQ(s.amp.size(), 3u);
  EXPECT_LT(s.extra, 1e-18);  // the modes fit the record exactly
  // The three highest peaks sit at the modes' frequencies, within one bin.
  std::vector<double> peakFreqs;
  for (const int j : HighestPeaks(s.db, 3)) peakFreqs.push_back(s.f0 + j * s.df);
  std::sort(peakFreqs.begin(), peakFreqs.end());
  std::vector<Mode> byFreq = modes;
  std::sort(byFreq.begin(), byFreq.end(),
            [](const Mode& a, const Mode& b) { return a.frequency < b.frequency; });
  ASSERT_EQ(peakFreqs.size(), 3u);
  for (int i = 0; i < 3; ++i) EXPECT_NEAR(peakFreqs[i], byFreq[i].frequency, s.df) << i;
  // The reported modes are the true ones (in order of distance from the
  // unit circle, so matched by frequency).
  for (const Mode& m : modes) {
    int hit = -1;
    for (int i = 0; i < 3; ++i)
      if (std::abs(s.freq[i] - m.frequency) < 1e-6) hit = i;
    ASSERT_GE(hit, 0) << m.frequency;
    EXPECT_NEAR(s.amp[hit], m.amplitude, 1e-8) << m.frequency;
    EXPECT_NEAR(s.phase[hit], m.phase, 1e-8) << m.frequency;
  }
}

TEST(SpectrumExports, PcarSpectrumOfExactRealSinusoidsReportsOnePerPair) {
  const double fs = 1000.0;
  std::vector<C> x(80);
  for (int t = 0; t < 80; ++t)
    x[t] = C(1.5 * std::cos(2 * kPi * 120.0 * t / fs + 0.3) +
                 0.8 * std::cos(2 * kPi * 310.0 * t / fs - 1.0),
             0.0);
  for (const uint8_t flag : {uint8_t{1}, uint8_t{0}}) {
    const SpectrumCall s = PcarSpectrum(x, true, 8, 512, 4, fs, flag);
    ASSERT_EQ(s.status, 0);
    // A cosine of amplitude a is two exponentials of amplitude a/2 at +-f.
    const std::vector<std::pair<double, double>> expected =
        flag ? std::vector<std::pair<double, double>>{{120.0, 0.75}, {310.0, 0.4}}
             : std::vector<std::pair<double, double>>{
                   {120.0, 0.75}, {-120.0, 0.75}, {310.0, 0.4}, {-310.0, 0.4}};
    ASSERT_EQ(s.freq.size(), expected.size()) << int(flag);
    for (const auto& [f, a] : expected) {
      int hit = -1;
      for (size_t i = 0; i < s.freq.size(); ++i)
        if (std::abs(s.freq[i] - f) < 1e-6) hit = static_cast<int>(i);
      ASSERT_GE(hit, 0) << f;
      EXPECT_NEAR(s.amp[hit], a, 1e-8) << f;
    }
    std::vector<double> peakFreqs;
    for (const int j : HighestPeaks(s.db, 4)) peakFreqs.push_back(std::abs(s.f0 + j * s.df));
    std::sort(peakFreqs.begin(), peakFreqs.end());
    ASSERT_EQ(peakFreqs.size(), 4u);
    EXPECT_NEAR(peakFreqs[0], 120.0, s.df);
    EXPECT_NEAR(peakFreqs[1], 120.0, s.df);
    EXPECT_NEAR(peakFreqs[2], 310.0, s.df);
    EXPECT_NEAR(peakFreqs[3], 310.0, s.df);
  }
}

}  // namespace
