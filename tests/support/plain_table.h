// The plain C API's fourteen fits keyed by the host export they mirror, results
// in the host face's shape, and what a faulted plain call may give.
#pragma once

#include <cmath>
#include <cstring>
#include <map>

#include "qdm_api.h"
#include "support/export_table.h"

namespace qdmtest {

// Outputs in the export table's order (complex ones interleaved), the mode count or MDL order.
struct PlainCall {
  std::vector<double> out[4];
  double d[3] = {kStale, kStale, kStale};
  int32_t count = kStaleOrder;
  int32_t solver = QDM_SOLVER_AUTO;  // the pencil's route
};

inline qdm_complex* Cx(std::vector<double>& v) { return reinterpret_cast<qdm_complex*>(v.data()); }
inline const qdm_complex* Cx(const double* x) { return reinterpret_cast<const qdm_complex*>(x); }

using PlainFn = int32_t (*)(const double* x, const Scalars& s, PlainCall& c);
#define QDM_PLAIN(name, fn, ...)                                                          \
  {                                                                                       \
    name, [](const double* x, const Scalars& s, PlainCall& c) { return fn(__VA_ARGS__); } \
  }
#define QDM_O4 c.out[0].data(), c.out[1].data(), c.out[2].data(), c.out[3].data()
#define QDM_O3 c.out[0].data(), c.out[1].data(), c.out[2].data()

inline int32_t CallPlain(const Export& e, const double* data, const Scalars& sc, PlainCall& call) {
  static const std::map<std::string, PlainFn> table = {
      QDM_PLAIN("QdmRePronyH", qdm_prony_real, x, s.n, s.a, s.fs, 1, QDM_O4, &c.count),
      QDM_PLAIN("QdmCxPronyH", qdm_prony_complex, Cx(x), s.n, s.a, s.fs, QDM_O4, &c.count),
      QDM_PLAIN("QdmReCovarianceH", qdm_covariance_real, x, s.n, s.a, c.out[1].data(), Cx(c.out[0]),
                c.d),
      QDM_PLAIN("QdmCxCovarianceH", qdm_covariance_complex, Cx(x), s.n, s.a, Cx(c.out[1]),
                Cx(c.out[0]), c.d),
      QDM_PLAIN("QdmRePCARH", qdm_pcar_real, x, s.n, s.a, s.b, c.out[1].data(), Cx(c.out[0])),
      QDM_PLAIN("QdmCxPCARH", qdm_pcar_complex, Cx(x), s.n, s.a, s.b, Cx(c.out[1]), Cx(c.out[0])),
      QDM_PLAIN("QdmReMatrixPencilH", qdm_matrix_pencil_solver_real, x, s.n, s.a, s.b, s.fs, 1,
                c.solver, QDM_O4, &c.count, c.d),
      QDM_PLAIN("QdmCxMatrixPencilH", qdm_matrix_pencil_solver_complex, Cx(x), s.n, s.a, s.b, s.fs,
                c.solver, QDM_O4, &c.count, c.d),
      QDM_PLAIN("QdmReMinDescriptLenH", qdm_mdl_order_real, x, s.n, s.a, s.b, &c.count),
      QDM_PLAIN("QdmCxMinDescriptLenH", qdm_mdl_order_complex, Cx(x), s.n, s.a, s.b, &c.count),
      QDM_PLAIN("QdmReCovPowerSpectrH", qdm_covariance_psd_real, x, s.n, s.a, s.b, s.fs,
                c.out[0].data(), &c.d[0], &c.d[1], &c.d[2]),
      QDM_PLAIN("QdmCxCovPowerSpectrH", qdm_covariance_psd_complex, Cx(x), s.n, s.a, s.b, s.fs,
                c.out[0].data(), &c.d[0], &c.d[1], &c.d[2]),
      QDM_PLAIN("QdmRePCARPowerSpectrumH", qdm_pcar_psd_real, x, s.n, s.a, s.b, s.c, s.fs, 1,
                QDM_O3, &c.count, c.out[3].data(), &c.d[0], &c.d[1], &c.d[2]),
      QDM_PLAIN("QdmCxPCARPowerSpectrumH", qdm_pcar_psd_complex, Cx(x), s.n, s.a, s.b, s.c, s.fs,
                QDM_O3, &c.count, c.out[3].data(), &c.d[0], &c.d[1], &c.d[2]),
  };
  // Outputs sized as the host face resizes them (one element for failing
  // argument values, which never reach them).
  const std::vector<ResizeCall> sizes = e.resizes(sc);
  for (int i = 0; i < e.outputs; ++i) {
    const int64_t count = static_cast<int64_t>(sizes[size_t(i)].count);
    const size_t per = sizes[size_t(i)].typeCode == kC ? 2 : 1;
    call.out[i].assign(count > 0 && count < (1 << 20) ? size_t(count) * per : 1, kStale);
  }
  return table.at(e.name)(data, sc, call);
}
#undef QDM_PLAIN
#undef QDM_O4
#undef QDM_O3

inline bool Modes(Family f) {
  return f == Family::kProny || f == Family::kPencil || f == Family::kPcarSpectrum;
}

// Values of output i that hold results: a mode array's first `count` only.
inline size_t ResultValues(const Export& x, const PlainCall& c, int i) {
  const bool counted = Modes(x.family) && !(x.family == Family::kPcarSpectrum && i == 3);
  return counted ? std::min(c.out[i].size(), size_t(std::max(c.count, 0))) : c.out[i].size();
}

inline bool AllFinite(const Export& x, const PlainCall& c) {
  for (int i = 0; i < x.outputs; ++i)
    for (size_t j = 0; j < ResultValues(x, c, i); ++j)
      if (!std::isfinite(c.out[i][j])) return false;
  for (int j = 0; j < x.doubles; ++j)
    if (!std::isfinite(c.d[j])) return false;
  return true;
}

// A spectrum whose grid is shorter than the AR polynomial: the host face wraps
// the coefficients there, the plain face refuses the call.
inline bool SpectrumTooShort(const Export& x, const Scalars& s) {
  return (x.family == Family::kCovSpectrum || x.family == Family::kPcarSpectrum) &&
         SpectrumN(s.b) < int64_t{s.a} + 1;
}

inline std::vector<double> Samples(bool cx, int32_t n) {
  return Signal(cx, n).Reals(n * (cx ? 2 : 1));
}

// The plain face's failure path: every output +0.0, the out doubles and the count 0.
inline bool Zeroed(const Export& x, const PlainCall& c) {
  for (const auto& out : c.out)
    for (double v : out)
      if (v != 0.0 || std::signbit(v)) return false;
  for (int j = 0; j < x.doubles; ++j)
    if (c.d[j] != 0.0) return false;
  return c.count == (Modes(x.family) || x.family == Family::kMdl ? 0 : kStaleOrder);
}

// A call with a fault gives the clean call's status and results bit for bit,
// or an error from inside the fit with every output zeroed: never success
// with other numbers.
inline bool FaultedPlainCallIsRight(const Export& x, int32_t cleanStatus, const PlainCall& clean,
                                    int32_t st, const PlainCall& c) {
  bool same =
      st == cleanStatus && std::memcmp(clean.d, c.d, sizeof c.d) == 0 && clean.count == c.count;
  for (int i = 0; i < 4; ++i)
    same = same && clean.out[i].size() == c.out[i].size() &&
           (c.out[i].empty() ||
            std::memcmp(clean.out[i].data(), c.out[i].data(), c.out[i].size() * 8) == 0);
  return same || (st < 0 && st > -42400 && Zeroed(x, c));
}

}  // namespace qdmtest
