/* qdm: parametric time-series estimators for the Graffel host.
 *
 * Every analysis function takes host array handles and returns a host status:
 * 0 on success, otherwise an error code in the host's numbering (-424xx for
 * argument errors, -20xxx for numeric failures, -42400 - e for a host resize
 * error e). Output arrays are resized through the host's NumericArrayResize.
 *
 * A host array block holds a 32-bit element count followed, from byte 4, by
 * the elements: 64-bit floats (type code 10) or complex values, two 64-bit
 * floats with the real part first (type code 13). A handle points to a pointer
 * to such a block. */
#ifndef QDM_H
#define QDM_H

#include <stdint.h>

#if defined(_WIN32)
#  if defined(QDM_BUILDING_LIBRARY)
#    define QDM_API __declspec(dllexport)
#  else
#    define QDM_API __declspec(dllimport)
#  endif
#else
#  define QDM_API __attribute__((visibility("default")))
#endif

#ifdef __cplusplus
extern "C" {
#endif

typedef struct QdmArrayBlock QdmArrayBlock; /* int32 count, elements at byte 4 */
typedef QdmArrayBlock** QdmArrayHandle;

/* Host type codes. */
enum { QDM_TYPE_DOUBLE = 10, QDM_TYPE_COMPLEX = 13 };

/* Names the host run-time module that exports NumericArrayResize (a module
 * handle: HMODULE on Windows, a dlopen handle elsewhere); null restores the
 * automatic lookup. */
QDM_API void SetGFRTModule(void* module);

/* Covariance-method AR: coefficients (p+1; real or complex), poles (p complex),
 * prediction-error variance. */
QDM_API int32_t QdmReCovarianceH(QdmArrayHandle data, int32_t p, QdmArrayHandle coefficients,
                                 QdmArrayHandle poles, double* noiseVariance);
QDM_API int32_t QdmCxCovarianceH(QdmArrayHandle data, int32_t p, QdmArrayHandle coefficients,
                                 QdmArrayHandle poles, double* noiseVariance);

/* Principal-component AR with `components` singular components kept. */
QDM_API int32_t QdmRePCARH(QdmArrayHandle data, int32_t p, int32_t components,
                           QdmArrayHandle coefficients, QdmArrayHandle roots);
QDM_API int32_t QdmCxPCARH(QdmArrayHandle data, int32_t p, int32_t components,
                           QdmArrayHandle coefficients, QdmArrayHandle roots);

/* Prony: per mode amplitude, phase (rad), damping (per sample), frequency (Hz).
 * realSignal: non-zero reports only the non-negative frequency of each pair. */
QDM_API int32_t QdmRePronyH(QdmArrayHandle data, int32_t p, double samplingRate,
                            const uint8_t* realSignal, QdmArrayHandle amplitude,
                            QdmArrayHandle phase, QdmArrayHandle damping,
                            QdmArrayHandle frequency);
QDM_API int32_t QdmCxPronyH(QdmArrayHandle data, int32_t p, double samplingRate,
                            QdmArrayHandle amplitude, QdmArrayHandle phase,
                            QdmArrayHandle damping, QdmArrayHandle frequency);

/* Matrix pencil with pencil parameter L and M modes; mse: mean squared fit error. */
QDM_API int32_t QdmReMatrixPencilH(QdmArrayHandle data, int32_t L, int32_t M,
                                   double samplingRate, const uint8_t* realSignal,
                                   QdmArrayHandle amplitude, QdmArrayHandle phase,
                                   QdmArrayHandle damping, QdmArrayHandle frequency,
                                   double* mse);
QDM_API int32_t QdmCxMatrixPencilH(QdmArrayHandle data, int32_t L, int32_t M,
                                   double samplingRate, QdmArrayHandle amplitude,
                                   QdmArrayHandle phase, QdmArrayHandle damping,
                                   QdmArrayHandle frequency, double* mse);

/* Minimum description length order between minOrder and the upper order L. */
QDM_API int32_t QdmReMinDescriptLenH(QdmArrayHandle data, int32_t L, int32_t minOrder,
                                     int32_t* order);
QDM_API int32_t QdmCxMinDescriptLenH(QdmArrayHandle data, int32_t L, int32_t minOrder,
                                     int32_t* order);

/* Covariance AR power spectrum in dB (peak 0 dB) on N = smallest power of two
 * >= m points from f0 = -fs/2 in steps df = fs/N. */
QDM_API int32_t QdmReCovPowerSpectrH(QdmArrayHandle data, int32_t p, int32_t m,
                                     double samplingRate, double* f0, double* df,
                                     QdmArrayHandle spectrum, double* noiseVariance);
QDM_API int32_t QdmCxCovPowerSpectrH(QdmArrayHandle data, int32_t p, int32_t m,
                                     double samplingRate, double* f0, double* df,
                                     QdmArrayHandle spectrum, double* noiseVariance);

/* Principal-component AR power spectrum with the k modes nearest the unit
 * circle (amplitude, phase, frequency). */
QDM_API int32_t QdmRePCARPowerSpectrumH(QdmArrayHandle data, int32_t p, int32_t m, int32_t k,
                                        double samplingRate, const uint8_t* realSignal,
                                        QdmArrayHandle amplitude, QdmArrayHandle phase,
                                        QdmArrayHandle frequency, double* f0, double* df,
                                        QdmArrayHandle spectrum, double* fitError);
QDM_API int32_t QdmCxPCARPowerSpectrumH(QdmArrayHandle data, int32_t p, int32_t m, int32_t k,
                                        double samplingRate, QdmArrayHandle amplitude,
                                        QdmArrayHandle phase, QdmArrayHandle frequency,
                                        double* f0, double* df, QdmArrayHandle spectrum,
                                        double* fitError);

#ifdef __cplusplus
}
#endif

#endif /* QDM_H */
