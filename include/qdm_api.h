/** @file qdm_api.h
 * @brief qdm's plain C API: every fit over ordinary arrays.
 *
 * Link with `-lqdm_api` (pkg-config `qdm`, CMake `qdm::qdm_api`). The host face,
 * include/qdm.h and libqdm, serves the Graffel host and its array handles; this
 * face serves everyone else. Both run the same estimators, argument checks and
 * status codes, and give the same numbers.
 *
 * @par Conventions
 * - Inputs are pointers and lengths; outputs are arrays the caller allocates,
 *   with the sizes each function states. Outputs must not overlap the input.
 * - Real samples are `double`. Complex values are ::qdm_complex, two doubles
 *   with the real part first: the storage of C99 `double complex` and C++
 *   `std::complex<double>`, which may be passed by casting the pointer.
 * - Arrays need only the natural alignment of `double`.
 * - Every fit returns a status from qdm_status.h: ::QDM_OK, the warning
 *   ::QDM_WARN_RANK_DEFICIENT (results complete and valid), or a negative error.
 *   qdm_status_text() gives its meaning. After an argument error (a -424xx
 *   code) nothing has been written. After any other error every output array
 *   is zero-filled, every mode count is 0 and every out double is 0.0.
 * - No success (::QDM_OK or the warning) carries a NaN or an infinity. A fit
 *   that ran but would hand one back (a pole at 0 from a single spike, a pole
 *   on the unit circle from a ramp, a variance beyond the double range)
 *   returns ::QDM_ERR_NON_FINITE_RESULT with its outputs zeroed.
 * - Functions are safe to call from any number of threads at once. The only
 *   state shared between calls is the list of FFT plans, under one lock.
 *
 * @par What this face adds to the host face's checks
 * Each fit first makes the host face's argument checks, in the same order and
 * with the same codes, but for one bound: floor(2n/3) is taken in 64 bits, where
 * the host face's 32-bit form wraps for n >= 2^30 and refuses every order (such
 * a record meets the work bound here instead). Then, in this order:
 * 1. (spectra) a spectrum of fewer than order + 1 values:
 *    ::QDM_ERR_SPECTRUM_TOO_SHORT. The host face wraps the p + 1 AR
 *    coefficients onto the shorter grid there and so evaluates another
 *    polynomial than A(f); this face refuses the call;
 * 2. a null pointer where the function needs one: ::QDM_ERR_NULL_POINTER;
 * 3. a fit whose work memory would exceed #QDM_MAX_WORK_BYTES:
 *    ::QDM_ERR_WORK_LIMIT (the bound keeps a request for a huge spectrum or
 *    pencil from exhausting the machine); it is checked before any sample is
 *    read;
 * 4. a NaN or infinite sample or sampling rate: ::QDM_ERR_NON_FINITE.
 *
 * A record whose largest magnitude lies outside [2^-128, 2^128] is fitted as
 * a copy multiplied by the power of two that brings that magnitude into
 * [1, 2), and the results are scaled back (amplitudes once, variances and
 * errors twice). Every fit is homogeneous in the record and a power of two
 * rounds nothing, so the results are those of the record itself, without the
 * overflow of its squares near 1e+308 or their underflow near 1e-308. One
 * consequence: MDL's fixed threshold on the fitting error then applies to the
 * scaled record. Records inside the range reach the estimators unchanged.
 *
 * The host face deliberately goes on when a least-squares solve inside a fit
 * fails (covariance AR, Prony, the amplitude fits) and reports success with
 * whatever the solve left. This face never does: if any allocation, LAPACK call
 * or least-squares solve fails during the call, the call returns that failure.
 * A rank-deficient solve, which the host face does not report, comes back here
 * as ::QDM_WARN_RANK_DEFICIENT with the complete minimum-norm results.
 *
 * @par Models and output conventions
 * - AR coefficients: a[0..p], a[0] = 1, for the model
 *   x[t] + a[1] x[t-1] + ... + a[p] x[t-p] = e[t].
 * - Poles or roots: the p zeros of z^p + a[1] z^(p-1) + ... + a[p], complex for
 *   real data too, in the order the root finder finds them: zero roots first,
 *   then as found (not sorted, not paired).
 * - Modes: four arrays, amplitude |A_i|, phase arg(A_i) in radians in
 *   (-pi, pi], damping ln|z_i| per sample (negative for a decaying mode), and
 *   frequency arg(z_i) fs / (2 pi) in Hz, for the model x[t] = sum A_i z_i^t.
 *   With `real_signal` non-zero only poles with arg(z) in [0, pi) are reported
 *   (one per conjugate pair, amplitude not doubled); otherwise every pole is.
 * - Spectra: qdm_spectrum_length(points) values in dB, peak exactly 0 dB,
 *   value j at frequency f0 + j df with f0 = -fs/2 and df = fs / length, of
 *   1/|A(f)|^2 for the model's p + 1 coefficients; the length must be at least
 *   p + 1.
 */
#ifndef QDM_API_H
#define QDM_API_H

#include <stdint.h>

#include "qdm_status.h"
#include "qdm_version.h"

#if defined(_WIN32)
#if defined(QDM_BUILDING_API)
#define QDM_PLAIN_API __declspec(dllexport)
#else
#define QDM_PLAIN_API __declspec(dllimport)
#endif
#else
#define QDM_PLAIN_API __attribute__((visibility("default")))
#endif

#ifdef __cplusplus
extern "C" {
#endif

/** Bound on the work memory of one fit, in bytes (8 GiB). A fit whose work
 *  memory, as estimated from its sizes before any allocation, would exceed it
 *  returns ::QDM_ERR_WORK_LIMIT. */
#define QDM_MAX_WORK_BYTES (INT64_C(8) << 30)

/** A complex value: real part, imaginary part. */
typedef double qdm_complex[2];

/** The library's version as "major.minor.patch". */
QDM_PLAIN_API const char* qdm_version(void);

/** The meaning of a status code, as a static string. Every code of qdm_status.h
 *  has its text; a host resize error (-42400 - e) and unknown codes get a
 *  general text. Never null. */
QDM_PLAIN_API const char* qdm_status_text(int32_t status);

/** Number of spectrum values for `points` requested points: the smallest power
 *  of two not below `points`; 0 when points < 2 or points > 2^30 (the spectra
 *  then return ::QDM_ERR_SPECTRUM_SIZE). */
QDM_PLAIN_API int32_t qdm_spectrum_length(int32_t points);

/** Room an output needs for a size argument (order, pencil, components or
 *  modes) on a record of n samples: min(size, floor(2n/3)), and 0 for n < 1 or
 *  size < 1. Every fit refuses a size above floor(2n/3) before it writes, so
 *  poles, roots and modes need at most this many values and coefficients one
 *  more; an absurd request never becomes a huge output. */
QDM_PLAIN_API int32_t qdm_output_room(int32_t n, int32_t size);

/** The textbook pencil parameter for n samples, L = floor(n/3): the default of
 *  the Python package and the tool. */
QDM_PLAIN_API int32_t qdm_default_pencil(int32_t n);

/** The default upper order L of the MDL search (qdm_mdl_order_real(),
 *  qdm_mdl_order_complex()) for n samples: the textbook floor(n/3), capped at
 *  64, and raised to 2 where n/3 is below it; 0 for n < 3, where no upper order
 *  passes (L must lie above min_order >= 1 and at most at floor(2n/3)). With
 *  min_order = 1 it is valid for every n that has a valid upper order. The cap
 *  bounds the cost: the search costs O(n m + m^3) for m up to L, and a
 *  150,000-sample record would otherwise ask for m = 50,000. The default of
 *  the Python package and the tool. */
QDM_PLAIN_API int32_t qdm_default_mdl_upper(int32_t n);

/* ---------------------------------------------------------------------------- */
/** @name Covariance-method AR
 * Forward linear prediction over the n - p samples that have p predecessors,
 * solved in the least-squares sense (no windowing).
 * @param x             n samples
 * @param n             number of samples, >= 1
 * @param order         model order p, 1 <= p <= floor(2n/3)
 * @param coefficients  out: p + 1 AR coefficients, a[0] = 1
 * @param poles         out: p complex poles
 * @param noise_variance out: mean squared prediction error over the n - p equations
 * @return ::QDM_OK, ::QDM_WARN_RANK_DEFICIENT; ::QDM_ERR_EMPTY_INPUT,
 *   ::QDM_ERR_COUNT (order out of range), ::QDM_ERR_NULL_POINTER,
 *   ::QDM_ERR_WORK_LIMIT, ::QDM_ERR_NON_FINITE, ::QDM_ERR_NO_MEMORY,
 *   ::QDM_ERR_EXTREME_VALUE, ::QDM_ERR_NO_CONVERGENCE, ::QDM_ERR_POLYNOMIAL,
 *   ::QDM_ERR_ROOT_NAN,
 *   ::QDM_ERR_NON_FINITE_RESULT.
 * @{ */
QDM_PLAIN_API int32_t qdm_covariance_real(const double* x, int32_t n, int32_t order,
                                          double* coefficients, qdm_complex* poles,
                                          double* noise_variance);
QDM_PLAIN_API int32_t qdm_covariance_complex(const qdm_complex* x, int32_t n, int32_t order,
                                             qdm_complex* coefficients, qdm_complex* poles,
                                             double* noise_variance);
/** @} */

/* ---------------------------------------------------------------------------- */
/** @name Principal-component AR
 * Forward-backward linear prediction (the backward equations conjugated for
 * complex data), solved through the pseudo-inverse truncated to the
 * `components` strongest singular components of the 2(n - p)-by-p data matrix.
 * The singular triplets come by the route ::QDM_SOLVER_AUTO picks (see
 * qdm_pcar_solver_real()).
 * @param x             n samples
 * @param n             number of samples, >= 1
 * @param order         model order p, 0 <= p <= floor(2n/3)
 * @param components    singular components kept k, 1 <= k <= p
 * @param coefficients  out: p + 1 AR coefficients, a[0] = 1
 * @param roots         out: p complex roots of the AR polynomial
 * @return ::QDM_OK; ::QDM_ERR_EMPTY_INPUT, ::QDM_ERR_ORDER (order out of
 *   range), ::QDM_ERR_COUNT (components < 1), ::QDM_ERR_COUNT_ABOVE_ORDER
 *   (components > order), ::QDM_ERR_NULL_POINTER, ::QDM_ERR_WORK_LIMIT,
 *   ::QDM_ERR_NON_FINITE, ::QDM_ERR_NO_MEMORY, ::QDM_ERR_EXTREME_VALUE,
 *   ::QDM_ERR_NO_CONVERGENCE, ::QDM_ERR_POLYNOMIAL, ::QDM_ERR_ROOT_NAN,
 *   ::QDM_ERR_NON_FINITE_RESULT, ::QDM_ERR_KRYLOV_NO_CONVERGENCE.
 * @{ */
QDM_PLAIN_API int32_t qdm_pcar_real(const double* x, int32_t n, int32_t order, int32_t components,
                                    double* coefficients, qdm_complex* roots);
QDM_PLAIN_API int32_t qdm_pcar_complex(const qdm_complex* x, int32_t n, int32_t order,
                                       int32_t components, qdm_complex* coefficients,
                                       qdm_complex* roots);

/** Principal-component AR with the route chosen by the caller: the same
 *  arguments and results as qdm_pcar_real() / qdm_pcar_complex(), with
 *  `solver` one of ::qdm_solver (else ::QDM_ERR_SOLVER, checked after the
 *  arguments above). ::QDM_SOLVER_DENSE forms the data matrix and takes its
 *  SVD: O(n p^2) time, O(n p) memory (the host face's route).
 *  ::QDM_SOLVER_KRYLOV forms neither and takes the k + 1 leading singular
 *  triplets (k = `components`) by Lanczos over FFT products with the record,
 *  O(n log n) per product and O(n k) memory: the same coefficients and roots
 *  to rounding wherever the k-th singular value stands clear of the next and
 *  of rounding noise, with the same rank decision (values above the midpoint
 *  of the k-th and the next). ::QDM_SOLVER_AUTO takes the Krylov route only
 *  for long records at large orders with k small beside p (at most p/4),
 *  where its estimated time is under half the dense one's. The roots of the
 *  degree-p polynomial cost the same on both routes. The work-memory bound
 *  applies to the route taken. Besides their statuses, ::QDM_ERR_SOLVER and
 *  ::QDM_ERR_KRYLOV_NO_CONVERGENCE. */
QDM_PLAIN_API int32_t qdm_pcar_solver_real(const double* x, int32_t n, int32_t order,
                                           int32_t components, int32_t solver, double* coefficients,
                                           qdm_complex* roots);
QDM_PLAIN_API int32_t qdm_pcar_solver_complex(const qdm_complex* x, int32_t n, int32_t order,
                                              int32_t components, int32_t solver,
                                              qdm_complex* coefficients, qdm_complex* roots);
/** @} */

/* ---------------------------------------------------------------------------- */
/** @name Prony method
 * p damped exponentials: poles from a covariance-method AR model of order p,
 * amplitudes by a least-squares fit of the poles to the data. Modes are
 * reported in the order of the poles.
 * @param x             n samples
 * @param n             number of samples, >= 1
 * @param order         number of exponentials p, 1 <= p <= floor(2n/3)
 * @param fs            sampling rate in Hz, > 0
 * @param real_signal   (real data only) non-zero: one mode per conjugate pair
 * @param amplitude,phase,damping,frequency  out: room for p values each
 * @param modes         out: number of modes reported (p, or fewer with real_signal)
 * @return ::QDM_OK, ::QDM_WARN_RANK_DEFICIENT; ::QDM_ERR_EMPTY_INPUT,
 *   ::QDM_ERR_COUNT, ::QDM_ERR_SAMPLE_RATE, ::QDM_ERR_NULL_POINTER,
 *   ::QDM_ERR_WORK_LIMIT, ::QDM_ERR_NON_FINITE, ::QDM_ERR_NO_MEMORY,
 *   ::QDM_ERR_EXTREME_VALUE, ::QDM_ERR_NO_CONVERGENCE, ::QDM_ERR_POLYNOMIAL,
 *   ::QDM_ERR_ROOT_NAN,
 *   ::QDM_ERR_NON_FINITE_RESULT.
 * @{ */
QDM_PLAIN_API int32_t qdm_prony_real(const double* x, int32_t n, int32_t order, double fs,
                                     int32_t real_signal, double* amplitude, double* phase,
                                     double* damping, double* frequency, int32_t* modes);
QDM_PLAIN_API int32_t qdm_prony_complex(const qdm_complex* x, int32_t n, int32_t order, double fs,
                                        double* amplitude, double* phase, double* damping,
                                        double* frequency, int32_t* modes);
/** @} */

/* ---------------------------------------------------------------------------- */
/** @name Matrix pencil method
 * Poles of M damped exponentials from the (n - L)-by-L data matrix and its
 * one-sample shift, reduced to the M strongest singular components; amplitudes
 * by least squares. When M exceeds min(n - L, L) the order drops to that value.
 * The leading singular triplets come by the route ::QDM_SOLVER_AUTO picks.
 * @param x             n samples
 * @param n             number of samples, >= 1
 * @param pencil        pencil parameter L, 0 <= L <= floor(2n/3) (n/3 is a common choice)
 * @param order         number of exponentials M, 1 <= M <= L
 * @param fs            sampling rate in Hz, > 0
 * @param real_signal   (real data only) non-zero: one mode per conjugate pair
 * @param amplitude,phase,damping,frequency  out: room for M values each
 * @param modes         out: number of modes reported
 * @param mse           out: mean squared fitting error of the modes
 * @return ::QDM_OK, ::QDM_WARN_RANK_DEFICIENT; ::QDM_ERR_EMPTY_INPUT,
 *   ::QDM_ERR_ORDER (L out of range), ::QDM_ERR_COUNT (M < 1),
 *   ::QDM_ERR_COUNT_ABOVE_ORDER (M > L), ::QDM_ERR_SAMPLE_RATE,
 *   ::QDM_ERR_NULL_POINTER, ::QDM_ERR_WORK_LIMIT, ::QDM_ERR_NON_FINITE,
 *   ::QDM_ERR_NO_MEMORY, ::QDM_ERR_EXTREME_VALUE (a degenerate record),
 *   ::QDM_ERR_NO_CONVERGENCE, ::QDM_ERR_ILLEGAL_ARGUMENT,
 *   ::QDM_ERR_NON_FINITE_RESULT, ::QDM_ERR_KRYLOV_NO_CONVERGENCE.
 * @{ */
QDM_PLAIN_API int32_t qdm_matrix_pencil_real(const double* x, int32_t n, int32_t pencil,
                                             int32_t order, double fs, int32_t real_signal,
                                             double* amplitude, double* phase, double* damping,
                                             double* frequency, int32_t* modes, double* mse);
QDM_PLAIN_API int32_t qdm_matrix_pencil_complex(const qdm_complex* x, int32_t n, int32_t pencil,
                                                int32_t order, double fs, double* amplitude,
                                                double* phase, double* damping, double* frequency,
                                                int32_t* modes, double* mse);

/** How the matrix pencil finds the leading singular triplets of its
 *  (n - L)-by-L data matrix (and principal-component AR those of its
 *  2(n - p)-by-p one: qdm_pcar_solver_real()). */
typedef enum qdm_solver {
  /** Whichever route is estimated to be faster: the Krylov route for long
   *  records with M small beside L (at most L/4), the dense one otherwise. What
   *  qdm_matrix_pencil_real() and qdm_matrix_pencil_complex() use. */
  QDM_SOLVER_AUTO = 0,
  /** Form the data matrix and its one-sample shift and decompose the first:
   *  O(n L^2) time, O(n L) memory. The host face's route. */
  QDM_SOLVER_DENSE = 1,
  /** Form neither: the M leading triplets by a restarted Lanczos
   *  bidiagonalization whose products with the data matrix are FFT
   *  convolutions with the record. O(n log n) per product, O(n M) memory. The
   *  same modes as the dense route to rounding wherever the M-th singular value
   *  stands clear of the next; may end in ::QDM_ERR_KRYLOV_NO_CONVERGENCE. */
  QDM_SOLVER_KRYLOV = 2
} qdm_solver;

/** The matrix pencil with the route chosen by the caller: the same arguments
 *  and results as qdm_matrix_pencil_real() / qdm_matrix_pencil_complex(), with
 *  `solver` one of ::qdm_solver (else ::QDM_ERR_SOLVER, checked after the
 *  arguments above). The work-memory bound applies to the route taken.
 *  Besides their statuses, ::QDM_ERR_SOLVER and
 *  ::QDM_ERR_KRYLOV_NO_CONVERGENCE. */
QDM_PLAIN_API int32_t qdm_matrix_pencil_solver_real(const double* x, int32_t n, int32_t pencil,
                                                    int32_t order, double fs, int32_t real_signal,
                                                    int32_t solver, double* amplitude,
                                                    double* phase, double* damping,
                                                    double* frequency, int32_t* modes, double* mse);
QDM_PLAIN_API int32_t qdm_matrix_pencil_solver_complex(const qdm_complex* x, int32_t n,
                                                       int32_t pencil, int32_t order, double fs,
                                                       int32_t solver, double* amplitude,
                                                       double* phase, double* damping,
                                                       double* frequency, int32_t* modes,
                                                       double* mse);
/** @} */

/* ---------------------------------------------------------------------------- */
/** @name Minimum description length order
 * Scores each order m from `min_order` to r = min(n - L', L') (L' = L - 1 when
 * L = n/2, else L) by n ln(E) + 10 m ln(n), E the matrix-pencil fitting error,
 * and keeps the lowest; a fit with E < 2.2e-16 ends the search at once.
 * @param x             n samples
 * @param n             number of samples, >= 1
 * @param max_order     upper order L, min_order < L <= floor(2n/3)
 * @param min_order     smallest order tried, >= 1
 * @param order         in/out: the chosen order. Left as the caller set it when
 *                      no order scores below 10000 (initialise it, e.g. to 0).
 * @return ::QDM_OK, ::QDM_WARN_RANK_DEFICIENT; ::QDM_ERR_EMPTY_INPUT,
 *   ::QDM_ERR_MIN_ORDER, ::QDM_ERR_MDL_UPPER, ::QDM_ERR_NULL_POINTER,
 *   ::QDM_ERR_WORK_LIMIT, ::QDM_ERR_NON_FINITE, ::QDM_ERR_NO_MEMORY,
 *   ::QDM_ERR_EXTREME_VALUE, ::QDM_ERR_NO_CONVERGENCE,
 *   ::QDM_ERR_ILLEGAL_ARGUMENT. On an error *order is 0.
 * @{ */
QDM_PLAIN_API int32_t qdm_mdl_order_real(const double* x, int32_t n, int32_t max_order,
                                         int32_t min_order, int32_t* order);
QDM_PLAIN_API int32_t qdm_mdl_order_complex(const qdm_complex* x, int32_t n, int32_t max_order,
                                            int32_t min_order, int32_t* order);
/** @} */

/* ---------------------------------------------------------------------------- */
/** @name Covariance AR power spectrum
 * 1/|A(f)|^2 of the covariance-method AR model, in dB with its peak at 0 dB
 * (the noise variance does not enter the values).
 * @param x             n samples
 * @param n             number of samples, >= 1
 * @param order         model order p, 1 <= p <= floor(2n/3) (0 passes the argument
 *                      check, as on the host face, and the covariance fit refuses it
 *                      with ::QDM_ERR_COUNT)
 * @param points        requested points, 2 <= points <= 2^30, with
 *                      qdm_spectrum_length(points) >= order + 1
 * @param fs            sampling rate in Hz, > 0
 * @param spectrum      out: qdm_spectrum_length(points) values in dB
 * @param f0            out: frequency of spectrum[0], -fs/2
 * @param df            out: frequency step, fs / qdm_spectrum_length(points)
 * @param noise_variance out: the AR model's prediction-error variance
 * @return ::QDM_OK, ::QDM_WARN_RANK_DEFICIENT; ::QDM_ERR_EMPTY_INPUT,
 *   ::QDM_ERR_COUNT (order out of range), ::QDM_ERR_SPECTRUM_SIZE,
 *   ::QDM_ERR_SAMPLE_RATE, ::QDM_ERR_SPECTRUM_TOO_SHORT, ::QDM_ERR_NULL_POINTER,
 *   ::QDM_ERR_WORK_LIMIT, ::QDM_ERR_NON_FINITE, ::QDM_ERR_NO_MEMORY,
 *   ::QDM_ERR_EXTREME_VALUE, ::QDM_ERR_NO_CONVERGENCE, ::QDM_ERR_POLYNOMIAL,
 *   ::QDM_ERR_ROOT_NAN, ::QDM_ERR_NON_FINITE_RESULT (a pole on the unit
 *   circle, as a ramp can give, puts an infinity into the spectrum).
 * @{ */
QDM_PLAIN_API int32_t qdm_covariance_psd_real(const double* x, int32_t n, int32_t order,
                                              int32_t points, double fs, double* spectrum,
                                              double* f0, double* df, double* noise_variance);
QDM_PLAIN_API int32_t qdm_covariance_psd_complex(const qdm_complex* x, int32_t n, int32_t order,
                                                 int32_t points, double fs, double* spectrum,
                                                 double* f0, double* df, double* noise_variance);
/** @} */

/* ---------------------------------------------------------------------------- */
/** @name Principal-component AR power spectrum
 * The spectrum of the principal-component AR model, and the k modes whose poles
 * lie nearest the unit circle (in order of increasing distance from it), with
 * their amplitudes fitted by least squares. Damping is not reported.
 * @param x             n samples
 * @param n             number of samples, >= 1
 * @param order         model order p, 0 <= p <= floor(2n/3)
 * @param points        requested points, 2 <= points <= 2^30, with
 *                      qdm_spectrum_length(points) >= order + 1
 * @param components    modes k, 1 <= k <= p
 * @param fs            sampling rate in Hz, > 0
 * @param real_signal   (real data only) non-zero: one mode per conjugate pair
 * @param amplitude,phase,frequency  out: room for k values each
 * @param modes         out: number of modes reported
 * @param spectrum      out: qdm_spectrum_length(points) values in dB
 * @param f0,df         out: first frequency and step, as for the covariance spectrum
 * @param fit_error     out: mean squared error of the amplitude fit
 * @return ::QDM_OK, ::QDM_WARN_RANK_DEFICIENT; ::QDM_ERR_EMPTY_INPUT,
 *   ::QDM_ERR_ORDER, ::QDM_ERR_COUNT, ::QDM_ERR_COUNT_ABOVE_ORDER,
 *   ::QDM_ERR_SPECTRUM_SIZE, ::QDM_ERR_SAMPLE_RATE, ::QDM_ERR_SPECTRUM_TOO_SHORT,
 *   ::QDM_ERR_NULL_POINTER,
 *   ::QDM_ERR_WORK_LIMIT, ::QDM_ERR_NON_FINITE, ::QDM_ERR_NO_MEMORY,
 *   ::QDM_ERR_EXTREME_VALUE, ::QDM_ERR_NO_CONVERGENCE, ::QDM_ERR_POLYNOMIAL,
 *   ::QDM_ERR_ROOT_NAN,
 *   ::QDM_ERR_NON_FINITE_RESULT.
 * @{ */
QDM_PLAIN_API int32_t qdm_pcar_psd_real(const double* x, int32_t n, int32_t order, int32_t points,
                                        int32_t components, double fs, int32_t real_signal,
                                        double* amplitude, double* phase, double* frequency,
                                        int32_t* modes, double* spectrum, double* f0, double* df,
                                        double* fit_error);
QDM_PLAIN_API int32_t qdm_pcar_psd_complex(const qdm_complex* x, int32_t n, int32_t order,
                                           int32_t points, int32_t components, double fs,
                                           double* amplitude, double* phase, double* frequency,
                                           int32_t* modes, double* spectrum, double* f0, double* df,
                                           double* fit_error);
/** @} */

#ifdef __cplusplus
}
#endif

#endif /* QDM_API_H */
