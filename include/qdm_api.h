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
 *   ::QDM_WARN_RANK_DEFICIENT (results complete and valid), or a negative error
 *   (the error bars of modes have a warning of their own).
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

/** What went wrong in the calling thread's last call, in words: for an
 *  argument error the argument, its value and the limit it broke, e.g.
 *  "order 300 is above floor(2n/3) = 206 (n = 309)", "components 5 is above
 *  order = 4", "fs -1 is not positive", "poles is null", "x[17] is not
 *  finite: nan"; for any other error qdm_status_text() of its status; after a
 *  success or the rank-deficiency warning the empty string.
 *
 *  Arguments are named as this header names them (the matrix pencil's M is
 *  `order`). "Last call" means the last call of a function that returns a
 *  status (the fits, the spectra, qdm_spectrum_layout()): each one replaces the
 *  record, so a success clears it. The helpers that return no status
 *  (qdm_version(), qdm_status_text(), qdm_spectrum_length(), qdm_output_room(),
 *  qdm_default_pencil()) and this function leave it alone. The record is per
 *  thread, as errno and sqlite3_errmsg() keep theirs: threads calling at once
 *  never see each other's messages, and the message stays available until the
 *  thread's next call however many other threads call meanwhile. A status
 *  alone stays the interface: the message adds words, never a decision.
 *
 *  @param buffer  out: the message, NUL-terminated, cut to size - 1 bytes; may
 *                 be null when size is 0
 *  @param size    bytes of room at buffer
 *  @return the length of the whole message (without the NUL), as snprintf
 *          returns it: a return >= size means the message was cut. */
QDM_PLAIN_API int32_t qdm_last_error_message(char* buffer, int32_t size);

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

/** The default pencil parameter L of the MDL search (`pencil` of
 *  qdm_mdl_order_real(), qdm_mdl_order_complex()) for n samples: the textbook
 *  floor(n/3), capped at 64, and raised to 2 where n/3 is below it; 0 for
 *  n < 3, where no value passes (L must lie above min_order >= 1 and at most at floor(2n/3)). With
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
 * Unlike the host face, which scores the record as given, this face divides
 * the record by its root mean square first, so that those fixed constants
 * (the starting score 10000 and the floor 2.2e-16) weigh the error against the
 * record's own power: the record and the record times any constant get the
 * same order.
 * @param x             n samples
 * @param n             number of samples, >= 1
 * @param pencil        pencil parameter L of the scored fits, min_order < L <=
 *                      floor(2n/3); the largest order tried is min(n - L', L').
 *                      qdm_default_mdl_upper() gives the default
 * @param min_order     smallest order tried, >= 1
 * @param order         in/out: the chosen order. Left as the caller set it when
 *                      no order scores below 10000 (initialise it, e.g. to 0).
 * @return ::QDM_OK, ::QDM_WARN_RANK_DEFICIENT; ::QDM_ERR_EMPTY_INPUT,
 *   ::QDM_ERR_MIN_ORDER, ::QDM_ERR_MDL_UPPER, ::QDM_ERR_NULL_POINTER,
 *   ::QDM_ERR_WORK_LIMIT, ::QDM_ERR_NON_FINITE, ::QDM_ERR_NO_MEMORY,
 *   ::QDM_ERR_EXTREME_VALUE, ::QDM_ERR_NO_CONVERGENCE,
 *   ::QDM_ERR_ILLEGAL_ARGUMENT. On an error *order is 0.
 * @{ */
QDM_PLAIN_API int32_t qdm_mdl_order_real(const double* x, int32_t n, int32_t pencil,
                                         int32_t min_order, int32_t* order);
QDM_PLAIN_API int32_t qdm_mdl_order_complex(const qdm_complex* x, int32_t n, int32_t pencil,
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

/* ---------------------------------------------------------------------------- */
/** @name Spectra laid out for their readers
 * The frequency axis written out, a one-sided layout for real data, and an AR
 * model's power spectral density beside its normalised dB. A two-sided
 * spectrum of N values (N a power of two) runs from -fs/2 in steps of fs/N, as
 * the *_psd functions above give it; the one-sided layout keeps its N/2 + 1
 * values from 0 to fs/2 (the spectrum of real data is even), with a density
 * doubled at every bin but 0 and fs/2, so that it sums (times fs/N) to the
 * same power. (The fits above return their modes unsorted, in the order of
 * their poles, or for PCAR nearest the unit circle first; the Python package
 * and the tool sort them by frequency.)
 *
 * qdm_spectrum_layout: lays out a two-sided spectrum in place.
 * @param spectrum   in/out: `length` values; one-sided: the first N/2 + 1 are set
 * @param psd        in/out: a density on the same grid, or null
 * @param length     N, even and >= 2
 * @param fs         sampling rate in Hz, > 0
 * @param onesided   non-zero: 0 to fs/2; zero: -fs/2 to fs/2 - fs/N as given
 * @param frequency  out: room for `length` values, the frequency of each value
 * @param count      out: values laid out, N/2 + 1 or N
 *
 * qdm_ar_psd_real/_complex: the spectrum of the AR model with coefficients
 * a[0..order] (a[0] = 1, as the covariance and PCAR fits give them) and
 * prediction-error variance sigma^2: the density sigma^2 / fs / |A(e^{j 2 pi f / fs})|^2
 * in units of x^2/Hz (two-sided), and 10 log10 of the same shape with its peak
 * at 0 dB, bit for bit the values qdm_covariance_psd gives for that model.
 * @param a          order + 1 coefficients
 * @param order      p >= 0, with qdm_spectrum_length(points) >= p + 1
 * @param noise_variance sigma^2 >= 0 (0 with a null psd: dB only)
 * @param points     requested points, 2 <= points <= 2^30; N = qdm_spectrum_length(points)
 * @param fs         sampling rate in Hz, > 0
 * @param onesided   non-zero: the one-sided layout (real coefficients only:
 *                   ::QDM_ERR_OPTION for the complex twin)
 * @param frequency,spectrum  out: room for N values each
 * @param psd        out: room for N values, or null for dB only
 * @param count      out: values written, N/2 + 1 (one-sided) or N
 * @return ::QDM_OK; ::QDM_ERR_NULL_POINTER, ::QDM_ERR_SPECTRUM_SIZE,
 *   ::QDM_ERR_ORDER, ::QDM_ERR_SPECTRUM_TOO_SHORT, ::QDM_ERR_SAMPLE_RATE,
 *   ::QDM_ERR_NON_FINITE (fs, sigma^2 or a coefficient), ::QDM_ERR_OPTION
 *   (sigma^2 negative, one-sided complex), ::QDM_ERR_WORK_LIMIT,
 *   ::QDM_ERR_NO_MEMORY, ::QDM_ERR_NON_FINITE_RESULT (a pole on the unit
 *   circle); on an error the outputs are zeroed and count is 0. The
 *   pointers are checked after every other argument, so a call with null
 *   outputs checks the sizes alone (::QDM_ERR_NULL_POINTER when they pass)
 *   before room for N values is set aside.
 * @{ */
QDM_PLAIN_API int32_t qdm_spectrum_layout(double* spectrum, double* psd, int32_t length, double fs,
                                          int32_t onesided, double* frequency, int32_t* count);
QDM_PLAIN_API int32_t qdm_ar_psd_real(const double* a, int32_t order, double noise_variance,
                                      int32_t points, double fs, int32_t onesided,
                                      double* frequency, double* spectrum, double* psd,
                                      int32_t* count);
QDM_PLAIN_API int32_t qdm_ar_psd_complex(const qdm_complex* a, int32_t order, double noise_variance,
                                         int32_t points, double fs, int32_t onesided,
                                         double* frequency, double* spectrum, double* psd,
                                         int32_t* count);
/** @} */

/* ---------------------------------------------------------------------------- */
/** @name Error bars of modes
 * The standard error of every parameter of a set of modes (a fit's, or the
 * caller's own): the square root of the diagonal of the Cramer-Rao bound of
 * the mode model, evaluated at the modes, with the noise variance estimated
 * from their residual against the record.
 *
 * Complex data: x[t] = sum_i A_i z_i^t, A_i = a_i e^{j phi_i},
 * z_i = exp(alpha_i + j 2 pi f_i / fs), in complex white noise, four real
 * parameters per mode. The noise variance (per complex sample, E|e|^2) is
 * s2 = ||x - model||^2 / (n - 2M): 2n real observations, 4M parameters. The
 * covariance is (s2 / 2) [Re(D^H D)]^-1, D the n-by-4M Jacobian.
 *
 * Real data: with `real_signal` non-zero each mode (the member with
 * arg(z) in [0, pi) of a conjugate pair, amplitude not doubled, as the fits
 * report them) is the real term 2 a e^{alpha t} cos(2 pi f t / fs + phi) with
 * four parameters; a mode at 0 Hz (or fs/2) is the single real term
 * a cos(phi) e^{alpha t} with two, amplitude and damping, and its phase and
 * frequency errors are 0 (the model fixes them). With `real_signal` zero the
 * modes are every pole of a real record: each mode off 0 and fs/2 must have
 * a conjugate partner (frequency opposite and damping equal to within 1e-7
 * of fs and of 1 + |damping|), the pair is the cosine of its member with
 * the positive frequency, and both members get its errors. The noise is
 * real: s2 = ||x - model||^2 / (n - P), P the real parameters, and the
 * covariance is s2 (D^T D)^-1.
 *
 * The bound comes from the singular values of D with its columns scaled to
 * unit norm. Directions whose singular value is below 1e-7 of the largest
 * (the scaled Fisher matrix's reciprocal condition below 1e-14) count as
 * undetermined; a mode any of whose parameters weighs more than 1e-10 in
 * them (as with a zero amplitude or two equal poles) gets NaN for all four
 * errors, and the call returns the
 * warning ::QDM_WARN_BOUND_SINGULAR: the one success of this face that
 * carries NaN, and only there. The other modes' errors are complete.
 *
 * The bound describes the error of an efficient estimate at high SNR; below
 * the threshold SNR of a fit, or for a biased fit (Prony's method with as many
 * poles as modes in noise), the actual error can be far larger.
 *
 * @param x             n samples
 * @param n             number of samples: above the real parameters (real
 *                      data) or above 2 M (complex data)
 * @param fs            sampling rate of the frequencies, > 0
 * @param real_signal   (real data only) non-zero: the modes are one per
 *                      conjugate pair, as the fits report them with it
 * @param modes         M, the number of modes, >= 1
 * @param amplitude,phase,damping,frequency  M values each, as the fits report
 *                      them: |A|, arg A in radians, ln|z| per sample, Hz
 * @param amplitude_se,phase_se,damping_se,frequency_se  out: M values each,
 *                      in the units of the modes (x, radians, per sample, Hz)
 * @param noise_variance out: s2 above
 * @return ::QDM_OK, ::QDM_WARN_BOUND_SINGULAR; ::QDM_ERR_EMPTY_INPUT (n < 1),
 *   ::QDM_ERR_NO_MODES (M < 1), ::QDM_ERR_SAMPLE_RATE, ::QDM_ERR_NULL_POINTER,
 *   ::QDM_ERR_WORK_LIMIT, ::QDM_ERR_NON_FINITE (a sample or fs),
 *   ::QDM_ERR_MODE_VALUES (a NaN or infinite mode value, or with
 *   real_signal zero a mode without its partner), ::QDM_ERR_TOO_FEW_SAMPLES,
 *   ::QDM_ERR_NO_MEMORY, ::QDM_ERR_EXTREME_VALUE (the model or its Jacobian
 *   overflows, as a growing mode over a long record can),
 *   ::QDM_ERR_NO_CONVERGENCE, ::QDM_ERR_ILLEGAL_ARGUMENT,
 *   ::QDM_ERR_NON_FINITE_RESULT (an error or the noise variance beyond the
 *   double range).
 * @{ */
QDM_PLAIN_API int32_t qdm_mode_errors_real(const double* x, int32_t n, double fs,
                                           int32_t real_signal, int32_t modes,
                                           const double* amplitude, const double* phase,
                                           const double* damping, const double* frequency,
                                           double* amplitude_se, double* phase_se,
                                           double* damping_se, double* frequency_se,
                                           double* noise_variance);
QDM_PLAIN_API int32_t qdm_mode_errors_complex(const qdm_complex* x, int32_t n, double fs,
                                              int32_t modes, const double* amplitude,
                                              const double* phase, const double* damping,
                                              const double* frequency, double* amplitude_se,
                                              double* phase_se, double* damping_se,
                                              double* frequency_se, double* noise_variance);
/** @} */

/* ---------------------------------------------------------------------------- */
/** @name Stabilization diagram
 * The modes of matrix-pencil fits of every order m from `min_order` to
 * `max_order`, all from one decomposition: the reduced pencil of `max_order`
 * modes, whose leading m x m block is the m-mode pencil (the poles of order m
 * are those of qdm_matrix_pencil_*() with order m and the same pencil, to
 * rounding). Each order's amplitudes are fitted to the record by least
 * squares. A pole of order m is flagged against the poles of order m - 1
 * (for m = min_order > 1 that order is fitted too, for the comparison only):
 *   - ::QDM_STABLE_FREQUENCY when some pole below has |f - f'| <=
 *     freq_tol * max(|f|, fs / n),
 *   - ::QDM_STABLE_DAMPING when some pole below has |d - d'| <=
 *     damping_tol * max(|d|, 1 / n),
 *   - ::QDM_STABLE when one pole below matches it in both,
 * f and d the order-m pole's own frequency and damping. The floors fs/n
 * (the record's frequency resolution) and 1/n (damping of one e-fold over the
 * record) keep the tolerances meaningful near 0 Hz and near no damping.
 * Order 1 (when min_order is 1) has nothing below it and no flags. Frequency
 * is compared as a signed value: complex poles near +fs/2 and -fs/2 do not
 * match across the wrap.
 *
 * The table is flat, one row per pole, order by order from min_order up,
 * each order's poles in the eigensolver's order (unsorted); column k of row i
 * is column_k[i]. Order m has m rows, or with real_signal on real data one
 * per conjugate pair (the poles with arg(z) in [0, pi), as the pencil reports
 * them), so qdm_stabilization_rows(min_order, max_order) =
 * (max_order - min_order + 1)(min_order + max_order) / 2 rows always suffice.
 *
 * The call also runs qdm_mdl_order_*() on the same record with the same
 * orders (max_order as its upper order and pencil parameter; its search
 * stops at max_order - 1 when max_order = n/2) and returns its choice.
 *
 * @param x             n samples
 * @param n             number of samples, >= 1
 * @param pencil        pencil parameter L, 1 <= L <= floor(2n/3)
 * @param min_order     lowest order listed, >= 1
 * @param max_order     highest order listed, min_order < max_order <= min(L, n - L)
 * @param fs            sampling rate in Hz, > 0
 * @param real_signal   (real data only) non-zero: one mode per conjugate pair
 * @param freq_tol      relative frequency tolerance, >= 0 (e.g. 0.01)
 * @param damping_tol   relative damping tolerance, >= 0 (e.g. 0.05)
 * @param room          rows set aside in each column, >= qdm_stabilization_rows()
 * @param order         out: room values, each row's model order m
 * @param frequency     out: room values, Hz
 * @param damping       out: room values, ln|z| per sample
 * @param amplitude     out: room values, |A| (units of x)
 * @param flags         out: room values, ::qdm_stability bits
 * @param rows          out: rows written
 * @param mdl_order     out: the MDL order of the record, 0 when no order
 *                      scores below 10000
 * @return ::QDM_OK, ::QDM_WARN_RANK_DEFICIENT; ::QDM_ERR_EMPTY_INPUT,
 *   ::QDM_ERR_ORDER (pencil), ::QDM_ERR_MIN_ORDER, ::QDM_ERR_MDL_UPPER
 *   (max_order), ::QDM_ERR_SAMPLE_RATE, ::QDM_ERR_TOLERANCE, ::QDM_ERR_ROOM,
 *   ::QDM_ERR_NULL_POINTER, ::QDM_ERR_WORK_LIMIT, ::QDM_ERR_NON_FINITE (a
 *   sample, fs or a tolerance), ::QDM_ERR_NO_MEMORY, ::QDM_ERR_EXTREME_VALUE,
 *   ::QDM_ERR_NO_CONVERGENCE, ::QDM_ERR_ILLEGAL_ARGUMENT,
 *   ::QDM_ERR_NON_FINITE_RESULT (a pole at 0, as a spike gives, has damping
 *   -inf). On an error the columns are zeroed over `room` rows (none when an
 *   argument check refused the call), and rows and mdl_order are 0.
 * @{ */
/** The flags bits of a stabilization row. */
typedef enum qdm_stability {
  QDM_STABLE_FREQUENCY = 1, /**< a pole of the order below within freq_tol */
  QDM_STABLE_DAMPING = 2,   /**< a pole of the order below within damping_tol */
  QDM_STABLE = 4            /**< one pole of the order below within both */
} qdm_stability;

/** Rows a table for orders min_order..max_order needs:
 *  (max_order - min_order + 1)(min_order + max_order) / 2, or 0 when
 *  min_order < 1 or max_order < min_order. */
QDM_PLAIN_API int64_t qdm_stabilization_rows(int32_t min_order, int32_t max_order);
QDM_PLAIN_API int32_t qdm_stabilization_real(const double* x, int32_t n, int32_t pencil,
                                             int32_t min_order, int32_t max_order, double fs,
                                             int32_t real_signal, double freq_tol,
                                             double damping_tol, int64_t room, int32_t* order,
                                             double* frequency, double* damping, double* amplitude,
                                             int32_t* flags, int64_t* rows, int32_t* mdl_order);
QDM_PLAIN_API int32_t qdm_stabilization_complex(const qdm_complex* x, int32_t n, int32_t pencil,
                                                int32_t min_order, int32_t max_order, double fs,
                                                double freq_tol, double damping_tol, int64_t room,
                                                int32_t* order, double* frequency, double* damping,
                                                double* amplitude, int32_t* flags, int64_t* rows,
                                                int32_t* mdl_order);
/** @} */

/* ---------------------------------------------------------------------------- */
/** @name Batches: one fit over many records
 * Each fit above has a batch twin, `qdm_<fit>_batch_real` /
 * `qdm_<fit>_batch_complex`, that fits `count` records of n samples each on
 * up to `threads` threads. Its arguments are the single-record function's,
 * with two added after n and two at the end:
 * @param count     records, >= 0
 * @param distance  elements (doubles, or ::qdm_complex pairs) from the first
 *                  sample of one record to the first of the next, >= 0: record
 *                  i is x[i distance .. i distance + n - 1]. distance = n for
 *                  the rows of a C-contiguous count-by-n array; a larger
 *                  distance skips padding or other columns; a smaller one
 *                  fits overlapping windows of one long record
 *                  (distance = hop), and 0 the same record count times.
 * @param status    out: count statuses, status[i] that of record i
 * @param threads   threads to run on, >= 0; 0: one per processor. The
 *                  calling thread is one of them; fewer run when the system
 *                  refuses one, or when there are fewer records.
 * Every output of the single function becomes an array of count rows, packed:
 * record i's values of an output of R values per record start at
 * out + i R. R is the room the single function asks for: the order p + 1
 * coefficients and p poles or roots; `order` values for each mode array of
 * Prony and the pencil (M); `components` for the PCAR spectrum's modes;
 * qdm_spectrum_length(points) for a spectrum; 1 for each scalar (a mode
 * count, mse, noise_variance, f0, df, fit_error, the MDL order).
 * The pencil and PCAR batches take `solver` as their *_solver functions do.
 *
 * Record i's results and status[i] are those of the single-record function
 * called on record i, bit for bit, whatever the thread count: each record is
 * fitted by that function on one thread, with the library's BLAS on one
 * thread. What concerns every record is checked once, before any record is
 * read: the layout (::QDM_ERR_BATCH for a negative count, distance or
 * threads, or records beyond the address space; ::QDM_ERR_NULL_POINTER for a
 * null status), then the single function's argument checks (sizes, pointers,
 * the work bound, fs). Such an error is returned by the batch call and
 * nothing is written. Otherwise every record is fitted, and what belongs to
 * one record (a NaN sample, a degenerate record, a failed solve, no memory)
 * is that record's status, its outputs zeroed as the single function zeroes
 * them, while every other record completes. The call then returns ::QDM_OK
 * when no status is an error (warnings included), or
 * ::QDM_WARN_RECORD_FAILED when some record failed; qdm_last_error_message()
 * then names the first, as "record 17: x[3] is not finite: nan".
 *
 * Why this shape. A caller's records are most often rows of one array: a
 * matrix of pulses, a voxel grid, a NumPy array whose last axis is time. So,
 * as in FFTW's advanced interface (howmany, idist) and LAPACK's strided
 * batches (batch count, stride between matrices, one info per problem), the
 * records are one pointer, a count and a distance, rather than an array of
 * pointers: nothing to build per record, and any row-major view of a larger
 * array is described without a copy. The samples of a record stay contiguous,
 * as every fit reads them; a record with a stride of its own (a column of a
 * row-major array) is copied by the caller, which NumPy's `ascontiguousarray`
 * does at memory speed. Outputs are the caller's fresh arrays, so they are
 * packed and need no distances of their own. One status per record, as
 * LAPACK's batched `info` arrays, because a batch of measured records holds
 * the odd bad one, and one bad record must not cost the others their fits.
 * The threads are the library's so that every face (C, Python, the tool)
 * runs the same scheduler: records are handed out one at a time from a
 * shared counter, so uneven records even out.
 * @{ */
QDM_PLAIN_API int32_t qdm_covariance_batch_real(const double* x, int32_t n, int64_t count,
                                                int64_t distance, int32_t order,
                                                double* coefficients, qdm_complex* poles,
                                                double* noise_variance, int32_t* status,
                                                int32_t threads);
QDM_PLAIN_API int32_t qdm_covariance_batch_complex(const qdm_complex* x, int32_t n, int64_t count,
                                                   int64_t distance, int32_t order,
                                                   qdm_complex* coefficients, qdm_complex* poles,
                                                   double* noise_variance, int32_t* status,
                                                   int32_t threads);
QDM_PLAIN_API int32_t qdm_pcar_batch_real(const double* x, int32_t n, int64_t count,
                                          int64_t distance, int32_t order, int32_t components,
                                          int32_t solver, double* coefficients, qdm_complex* roots,
                                          int32_t* status, int32_t threads);
QDM_PLAIN_API int32_t qdm_pcar_batch_complex(const qdm_complex* x, int32_t n, int64_t count,
                                             int64_t distance, int32_t order, int32_t components,
                                             int32_t solver, qdm_complex* coefficients,
                                             qdm_complex* roots, int32_t* status, int32_t threads);
QDM_PLAIN_API int32_t qdm_prony_batch_real(const double* x, int32_t n, int64_t count,
                                           int64_t distance, int32_t order, double fs,
                                           int32_t real_signal, double* amplitude, double* phase,
                                           double* damping, double* frequency, int32_t* modes,
                                           int32_t* status, int32_t threads);
QDM_PLAIN_API int32_t qdm_prony_batch_complex(const qdm_complex* x, int32_t n, int64_t count,
                                              int64_t distance, int32_t order, double fs,
                                              double* amplitude, double* phase, double* damping,
                                              double* frequency, int32_t* modes, int32_t* status,
                                              int32_t threads);
QDM_PLAIN_API int32_t qdm_matrix_pencil_batch_real(const double* x, int32_t n, int64_t count,
                                                   int64_t distance, int32_t pencil, int32_t order,
                                                   double fs, int32_t real_signal, int32_t solver,
                                                   double* amplitude, double* phase,
                                                   double* damping, double* frequency,
                                                   int32_t* modes, double* mse, int32_t* status,
                                                   int32_t threads);
QDM_PLAIN_API int32_t qdm_matrix_pencil_batch_complex(
    const qdm_complex* x, int32_t n, int64_t count, int64_t distance, int32_t pencil, int32_t order,
    double fs, int32_t solver, double* amplitude, double* phase, double* damping, double* frequency,
    int32_t* modes, double* mse, int32_t* status, int32_t threads);
QDM_PLAIN_API int32_t qdm_mdl_order_batch_real(const double* x, int32_t n, int64_t count,
                                               int64_t distance, int32_t pencil, int32_t min_order,
                                               int32_t* order, int32_t* status, int32_t threads);
QDM_PLAIN_API int32_t qdm_mdl_order_batch_complex(const qdm_complex* x, int32_t n, int64_t count,
                                                  int64_t distance, int32_t pencil,
                                                  int32_t min_order, int32_t* order,
                                                  int32_t* status, int32_t threads);
QDM_PLAIN_API int32_t qdm_covariance_psd_batch_real(const double* x, int32_t n, int64_t count,
                                                    int64_t distance, int32_t order, int32_t points,
                                                    double fs, double* spectrum, double* f0,
                                                    double* df, double* noise_variance,
                                                    int32_t* status, int32_t threads);
QDM_PLAIN_API int32_t qdm_covariance_psd_batch_complex(const qdm_complex* x, int32_t n,
                                                       int64_t count, int64_t distance,
                                                       int32_t order, int32_t points, double fs,
                                                       double* spectrum, double* f0, double* df,
                                                       double* noise_variance, int32_t* status,
                                                       int32_t threads);
QDM_PLAIN_API int32_t qdm_pcar_psd_batch_real(const double* x, int32_t n, int64_t count,
                                              int64_t distance, int32_t order, int32_t points,
                                              int32_t components, double fs, int32_t real_signal,
                                              double* amplitude, double* phase, double* frequency,
                                              int32_t* modes, double* spectrum, double* f0,
                                              double* df, double* fit_error, int32_t* status,
                                              int32_t threads);
QDM_PLAIN_API int32_t qdm_pcar_psd_batch_complex(const qdm_complex* x, int32_t n, int64_t count,
                                                 int64_t distance, int32_t order, int32_t points,
                                                 int32_t components, double fs, double* amplitude,
                                                 double* phase, double* frequency, int32_t* modes,
                                                 double* spectrum, double* f0, double* df,
                                                 double* fit_error, int32_t* status,
                                                 int32_t threads);

/** The error bars of a batch of fits. `room` (>= 1, else ::QDM_ERR_NO_MODES)
 *  is the row length of the eight mode arrays, and `modes` holds count mode
 *  counts: record i's modes are the first modes[i] values of row i, as a
 *  Prony or pencil batch with order = room leaves them. A count above room
 *  is that record's ::QDM_ERR_ROOM; a count of 0 (a record whose fit failed)
 *  its ::QDM_ERR_NO_MODES, as the single function gives it. */
QDM_PLAIN_API int32_t qdm_mode_errors_batch_real(
    const double* x, int32_t n, int64_t count, int64_t distance, double fs, int32_t real_signal,
    int32_t room, const int32_t* modes, const double* amplitude, const double* phase,
    const double* damping, const double* frequency, double* amplitude_se, double* phase_se,
    double* damping_se, double* frequency_se, double* noise_variance, int32_t* status,
    int32_t threads);
QDM_PLAIN_API int32_t qdm_mode_errors_batch_complex(
    const qdm_complex* x, int32_t n, int64_t count, int64_t distance, double fs, int32_t room,
    const int32_t* modes, const double* amplitude, const double* phase, const double* damping,
    const double* frequency, double* amplitude_se, double* phase_se, double* damping_se,
    double* frequency_se, double* noise_variance, int32_t* status, int32_t threads);
/** @} */

#ifdef __cplusplus
}
#endif

#endif /* QDM_API_H */
