/** @file qdm.h
 * @brief qdm's host face: the exports the Graffel host calls with its handles.
 *
 * Every analysis function takes host array handles and returns a host status:
 * 0 on success, otherwise an error code in the host's numbering (qdm_status.h:
 * -424xx for argument errors, -20xxx for numeric failures, and -42400 - e when
 * the host's NumericArrayResize fails with its own error e).
 *
 * @par Host arrays
 * A host array block holds a 32-bit element count followed, from byte 4, by
 * the elements: 64-bit floats (type code 10) or complex values, two 64-bit
 * floats with the real part first (type code 13). A handle points to a pointer
 * to such a block. The library resizes every output through the host's
 * NumericArrayResize (found in the calling process on first use; a process
 * without it ends with a "Fatal Error" message and exit code 1) and writes the
 * counts.
 *
 * @par The common sequence
 * 1. The argument checks, in the order each function lists; the first that
 *    fails is returned, and the outputs are emptied (MDL: result untouched).
 * 2. The outputs are resized in the order listed; a failed resize is returned
 *    (mapped) after emptying the outputs, except in QdmRePronyH and
 *    QdmRePCARPowerSpectrumH, which return at once and leave them as they are.
 * 3. The fit. On a non-zero status every output is resized to 0 elements with
 *    count 0 and the out doubles are set to 0.0 (the PCAR spectrum's amplitude
 *    fit error is left as the fit left it).
 *
 * The models, output orders and conventions are those of the plain C API
 * (qdm_api.h): coefficients a[0] = 1 for x[t] + a[1] x[t-1] + ... = e[t];
 * poles in the root finder's order; modes as amplitude, phase (rad), damping
 * (per sample), frequency (Hz); spectra in dB with the peak at 0 dB on
 * N = qdm_spectrum_length(m) points from f0 = -fs/2 in steps df = fs/N. A NaN
 * sampling rate passes the rate check. Unlike the plain face, a least-squares
 * solve that fails inside covariance AR, Prony or an amplitude fit does not stop
 * the fit: it goes on with what the solve left and can report 0. */
#ifndef QDM_H
#define QDM_H

#include <stdint.h>

#if defined(_WIN32)
#if defined(QDM_BUILDING_LIBRARY)
#define QDM_API __declspec(dllexport)
#else
#define QDM_API __declspec(dllimport)
#endif
#else
#define QDM_API __attribute__((visibility("default")))
#endif

#ifdef __cplusplus
extern "C" {
#endif

typedef struct QdmArrayBlock QdmArrayBlock; /* int32 count, elements at byte 4 */
typedef QdmArrayBlock** QdmArrayHandle;

/** Host type codes. */
enum { QDM_TYPE_DOUBLE = 10, QDM_TYPE_COMPLEX = 13 };

/** Names the host run-time module that exports NumericArrayResize (a module
 *  handle: HMODULE on Windows, a dlopen handle elsewhere); null restores the
 *  automatic lookup (the executable if it exports "gGFRTVersion" or
 *  "AZNewHandle", then an already loaded gfrt or gfffrt module). */
QDM_API void SetGFRTModule(void* module);

/** Covariance-method AR (see qdm_covariance_real()).
 *  Checks: n < 1 gives -42401; p <= 0 or p > floor(2n/3) gives -42412.
 *  Resizes: poles (type 13, p), then coefficients (type 10 for real data, 13
 *  for complex, p + 1). noiseVariance: the mean squared prediction error.
 *  Other statuses: -20001 memory, -20062, -20063, -20116 from the root finder,
 *  a host resize error. */
QDM_API int32_t QdmReCovarianceH(QdmArrayHandle data, int32_t p, QdmArrayHandle coefficients,
                                 QdmArrayHandle poles, double* noiseVariance);
QDM_API int32_t QdmCxCovarianceH(QdmArrayHandle data, int32_t p, QdmArrayHandle coefficients,
                                 QdmArrayHandle poles, double* noiseVariance);

/** Principal-component AR with `components` singular components kept (see
 *  qdm_pcar_real()). Checks: n < 1: -42401; p < 0 or p > floor(2n/3): -42411;
 *  components <= 0: -42412; components > p: -42413. Resizes: roots (type 13,
 *  p), then coefficients (p + 1). Other statuses: -20001, -20068, -20062,
 *  -20063, -20116, a host resize error. */
QDM_API int32_t QdmRePCARH(QdmArrayHandle data, int32_t p, int32_t components,
                           QdmArrayHandle coefficients, QdmArrayHandle roots);
QDM_API int32_t QdmCxPCARH(QdmArrayHandle data, int32_t p, int32_t components,
                           QdmArrayHandle coefficients, QdmArrayHandle roots);

/** Prony (see qdm_prony_real()): per mode amplitude, phase (rad), damping (per
 *  sample), frequency (Hz). realSignal (real data only, one host byte): non-zero
 *  reports only the member of each conjugate pair with arg(z) in [0, pi).
 *  Checks: n < 1: -42401; p <= 0 or p > floor(2n/3): -42412; samplingRate <= 0:
 *  -42418. Resizes: the four outputs to p elements each; their count is the
 *  number of modes reported. Other statuses: -20001, -20062, -20063, -20116, a
 *  host resize error. */
QDM_API int32_t QdmRePronyH(QdmArrayHandle data, int32_t p, double samplingRate,
                            const uint8_t* realSignal, QdmArrayHandle amplitude,
                            QdmArrayHandle phase, QdmArrayHandle damping, QdmArrayHandle frequency);
QDM_API int32_t QdmCxPronyH(QdmArrayHandle data, int32_t p, double samplingRate,
                            QdmArrayHandle amplitude, QdmArrayHandle phase, QdmArrayHandle damping,
                            QdmArrayHandle frequency);

/** Matrix pencil with pencil parameter L and M modes (see
 *  qdm_matrix_pencil_real()); mse: mean squared fitting error. Checks: n < 1:
 *  -42401; L < 0 or L > floor(2n/3): -42411; M <= 0: -42412; M > L: -42413;
 *  samplingRate <= 0: -42418. Resizes: the four outputs to M elements; their
 *  count is the number of modes reported (at most min(M, n - L, L)). Other
 *  statuses: -20001, -20068, -20062, -20999, a host resize error. */
QDM_API int32_t QdmReMatrixPencilH(QdmArrayHandle data, int32_t L, int32_t M, double samplingRate,
                                   const uint8_t* realSignal, QdmArrayHandle amplitude,
                                   QdmArrayHandle phase, QdmArrayHandle damping,
                                   QdmArrayHandle frequency, double* mse);
QDM_API int32_t QdmCxMatrixPencilH(QdmArrayHandle data, int32_t L, int32_t M, double samplingRate,
                                   QdmArrayHandle amplitude, QdmArrayHandle phase,
                                   QdmArrayHandle damping, QdmArrayHandle frequency, double* mse);

/** Minimum description length order between minOrder and the upper order L (see
 *  qdm_mdl_order_real()). Checks: n < 1: -42401; minOrder < 1: -42414;
 *  L <= minOrder or L > floor(2n/3): -42415; a failed check leaves *order
 *  untouched. *order is left as it was when no order scores below 10000, and
 *  set to 0 on a failure of the fit (-20001, -20068, -20062, -20999). */
QDM_API int32_t QdmReMinDescriptLenH(QdmArrayHandle data, int32_t L, int32_t minOrder,
                                     int32_t* order);
QDM_API int32_t QdmCxMinDescriptLenH(QdmArrayHandle data, int32_t L, int32_t minOrder,
                                     int32_t* order);

/** Covariance AR power spectrum in dB (peak 0 dB) on N = smallest power of two
 *  >= m points from f0 = -fs/2 in steps df = fs/N (see
 *  qdm_covariance_psd_real()). Checks: n < 1: -42401; p < 0 or p > floor(2n/3):
 *  -42412; m <= 1 or m > 2^30: -42417; samplingRate <= 0: -42418. Resizes: the
 *  spectrum to N. Other statuses: -20001, -20062, -20063, -20116, a host
 *  resize error; f0, df and noiseVariance are 0.0 after any failure. */
QDM_API int32_t QdmReCovPowerSpectrH(QdmArrayHandle data, int32_t p, int32_t m, double samplingRate,
                                     double* f0, double* df, QdmArrayHandle spectrum,
                                     double* noiseVariance);
QDM_API int32_t QdmCxCovPowerSpectrH(QdmArrayHandle data, int32_t p, int32_t m, double samplingRate,
                                     double* f0, double* df, QdmArrayHandle spectrum,
                                     double* noiseVariance);

/** Principal-component AR power spectrum with the k modes nearest the unit
 *  circle (amplitude, phase, frequency; see qdm_pcar_psd_real()). Checks:
 *  n < 1: -42401; p < 0 or p > floor(2n/3): -42411; k <= 0: -42412; k > p:
 *  -42413; m <= 1 or m > 2^30: -42417; samplingRate <= 0: -42418. Resizes:
 *  the three mode arrays to k (count: modes reported), then the spectrum to
 *  N. fitError is the amplitude fit's mean squared error. Other statuses:
 *  -20001, -20068, -20062, -20063, -20116, a host resize error. */
QDM_API int32_t QdmRePCARPowerSpectrumH(QdmArrayHandle data, int32_t p, int32_t m, int32_t k,
                                        double samplingRate, const uint8_t* realSignal,
                                        QdmArrayHandle amplitude, QdmArrayHandle phase,
                                        QdmArrayHandle frequency, double* f0, double* df,
                                        QdmArrayHandle spectrum, double* fitError);
QDM_API int32_t QdmCxPCARPowerSpectrumH(QdmArrayHandle data, int32_t p, int32_t m, int32_t k,
                                        double samplingRate, QdmArrayHandle amplitude,
                                        QdmArrayHandle phase, QdmArrayHandle frequency, double* f0,
                                        double* df, QdmArrayHandle spectrum, double* fitError);

#ifdef __cplusplus
}
#endif

#endif /* QDM_H */
