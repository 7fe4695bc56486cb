// The fourteen analysis entry points. Each one only states its tables (checks
// in order, outputs in resize order, out doubles) and its estimator call; the
// sequence itself lives in entry_frame.cpp.
#include <cstdint>

#include "estimation/entry_checks.h"
#include "estimation/estimation.h"
#include "host/entry_frame.h"
#include "core/types.h"
#include "qdm.h"

using host::CountSource;
using host::EntryCall;
using host::EntryPlan;
using host::OutDouble;
using host::OutDoubleRole;
using host::OutputArray;
using host::ResizeFailure;

namespace {

constexpr int32_t kReal = QDM_TYPE_DOUBLE;
constexpr int32_t kCx = QDM_TYPE_COMPLEX;

// Output lengths are computed only from arguments that passed their checks
// (p + 1 overflows for p = INT_MAX); after a failed check nothing is resized,
// so the length does not matter.

// Flags arrive as a pointer to one host byte; its value goes on zero-extended.
int32_t FlagValue(const uint8_t* flag) { return static_cast<int32_t>(*flag); }

// ---- Prony ------------------------------------------------------------------------------

template <typename Estimate>
int32_t PronyEntry(QdmArrayHandle data, int32_t type, int32_t p, double rate, QdmArrayHandle amp,
                   QdmArrayHandle phase, QdmArrayHandle damp, QdmArrayHandle freq,
                   ResizeFailure onResizeFailure, const Estimate& estimate) {
  const int32_t n = host::BlockCount(data);
  const StatusCode check = checks::Prony(n, p, rate);
  const OutputArray outputs[] = {{amp, kReal, p, CountSource::kModes},
                                 {phase, kReal, p, CountSource::kModes},
                                 {damp, kReal, p, CountSource::kModes},
                                 {freq, kReal, p, CountSource::kModes}};
  return host::RunEntry(EntryPlan{data, type, n, check, outputs, {}, onResizeFailure}, estimate);
}

// ---- covariance AR and principal-component AR ----------------------------------------------
// Both resize the p-element second output (poles or roots) first, then the p+1
// coefficients.

template <typename Estimate>
int32_t ArEntry(QdmArrayHandle data, int32_t type, int32_t n, StatusCode check, int32_t p,
                QdmArrayHandle coefficients, QdmArrayHandle second,
                std::span<const OutDouble> outDoubles, const Estimate& estimate) {
  const bool sized = check == status::kOk;
  const OutputArray outputs[] = {{second, kCx, sized ? p : 0, CountSource::kLength},
                                 {coefficients, type, sized ? p + 1 : 0, CountSource::kLength}};
  return host::RunEntry(EntryPlan{data, type, n, check, outputs, outDoubles}, estimate);
}

template <typename Estimate>
int32_t CovarianceEntry(QdmArrayHandle data, int32_t type, int32_t p, QdmArrayHandle coefficients,
                        QdmArrayHandle poles, double* variance, const Estimate& estimate) {
  const int32_t n = host::BlockCount(data);
  const OutDouble outDoubles[] = {{variance, OutDoubleRole::kEstimator}};
  return ArEntry(data, type, n, checks::Covariance(n, p), p, coefficients, poles, outDoubles,
                 estimate);
}

template <typename Estimate>
int32_t PcarEntry(QdmArrayHandle data, int32_t type, int32_t p, int32_t components,
                  QdmArrayHandle coefficients, QdmArrayHandle roots, const Estimate& estimate) {
  const int32_t n = host::BlockCount(data);
  return ArEntry(data, type, n, checks::Pcar(n, p, components), p, coefficients, roots, {},
                 estimate);
}

// ---- matrix pencil --------------------------------------------------------------------------

template <typename Estimate>
int32_t PencilEntry(QdmArrayHandle data, int32_t type, int32_t L, int32_t M, double rate,
                    QdmArrayHandle amp, QdmArrayHandle phase, QdmArrayHandle damp,
                    QdmArrayHandle freq, double* mse, const Estimate& estimate) {
  const int32_t n = host::BlockCount(data);
  const StatusCode check = checks::Pencil(n, L, M, rate);
  const OutputArray outputs[] = {{amp, kReal, M, CountSource::kModes},
                                 {phase, kReal, M, CountSource::kModes},
                                 {damp, kReal, M, CountSource::kModes},
                                 {freq, kReal, M, CountSource::kModes}};
  const OutDouble outDoubles[] = {{mse, OutDoubleRole::kEstimator}};
  return host::RunEntry(EntryPlan{data, type, n, check, outputs, outDoubles}, estimate);
}

// ---- MDL --------------------------------------------------------------------------------

int32_t MdlEntry(QdmArrayHandle data, int32_t type, int32_t L, int32_t minOrder, int32_t* order,
                 host::MdlEstimator estimate) {
  const int32_t n = host::BlockCount(data);
  return host::RunMdlEntry(data, type, n, checks::Mdl(n, L, minOrder), L, minOrder, order,
                           estimate);
}

// ---- spectra ----------------------------------------------------------------------------
// The spectrum has N = SpectrumLength(m) points, computed once m has passed
// its check.

template <typename Estimate>
int32_t CovSpectrumEntry(QdmArrayHandle data, int32_t type, int32_t p, int32_t m, double rate,
                         double* f0, double* df, QdmArrayHandle spectrum, double* variance,
                         const Estimate& estimate) {
  const int32_t n = host::BlockCount(data);
  const StatusCode check = checks::CovSpectrum(n, p, m, rate);
  const int32_t N = check == status::kOk ? SpectrumLength(m) : 0;
  const OutputArray outputs[] = {{spectrum, kReal, N, CountSource::kLength}};
  const OutDouble outDoubles[] = {{f0, OutDoubleRole::kSpectrumF0},
                                  {df, OutDoubleRole::kSpectrumDf},
                                  {variance, OutDoubleRole::kEstimator}};
  return host::RunEntry(EntryPlan{data, type, n, check, outputs, outDoubles}, [&](EntryCall& c) {
    c.spectrum.values = c.RealOutput(0);
    return estimate(c, N);
  });
}

template <typename Estimate>
int32_t PcarSpectrumEntry(QdmArrayHandle data, int32_t type, int32_t p, int32_t m, int32_t k,
                          double rate, QdmArrayHandle amp, QdmArrayHandle phase,
                          QdmArrayHandle freq, double* f0, double* df, QdmArrayHandle spectrum,
                          double* fitError, ResizeFailure onResizeFailure,
                          const Estimate& estimate) {
  const int32_t n = host::BlockCount(data);
  const StatusCode check = checks::PcarSpectrum(n, p, k, m, rate);
  const int32_t N = check == status::kOk ? SpectrumLength(m) : 0;
  const OutputArray outputs[] = {{amp, kReal, k, CountSource::kModes},
                                 {phase, kReal, k, CountSource::kModes},
                                 {freq, kReal, k, CountSource::kModes},
                                 {spectrum, kReal, N, CountSource::kLength}};
  const OutDouble outDoubles[] = {{f0, OutDoubleRole::kSpectrumF0},
                                  {df, OutDoubleRole::kSpectrumDf},
                                  {fitError, OutDoubleRole::kPassThrough}};
  return host::RunEntry(EntryPlan{data, type, n, check, outputs, outDoubles, onResizeFailure},
                        [&](EntryCall& c) {
                          c.spectrum.values = c.RealOutput(3);
                          return estimate(c, N);
                        });
}

}  // namespace

// ================================ exports ================================
// Estimator arguments: the input, its count (c.n), the scalars in the entry point's order,
// the outputs (aligned stand-ins, in the estimator's own order), extra pointers.

extern "C" {

QDM_API int32_t QdmCxPronyH(QdmArrayHandle data, int32_t p, double samplingRate,
                            QdmArrayHandle amplitude, QdmArrayHandle phase, QdmArrayHandle damping,
                            QdmArrayHandle frequency) {
  return PronyEntry(data, kCx, p, samplingRate, amplitude, phase, damping, frequency,
                    ResizeFailure::kEmptyOutputs, [&](EntryCall& c) {
                      return PronyComplex(c.ComplexInput(), c.n, p, samplingRate, c.RealOutput(0),
                                          c.RealOutput(1), c.RealOutput(2), c.RealOutput(3),
                                          &c.modes);
                    });
}

// A failed resize returns at once here, leaving the outputs as they are; the
// complex twin empties them.
QDM_API int32_t QdmRePronyH(QdmArrayHandle data, int32_t p, double samplingRate,
                            const uint8_t* realSignal, QdmArrayHandle amplitude,
                            QdmArrayHandle phase, QdmArrayHandle damping,
                            QdmArrayHandle frequency) {
  return PronyEntry(data, kReal, p, samplingRate, amplitude, phase, damping, frequency,
                    ResizeFailure::kReturnAtOnce, [&](EntryCall& c) {
                      return PronyReal(c.RealInput(), c.n, p, samplingRate, FlagValue(realSignal),
                                       c.RealOutput(0), c.RealOutput(1), c.RealOutput(2),
                                       c.RealOutput(3), &c.modes);
                    });
}

QDM_API int32_t QdmCxCovarianceH(QdmArrayHandle data, int32_t p, QdmArrayHandle coefficients,
                                 QdmArrayHandle poles, double* noiseVariance) {
  return CovarianceEntry(data, kCx, p, coefficients, poles, noiseVariance, [&](EntryCall& c) {
    return CovarianceArComplex(c.ComplexInput(), c.n, p, c.ComplexOutput(1), c.ComplexOutput(0),
                               &c.outDoubles[0]);
  });
}

QDM_API int32_t QdmReCovarianceH(QdmArrayHandle data, int32_t p, QdmArrayHandle coefficients,
                                 QdmArrayHandle poles, double* noiseVariance) {
  return CovarianceEntry(data, kReal, p, coefficients, poles, noiseVariance, [&](EntryCall& c) {
    return CovarianceArReal(c.RealInput(), c.n, p, c.RealOutput(1), c.ComplexOutput(0),
                            &c.outDoubles[0]);
  });
}

QDM_API int32_t QdmCxPCARH(QdmArrayHandle data, int32_t p, int32_t components,
                           QdmArrayHandle coefficients, QdmArrayHandle roots) {
  return PcarEntry(data, kCx, p, components, coefficients, roots, [&](EntryCall& c) {
    return PcarEstimateComplex(c.ComplexInput(), c.n, p, components, c.ComplexOutput(1),
                               c.ComplexOutput(0));
  });
}

QDM_API int32_t QdmRePCARH(QdmArrayHandle data, int32_t p, int32_t components,
                           QdmArrayHandle coefficients, QdmArrayHandle roots) {
  return PcarEntry(data, kReal, p, components, coefficients, roots, [&](EntryCall& c) {
    return PcarEstimateReal(c.RealInput(), c.n, p, components, c.RealOutput(1), c.ComplexOutput(0));
  });
}

QDM_API int32_t QdmCxMatrixPencilH(QdmArrayHandle data, int32_t L, int32_t M, double samplingRate,
                                   QdmArrayHandle amplitude, QdmArrayHandle phase,
                                   QdmArrayHandle damping, QdmArrayHandle frequency, double* mse) {
  return PencilEntry(data, kCx, L, M, samplingRate, amplitude, phase, damping, frequency, mse,
                     [&](EntryCall& c) {
                       return MatrixPencilComplex(c.ComplexInput(), c.n, L, M, samplingRate,
                                                  c.RealOutput(0), c.RealOutput(1), c.RealOutput(2),
                                                  c.RealOutput(3), &c.modes, &c.outDoubles[0]);
                     });
}

QDM_API int32_t QdmReMatrixPencilH(QdmArrayHandle data, int32_t L, int32_t M, double samplingRate,
                                   const uint8_t* realSignal, QdmArrayHandle amplitude,
                                   QdmArrayHandle phase, QdmArrayHandle damping,
                                   QdmArrayHandle frequency, double* mse) {
  return PencilEntry(data, kReal, L, M, samplingRate, amplitude, phase, damping, frequency, mse,
                     [&](EntryCall& c) {
                       return MatrixPencilReal(c.RealInput(), c.n, L, M, samplingRate,
                                               FlagValue(realSignal), c.RealOutput(0),
                                               c.RealOutput(1), c.RealOutput(2), c.RealOutput(3),
                                               &c.modes, &c.outDoubles[0]);
                     });
}

QDM_API int32_t QdmCxMinDescriptLenH(QdmArrayHandle data, int32_t L, int32_t minOrder,
                                     int32_t* order) {
  return MdlEntry(data, kCx, L, minOrder, order,
                  [](const void* x, int32_t n, int32_t upper, int32_t lower, int32_t* chosen) {
                    return MdlOrderComplex(static_cast<const Complex*>(x), n, upper, lower, chosen);
                  });
}

QDM_API int32_t QdmReMinDescriptLenH(QdmArrayHandle data, int32_t L, int32_t minOrder,
                                     int32_t* order) {
  return MdlEntry(data, kReal, L, minOrder, order,
                  [](const void* x, int32_t n, int32_t upper, int32_t lower, int32_t* chosen) {
                    return MdlOrderReal(static_cast<const double*>(x), n, upper, lower, chosen);
                  });
}

QDM_API int32_t QdmCxCovPowerSpectrH(QdmArrayHandle data, int32_t p, int32_t m, double samplingRate,
                                     double* f0, double* df, QdmArrayHandle spectrum,
                                     double* noiseVariance) {
  return CovSpectrumEntry(
      data, kCx, p, m, samplingRate, f0, df, spectrum, noiseVariance, [&](EntryCall& c, int32_t N) {
        return CovPowerSpectrumComplex(c.ComplexInput(), c.n, p, N, samplingRate, &c.spectrum,
                                       &c.outDoubles[2]);
      });
}

QDM_API int32_t QdmReCovPowerSpectrH(QdmArrayHandle data, int32_t p, int32_t m, double samplingRate,
                                     double* f0, double* df, QdmArrayHandle spectrum,
                                     double* noiseVariance) {
  return CovSpectrumEntry(data, kReal, p, m, samplingRate, f0, df, spectrum, noiseVariance,
                          [&](EntryCall& c, int32_t N) {
                            return CovPowerSpectrumReal(c.RealInput(), c.n, p, N, samplingRate,
                                                        &c.spectrum, &c.outDoubles[2]);
                          });
}

QDM_API int32_t QdmCxPCARPowerSpectrumH(QdmArrayHandle data, int32_t p, int32_t m, int32_t k,
                                        double samplingRate, QdmArrayHandle amplitude,
                                        QdmArrayHandle phase, QdmArrayHandle frequency, double* f0,
                                        double* df, QdmArrayHandle spectrum, double* fitError) {
  return PcarSpectrumEntry(
      data, kCx, p, m, k, samplingRate, amplitude, phase, frequency, f0, df, spectrum, fitError,
      ResizeFailure::kEmptyOutputs, [&](EntryCall& c, int32_t N) {
        return PcarPowerSpectrumComplex(c.ComplexInput(), c.n, p, k, N, samplingRate,
                                        c.RealOutput(0), c.RealOutput(1), c.RealOutput(2), &c.modes,
                                        &c.spectrum, &c.outDoubles[2]);
      });
}

// A failed resize returns at once here, leaving the outputs as they are; the
// complex twin empties them.
QDM_API int32_t QdmRePCARPowerSpectrumH(QdmArrayHandle data, int32_t p, int32_t m, int32_t k,
                                        double samplingRate, const uint8_t* realSignal,
                                        QdmArrayHandle amplitude, QdmArrayHandle phase,
                                        QdmArrayHandle frequency, double* f0, double* df,
                                        QdmArrayHandle spectrum, double* fitError) {
  return PcarSpectrumEntry(
      data, kReal, p, m, k, samplingRate, amplitude, phase, frequency, f0, df, spectrum, fitError,
      ResizeFailure::kReturnAtOnce, [&](EntryCall& c, int32_t N) {
        return PcarPowerSpectrumReal(c.RealInput(), c.n, p, k, N, samplingRate,
                                     FlagValue(realSignal), c.RealOutput(0), c.RealOutput(1),
                                     c.RealOutput(2), &c.modes, &c.spectrum, &c.outDoubles[2]);
      });
}

}  // extern "C"
