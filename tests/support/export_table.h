// The fourteen analysis exports as data, for tests that treat them alike: one
// row per export (family, data type, outputs, the call itself), the resizes a
// call makes when its checks pass, argument sets per family, and what a call
// leaves behind when it fails.
#pragma once

#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <complex>
#include <cstdint>
#include <string>
#include <vector>

#include "support/qdm_host.h"

namespace qdmtest {

inline constexpr int32_t kR = QDM_TYPE_DOUBLE, kC = QDM_TYPE_COMPLEX;
inline constexpr double kStale = 5.0;  // what outputs hold before a call
inline constexpr int32_t kStaleCount = 3, kStaleOrder = 77;

enum class Family { kProny, kCovariance, kPcar, kPencil, kMdl, kCovSpectrum, kPcarSpectrum };

// n, the family's integers in argument order (Prony/covariance: p; PCAR: p,
// components; pencil: L, M; MDL: L, minOrder; covariance spectrum: p, m; PCAR
// spectrum: p, m, k), and the rate.
struct Scalars {
  int32_t n, a, b, c;
  double fs;
};

// The host-side state of one call: stale outputs, out doubles, the MDL result.
struct Call {
  HostArray data;
  static HostArray Stale() { return HostArray::Filled(kR, kStaleCount, kStale); }
  HostArray out[4] = {Stale(), Stale(), Stale(), Stale()};
  double d[3] = {kStale, kStale, kStale};
  int32_t order = kStaleOrder;
  uint8_t flag = 1;
};

inline HostArray Signal(bool complexData, int32_t n) {
  std::vector<std::complex<double>> z;
  std::vector<double> x;
  for (int32_t t = 0; t < n; ++t) {
    z.push_back(std::polar(std::pow(0.97, t), 0.9 * t) + 0.5 * std::polar(1.0, -2.1 * t) +
                std::complex<double>(0.01 * std::sin(7.3 * t * t), 0.01 * std::cos(5.1 * t)));
    x.push_back(std::pow(0.97, t) * std::cos(0.9 * t) + 0.5 * std::cos(2.1 * t + 0.3) +
                0.01 * std::sin(7.3 * t * t));
  }
  return complexData ? HostArray::Complex(z) : HostArray::Real(x);
}

// Smallest power of two not below m (0 beyond 32 bits: such an m fails its check).
inline int32_t SpectrumN(int32_t m) {
  int64_t N = 1;
  while (N < m) N *= 2;
  return N > INT32_MAX ? 0 : static_cast<int32_t>(N);
}

struct Export {
  const char* name;
  Family family;
  bool complexData;
  int outputs, doubles;      // array outputs out[0..] in resize order, out doubles d[0..]
  int passThrough;           // index into d of the amplitude-fit error, or -1
  bool failedResizeReturns;  // a failed resize returns at once
  int32_t (*invoke)(const QdmApi&, Call&, const Scalars&);

  // The resizes a call whose checks pass makes first, in order: Prony and
  // pencil out1..out4; covariance and PCAR the p roots, then the coefficients;
  // spectra out1..out3, then the spectrum.
  std::vector<ResizeCall> resizes(const Scalars& s) const {
    std::vector<ResizeCall> r;
    auto add = [&r](int times, int32_t type, int64_t count) {
      r.insert(r.end(), size_t(times), ResizeCall{type, 1, size_t(count)});
    };
    const Family f = family;
    if (f == Family::kProny || f == Family::kPencil) add(4, kR, f == Family::kProny ? s.a : s.b);
    if (f == Family::kCovariance || f == Family::kPcar) add(1, kC, s.a);
    if (f == Family::kCovariance || f == Family::kPcar) add(1, complexData ? kC : kR, s.a + 1LL);
    if (f == Family::kPcarSpectrum) add(3, kR, s.c);
    if (f == Family::kCovSpectrum || f == Family::kPcarSpectrum) add(1, kR, SpectrumN(s.b));
    return r;
  }
};

// Exports that ignore a least-squares solve's status on purpose (covariance
// estimator, mode-amplitude fit): a fault inside it may end in success with
// another result, the one exception to "the clean result or the failure".
inline bool IgnoresSolveStatus(const Export& x) { return x.family != Family::kPcar; }

// clang-format off
#define QDM_ROW(fn, family, cx, outputs, doubles, pass, returns, ...)                           \
  Export{#fn, Family::family, cx, outputs, doubles, pass, returns,                              \
         [](const QdmApi& q, Call& c, const Scalars& s) { return q.fn(c.data, __VA_ARGS__); }}
#define QDM_OUT4 c.out[0], c.out[1], c.out[2], c.out[3]
// clang-format on

inline const std::vector<Export>& Exports() {
  static const std::vector<Export> exports = {
      QDM_ROW(QdmRePronyH, kProny, false, 4, 0, -1, true, s.a, s.fs, &c.flag, QDM_OUT4),
      QDM_ROW(QdmCxPronyH, kProny, true, 4, 0, -1, false, s.a, s.fs, QDM_OUT4),
      QDM_ROW(QdmReCovarianceH, kCovariance, false, 2, 1, -1, false, s.a, c.out[1], c.out[0], c.d),
      QDM_ROW(QdmCxCovarianceH, kCovariance, true, 2, 1, -1, false, s.a, c.out[1], c.out[0], c.d),
      QDM_ROW(QdmRePCARH, kPcar, false, 2, 0, -1, false, s.a, s.b, c.out[1], c.out[0]),
      QDM_ROW(QdmCxPCARH, kPcar, true, 2, 0, -1, false, s.a, s.b, c.out[1], c.out[0]),
      QDM_ROW(QdmReMatrixPencilH, kPencil, false, 4, 1, -1, false, s.a, s.b, s.fs, &c.flag,
              QDM_OUT4, c.d),
      QDM_ROW(QdmCxMatrixPencilH, kPencil, true, 4, 1, -1, false, s.a, s.b, s.fs, QDM_OUT4, c.d),
      QDM_ROW(QdmReMinDescriptLenH, kMdl, false, 0, 0, -1, false, s.a, s.b, &c.order),
      QDM_ROW(QdmCxMinDescriptLenH, kMdl, true, 0, 0, -1, false, s.a, s.b, &c.order),
      QDM_ROW(QdmReCovPowerSpectrH, kCovSpectrum, false, 1, 3, -1, false, s.a, s.b, s.fs, &c.d[0],
              &c.d[1], c.out[0], &c.d[2]),
      QDM_ROW(QdmCxCovPowerSpectrH, kCovSpectrum, true, 1, 3, -1, false, s.a, s.b, s.fs, &c.d[0],
              &c.d[1], c.out[0], &c.d[2]),
      QDM_ROW(QdmRePCARPowerSpectrumH, kPcarSpectrum, false, 4, 3, 2, true, s.a, s.b, s.c, s.fs,
              &c.flag, c.out[0], c.out[1], c.out[2], &c.d[0], &c.d[1], c.out[3], &c.d[2]),
      QDM_ROW(QdmCxPCARPowerSpectrumH, kPcarSpectrum, true, 4, 3, 2, false, s.a, s.b, s.c, s.fs,
              c.out[0], c.out[1], c.out[2], &c.d[0], &c.d[1], c.out[3], &c.d[2]),
  };
  return exports;
}
#undef QDM_ROW
#undef QDM_OUT4

// By family; n = 12 gives the order bound floor(24/3) = 8.
inline constexpr Scalars kValid[] = {{12, 2, 0, 0, 1}, {12, 2, 0, 0, 1}, {12, 4, 2, 0, 1},
                                     {12, 4, 2, 0, 1}, {12, 4, 1, 0, 1}, {12, 2, 16, 0, 1},
                                     {12, 4, 16, 2, 1}};
inline Scalars Valid(Family f) { return kValid[static_cast<int>(f)]; }

// Argument sets per family: the valid set and one on a longer record; for the
// spectra, sizes including primes instead of the valid one: they round up to
// the power-of-two grid, so FFT plans of every length from 2 to 4096 are built.
inline std::vector<Scalars> ArgumentSets(Family f) {
  constexpr Scalars kLonger[] = {{64, 8, 0, 0, 2},   {64, 10, 0, 0, 1}, {64, 12, 4, 0, 1},
                                 {64, 20, 6, 0, 3},  {64, 12, 2, 0, 1}, {64, 10, 256, 0, 1},
                                 {64, 12, 256, 4, 1}};
  const Scalars v = Valid(f);
  std::vector<Scalars> sets = {v};
  if (f == Family::kCovSpectrum || f == Family::kPcarSpectrum) {
    sets.clear();
    for (int32_t m : {2, 3, 5, 17, 53, 127, 1009, 4096}) sets.push_back({12, v.a, m, v.c, 1});
  }
  sets.push_back(kLonger[static_cast<int>(f)]);
  return sets;
}

inline Call MakeCall(const Export& x, const Scalars& s) { return Call{Signal(x.complexData, s.n)}; }

// A host block of real data, or of complex data from interleaved doubles.
inline HostArray Block(bool complexData, const std::vector<double>& v) {
  if (!complexData) return HostArray::Real(v);
  return HostArray::Complex(std::span<const std::complex<double>>(
      reinterpret_cast<const std::complex<double>*>(v.data()), v.size() / 2));
}

// Output i of a call as doubles (two per complex element).
inline std::vector<double> Values(const Export& x, const Call& c, const Scalars& s, int i) {
  return c.out[i].Reals(c.out[i].Count() * (x.resizes(s)[size_t(i)].typeCode == kC ? 2 : 1));
}

inline std::string Where(const Export& x, const Scalars& s) {
  return std::string(x.name) + " n=" + std::to_string(s.n) + " (" + std::to_string(s.a) + "," +
         std::to_string(s.b) + "," + std::to_string(s.c) + ") fs=" + std::to_string(s.fs);
}

// Every output at count 0 and capacity 0 (or only the counts), every out double
// zeroed but the amplitude-fit error: that one is the estimator's, and keeps
// its stale value unless the estimator may have run.
inline bool Emptied(const Export& x, const Call& c, bool estimatorMayHaveRun,
                    bool countsOnly = false) {
  bool ok = true;
  for (int i = 0; i < x.outputs; ++i)
    ok = ok && c.out[i].Count() == 0 && (countsOnly || c.out[i].Capacity() == 0);
  for (int j = 0; j < x.doubles; ++j)
    ok = ok && (j != x.passThrough ? c.d[j] == 0.0 : estimatorMayHaveRun || c.d[j] == kStale);
  return ok;
}
inline void ExpectEmptied(const Export& x, const Call& c, const std::string& where,
                          bool estimatorMayHaveRun = false) {
  EXPECT_TRUE(Emptied(x, c, estimatorMayHaveRun)) << where << ": outputs not emptied";
}

// Everything a call left behind, doubles as bit patterns (NaN-safe): every
// output's count, capacity and elements, the out doubles, the MDL result.
inline std::vector<uint64_t> Leftovers(const Export& x, const Call& c, const Scalars& s) {
  std::vector<uint64_t> bits;
  auto add = [&bits](double v) { bits.push_back(std::bit_cast<uint64_t>(v)); };
  for (int i = 0; i < x.outputs; ++i) {
    bits.insert(bits.end(), {uint64_t(c.out[i].Count()), c.out[i].Capacity()});
    const int32_t perElement = x.resizes(s)[size_t(i)].typeCode == kC ? 2 : 1;
    for (double v : c.out[i].Reals(int32_t(c.out[i].Capacity()) * perElement)) add(v);
  }
  for (int j = 0; j < x.doubles; ++j) add(c.d[j]);
  bits.push_back(static_cast<uint64_t>(c.order));
  return bits;
}

// The resizes of the failure path: every output to 0 with its type code.
inline std::vector<ResizeCall> EmptyingResizes(const Export& x, const Scalars& s) {
  std::vector<ResizeCall> r = x.resizes(s);
  for (ResizeCall& call : r) call.count = 0;
  return r;
}

// A call with an injected fault gives the clean call's status and result bit
// for bit, or the failure: -20001 with its outputs emptied, or a failed
// resize's error (resizeError, 0 for an allocation fault) with the outputs as
// that path leaves them: real Prony and real PCAR spectrum return at once and
// touch nothing; the others empty them, and when resizes fail from then on the
// emptying ones fail too, so only the counts are certain. IgnoresSolveStatus.
inline bool FaultedHostCallIsRight(const Export& x, const Scalars& s, int32_t cleanStatus,
                                   const std::vector<uint64_t>& clean, const Call& c, int32_t st,
                                   int32_t resizeError, bool fromThenOn) {
  if (st == cleanStatus && (st != 0 || Leftovers(x, c, s) == clean)) return true;
  if (resizeError != 0 && x.failedResizeReturns) {
    bool untouched = st == HostCode(resizeError);
    for (int i = 0; i < x.outputs; ++i) untouched = untouched && c.out[i].Count() == kStaleCount;
    for (int j = 0; j < x.doubles; ++j) untouched = untouched && c.d[j] == kStale;
    return untouched;
  }
  if (resizeError != 0) return st == HostCode(resizeError) && Emptied(x, c, false, fromThenOn);
  if (st == kHostNoMemory) {
    return Emptied(x, c, true) && c.order == (x.family == Family::kMdl ? 0 : kStaleOrder);
  }
  return st == 0 && IgnoresSolveStatus(x);
}

}  // namespace qdmtest
