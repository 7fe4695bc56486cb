// The fourteen analysis exports as data, for end-to-end tests that treat them
// alike: one row per export with its family, data type, outputs, the call
// itself and the resizes it makes when its checks pass, plus a valid argument
// set per family.
//
//   for (const qdmtest::Export& x : qdmtest::Exports()) {
//     const qdmtest::Scalars s = qdmtest::Valid(x.family);
//     qdmtest::Call c = qdmtest::MakeCall(x, s);   // test signal, stale outputs
//     int32_t st = x.invoke(qdmtest::Qdm(), c, s);
//     if (st != 0) qdmtest::ExpectEmptied(x, c, x.name, /*estimatorMayHaveRun=*/true);
//   }
#pragma once

#include <gtest/gtest.h>

#include <cmath>
#include <complex>
#include <cstdint>
#include <cstring>
#include <functional>
#include <string>
#include <vector>

#include "support/qdm_host.h"

namespace qdmtest {

inline constexpr int32_t kR = QDM_TYPE_DOUBLE;
inline constexpr int32_t kC = QDM_TYPE_COMPLEX;
inline constexpr double kStale = 5.0;   // what outputs hold before a call
inline constexpr int32_t kStaleCount = 3;
inline constexpr int32_t kStaleOrder = 77;

enum class Family { kProny, kCovariance, kPcar, kPencil, kMdl, kCovSpectrum, kPcarSpectrum };

// The scalar arguments of one call: n and the family's integers in argument
// order (Prony/covariance: p; PCAR: p, components; pencil: L, M; MDL: L,
// minOrder; covariance spectrum: p, m; PCAR spectrum: p, m, k), and the rate.
struct Scalars {
  int32_t n;
  int32_t a, b, c;
  double fs;
};

// The host-side state of one call: stale outputs, out doubles, the MDL result.
struct Call {
  HostArray data;
  HostArray out[4] = {HostArray::Filled(kR, kStaleCount, kStale),
                      HostArray::Filled(kR, kStaleCount, kStale),
                      HostArray::Filled(kR, kStaleCount, kStale),
                      HostArray::Filled(kR, kStaleCount, kStale)};
  double d[3] = {kStale, kStale, kStale};
  int32_t order = kStaleOrder;
  uint8_t flag = 1;
};

inline HostArray Signal(bool complexData, int32_t n) {
  if (complexData) {
    std::vector<std::complex<double>> x;
    for (int32_t t = 0; t < n; ++t) {
      x.push_back(std::polar(std::pow(0.97, t), 0.9 * t) + 0.5 * std::polar(1.0, -2.1 * t) +
                  std::complex<double>(0.01 * std::sin(7.3 * t * t), 0.01 * std::cos(5.1 * t)));
    }
    return HostArray::Complex(x);
  }
  std::vector<double> x;
  for (int32_t t = 0; t < n; ++t) {
    x.push_back(std::pow(0.97, t) * std::cos(0.9 * t) + 0.5 * std::cos(2.1 * t + 0.3) +
                0.01 * std::sin(7.3 * t * t));
  }
  return HostArray::Real(x);
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
  int outputs;                 // array outputs, in resize order out[0..]
  int doubles;                 // out doubles d[0..]
  int passThrough;             // index into d of the amplitude-fit error, or -1
  bool failedResizeReturns;    // a failed resize returns at once
  std::function<int32_t(const QdmApi&, Call&, const Scalars&)> invoke;
  // The resizes a call whose checks pass makes first, in order.
  std::function<std::vector<ResizeCall>(const Scalars&)> resizes;
};

inline std::vector<ResizeCall> Repeat(int times, int32_t type, int32_t count) {
  return std::vector<ResizeCall>(static_cast<size_t>(times),
                                 ResizeCall{type, 1, static_cast<size_t>(count)});
}

// Outputs in resize order: Prony and pencil out1..out4; covariance and PCAR
// the p-element second output, then the coefficients; spectra out1..out3 then
// the spectrum.
inline const std::vector<Export>& Exports() {
  static const std::vector<Export> exports = {
      {"QdmRePronyH", Family::kProny, false, 4, 0, -1, true,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmRePronyH(c.data, s.a, s.fs, &c.flag, c.out[0], c.out[1], c.out[2], c.out[3]);
       },
       [](const Scalars& s) { return Repeat(4, kR, s.a); }},
      {"QdmCxPronyH", Family::kProny, true, 4, 0, -1, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmCxPronyH(c.data, s.a, s.fs, c.out[0], c.out[1], c.out[2], c.out[3]);
       },
       [](const Scalars& s) { return Repeat(4, kR, s.a); }},
      {"QdmReCovarianceH", Family::kCovariance, false, 2, 1, -1, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmReCovarianceH(c.data, s.a, c.out[1], c.out[0], &c.d[0]);
       },
       [](const Scalars& s) {
         return std::vector<ResizeCall>{{kC, 1, size_t(s.a)}, {kR, 1, size_t(int64_t{s.a} + 1)}};
       }},
      {"QdmCxCovarianceH", Family::kCovariance, true, 2, 1, -1, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmCxCovarianceH(c.data, s.a, c.out[1], c.out[0], &c.d[0]);
       },
       [](const Scalars& s) {
         return std::vector<ResizeCall>{{kC, 1, size_t(s.a)}, {kC, 1, size_t(int64_t{s.a} + 1)}};
       }},
      {"QdmRePCARH", Family::kPcar, false, 2, 0, -1, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmRePCARH(c.data, s.a, s.b, c.out[1], c.out[0]);
       },
       [](const Scalars& s) {
         return std::vector<ResizeCall>{{kC, 1, size_t(s.a)}, {kR, 1, size_t(int64_t{s.a} + 1)}};
       }},
      {"QdmCxPCARH", Family::kPcar, true, 2, 0, -1, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmCxPCARH(c.data, s.a, s.b, c.out[1], c.out[0]);
       },
       [](const Scalars& s) {
         return std::vector<ResizeCall>{{kC, 1, size_t(s.a)}, {kC, 1, size_t(int64_t{s.a} + 1)}};
       }},
      {"QdmReMatrixPencilH", Family::kPencil, false, 4, 1, -1, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmReMatrixPencilH(c.data, s.a, s.b, s.fs, &c.flag, c.out[0], c.out[1],
                                     c.out[2], c.out[3], &c.d[0]);
       },
       [](const Scalars& s) { return Repeat(4, kR, s.b); }},
      {"QdmCxMatrixPencilH", Family::kPencil, true, 4, 1, -1, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmCxMatrixPencilH(c.data, s.a, s.b, s.fs, c.out[0], c.out[1], c.out[2],
                                     c.out[3], &c.d[0]);
       },
       [](const Scalars& s) { return Repeat(4, kR, s.b); }},
      {"QdmReMinDescriptLenH", Family::kMdl, false, 0, 0, -1, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmReMinDescriptLenH(c.data, s.a, s.b, &c.order);
       },
       [](const Scalars&) { return std::vector<ResizeCall>{}; }},
      {"QdmCxMinDescriptLenH", Family::kMdl, true, 0, 0, -1, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmCxMinDescriptLenH(c.data, s.a, s.b, &c.order);
       },
       [](const Scalars&) { return std::vector<ResizeCall>{}; }},
      {"QdmReCovPowerSpectrH", Family::kCovSpectrum, false, 1, 3, -1, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmReCovPowerSpectrH(c.data, s.a, s.b, s.fs, &c.d[0], &c.d[1], c.out[0],
                                       &c.d[2]);
       },
       [](const Scalars& s) { return Repeat(1, kR, SpectrumN(s.b)); }},
      {"QdmCxCovPowerSpectrH", Family::kCovSpectrum, true, 1, 3, -1, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmCxCovPowerSpectrH(c.data, s.a, s.b, s.fs, &c.d[0], &c.d[1], c.out[0],
                                       &c.d[2]);
       },
       [](const Scalars& s) { return Repeat(1, kR, SpectrumN(s.b)); }},
      {"QdmRePCARPowerSpectrumH", Family::kPcarSpectrum, false, 4, 3, 2, true,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmRePCARPowerSpectrumH(c.data, s.a, s.b, s.c, s.fs, &c.flag, c.out[0],
                                          c.out[1], c.out[2], &c.d[0], &c.d[1], c.out[3],
                                          &c.d[2]);
       },
       [](const Scalars& s) {
         auto r = Repeat(3, kR, s.c);
         r.push_back({kR, 1, size_t(SpectrumN(s.b))});
         return r;
       }},
      {"QdmCxPCARPowerSpectrumH", Family::kPcarSpectrum, true, 4, 3, 2, false,
       [](const QdmApi& q, Call& c, const Scalars& s) {
         return q.QdmCxPCARPowerSpectrumH(c.data, s.a, s.b, s.c, s.fs, c.out[0], c.out[1],
                                          c.out[2], &c.d[0], &c.d[1], c.out[3], &c.d[2]);
       },
       [](const Scalars& s) {
         auto r = Repeat(3, kR, s.c);
         r.push_back({kR, 1, size_t(SpectrumN(s.b))});
         return r;
       }},
  };
  return exports;
}

// n = 12 gives the order bound floor(24/3) = 8.
inline Scalars Valid(Family f) {
  switch (f) {
    case Family::kProny: return {12, 2, 0, 0, 1.0};
    case Family::kCovariance: return {12, 2, 0, 0, 1.0};
    case Family::kPcar: return {12, 4, 2, 0, 1.0};
    case Family::kPencil: return {12, 4, 2, 0, 1.0};
    case Family::kMdl: return {12, 4, 1, 0, 1.0};
    case Family::kCovSpectrum: return {12, 2, 16, 0, 1.0};
    case Family::kPcarSpectrum: return {12, 4, 16, 2, 1.0};
  }
  return {};
}

// More argument sets per family: the valid set (n = 12), one on a longer
// record, and for the spectra a range of sizes including primes; they round up
// to the power-of-two grid, so FFT plans of every length from 2 to 4096 are built.
inline constexpr int32_t kSpectrumSizes[] = {2, 3, 5, 17, 53, 127, 1009, 4096};

inline std::vector<Scalars> ArgumentSets(Family f) {
  std::vector<Scalars> sets = {Valid(f)};
  switch (f) {
    case Family::kProny: sets.push_back({64, 8, 0, 0, 2.0}); break;
    case Family::kCovariance: sets.push_back({64, 10, 0, 0, 1.0}); break;
    case Family::kPcar: sets.push_back({64, 12, 4, 0, 1.0}); break;
    case Family::kPencil: sets.push_back({64, 20, 6, 0, 3.0}); break;
    case Family::kMdl: sets.push_back({64, 12, 2, 0, 1.0}); break;
    case Family::kCovSpectrum:
      sets.clear();
      for (int32_t m : kSpectrumSizes) sets.push_back({12, 2, m, 0, 1.0});
      sets.push_back({64, 10, 256, 0, 1.0});
      break;
    case Family::kPcarSpectrum:
      sets.clear();
      for (int32_t m : kSpectrumSizes) sets.push_back({12, 4, m, 2, 1.0});
      sets.push_back({64, 12, 256, 4, 1.0});
      break;
  }
  return sets;
}

inline Call MakeCall(const Export& x, const Scalars& s) { return Call{Signal(x.complexData, s.n)}; }

// Every output at count 0 and capacity 0, every out double but the
// amplitude-fit error zeroed. The amplitude-fit error is the estimator's: it
// keeps its stale value unless the estimator may have run.
inline void ExpectEmptied(const Export& x, const Call& c, const std::string& where,
                          bool estimatorMayHaveRun = false) {
  for (int i = 0; i < x.outputs; ++i) {
    EXPECT_EQ(c.out[i].Count(), 0) << where << " out" << i;
    EXPECT_EQ(c.out[i].Capacity(), 0u) << where << " out" << i;
  }
  for (int j = 0; j < x.doubles; ++j) {
    if (j != x.passThrough) {
      EXPECT_EQ(c.d[j], 0.0) << where << " double " << j;
    } else if (!estimatorMayHaveRun) {
      EXPECT_EQ(c.d[j], kStale) << where << " double " << j;
    }
  }
}

// Everything a successful call left behind, doubles as bit patterns (NaN-safe):
// every output's count, capacity and elements, the out doubles, the MDL result.
inline std::vector<uint64_t> Leftovers(const Export& x, const Call& c, const Scalars& s) {
  std::vector<uint64_t> bits;
  auto add = [&bits](double v) {
    uint64_t b;
    std::memcpy(&b, &v, sizeof b);
    bits.push_back(b);
  };
  const std::vector<ResizeCall> resizes = x.resizes(s);
  for (int i = 0; i < x.outputs; ++i) {
    const HostArray& out = c.out[i];
    bits.push_back(static_cast<uint64_t>(out.Count()));
    bits.push_back(out.Capacity());
    const int32_t perElement = resizes[static_cast<size_t>(i)].typeCode == kC ? 2 : 1;
    for (double v : out.Reals(static_cast<int32_t>(out.Capacity()) * perElement)) add(v);
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

}  // namespace qdmtest
