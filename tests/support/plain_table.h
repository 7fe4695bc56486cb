// The plain C API's fourteen fits as a table keyed by the host export they
// mirror, with results in the host face's shape, for tests that run both
// faces on the same calls (the plain-versus-host suite, the fuzzer).
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <vector>

#include "qdm_api.h"
#include "support/export_table.h"

namespace qdmtest {

// Plain-face results in the host face's shape: array outputs in the export
// table's resize order (complex ones interleaved), out doubles in its order,
// and the mode count (or the MDL order).
struct PlainCall {
  std::vector<double> out[4];
  double d[3] = {kStale, kStale, kStale};
  int32_t count = kStaleOrder;
};

using PlainFn = std::function<int32_t(const double* x, const Scalars&, PlainCall&)>;

// Sizes the outputs as the header documents them (nothing for failing
// argument values, which never reach them) and calls the plain function.
inline qdm_complex* Cx(std::vector<double>& v) { return reinterpret_cast<qdm_complex*>(v.data()); }
inline const qdm_complex* Cx(const double* x) { return reinterpret_cast<const qdm_complex*>(x); }
inline size_t Room(int64_t count, int doubles = 1) {
  return count > 0 && count < (1 << 20) ? static_cast<size_t>(count) * doubles : 1;
}
inline int32_t Points(int32_t m) { return qdm_spectrum_length(m) > 0 ? qdm_spectrum_length(m) : 1; }

inline const std::map<std::string, PlainFn>& PlainFunctions() {
  static const std::map<std::string, PlainFn> table = {
      {"QdmRePronyH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         for (auto& o : c.out) o.assign(Room(s.a), kStale);
         return qdm_prony_real(x, s.n, s.a, s.fs, 1, c.out[0].data(), c.out[1].data(),
                               c.out[2].data(), c.out[3].data(), &c.count);
       }},
      {"QdmCxPronyH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         for (auto& o : c.out) o.assign(Room(s.a), kStale);
         return qdm_prony_complex(Cx(x), s.n, s.a, s.fs, c.out[0].data(), c.out[1].data(),
                                  c.out[2].data(), c.out[3].data(), &c.count);
       }},
      {"QdmReCovarianceH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         c.out[0].assign(Room(s.a, 2), kStale);
         c.out[1].assign(Room(int64_t{s.a} + 1), kStale);
         return qdm_covariance_real(x, s.n, s.a, c.out[1].data(), Cx(c.out[0]), &c.d[0]);
       }},
      {"QdmCxCovarianceH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         c.out[0].assign(Room(s.a, 2), kStale);
         c.out[1].assign(Room(int64_t{s.a} + 1, 2), kStale);
         return qdm_covariance_complex(Cx(x), s.n, s.a, Cx(c.out[1]), Cx(c.out[0]), &c.d[0]);
       }},
      {"QdmRePCARH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         c.out[0].assign(Room(s.a, 2), kStale);
         c.out[1].assign(Room(int64_t{s.a} + 1), kStale);
         return qdm_pcar_real(x, s.n, s.a, s.b, c.out[1].data(), Cx(c.out[0]));
       }},
      {"QdmCxPCARH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         c.out[0].assign(Room(s.a, 2), kStale);
         c.out[1].assign(Room(int64_t{s.a} + 1, 2), kStale);
         return qdm_pcar_complex(Cx(x), s.n, s.a, s.b, Cx(c.out[1]), Cx(c.out[0]));
       }},
      {"QdmReMatrixPencilH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         for (auto& o : c.out) o.assign(Room(s.b), kStale);
         return qdm_matrix_pencil_real(x, s.n, s.a, s.b, s.fs, 1, c.out[0].data(),
                                       c.out[1].data(), c.out[2].data(), c.out[3].data(),
                                       &c.count, &c.d[0]);
       }},
      {"QdmCxMatrixPencilH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         for (auto& o : c.out) o.assign(Room(s.b), kStale);
         return qdm_matrix_pencil_complex(Cx(x), s.n, s.a, s.b, s.fs, c.out[0].data(),
                                          c.out[1].data(), c.out[2].data(), c.out[3].data(),
                                          &c.count, &c.d[0]);
       }},
      {"QdmReMinDescriptLenH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         return qdm_mdl_order_real(x, s.n, s.a, s.b, &c.count);
       }},
      {"QdmCxMinDescriptLenH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         return qdm_mdl_order_complex(Cx(x), s.n, s.a, s.b, &c.count);
       }},
      {"QdmReCovPowerSpectrH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         c.out[0].assign(static_cast<size_t>(Points(s.b)), kStale);
         return qdm_covariance_psd_real(x, s.n, s.a, s.b, s.fs, c.out[0].data(), &c.d[0],
                                        &c.d[1], &c.d[2]);
       }},
      {"QdmCxCovPowerSpectrH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         c.out[0].assign(static_cast<size_t>(Points(s.b)), kStale);
         return qdm_covariance_psd_complex(Cx(x), s.n, s.a, s.b, s.fs, c.out[0].data(), &c.d[0],
                                           &c.d[1], &c.d[2]);
       }},
      {"QdmRePCARPowerSpectrumH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         for (int i = 0; i < 3; ++i) c.out[i].assign(Room(s.c), kStale);
         c.out[3].assign(static_cast<size_t>(Points(s.b)), kStale);
         return qdm_pcar_psd_real(x, s.n, s.a, s.b, s.c, s.fs, 1, c.out[0].data(),
                                  c.out[1].data(), c.out[2].data(), &c.count, c.out[3].data(),
                                  &c.d[0], &c.d[1], &c.d[2]);
       }},
      {"QdmCxPCARPowerSpectrumH",
       [](const double* x, const Scalars& s, PlainCall& c) {
         for (int i = 0; i < 3; ++i) c.out[i].assign(Room(s.c), kStale);
         c.out[3].assign(static_cast<size_t>(Points(s.b)), kStale);
         return qdm_pcar_psd_complex(Cx(x), s.n, s.a, s.b, s.c, s.fs, c.out[0].data(),
                                     c.out[1].data(), c.out[2].data(), &c.count,
                                     c.out[3].data(), &c.d[0], &c.d[1], &c.d[2]);
       }},
  };
  return table;
}

inline bool Modes(Family f) {
  return f == Family::kProny || f == Family::kPencil || f == Family::kPcarSpectrum;
}

}  // namespace qdmtest
