/* qdm status codes: the one table of every code either face of the library can
 * return, with its name and its text. qdm_status_text() and the reference
 * documentation are both made from it.
 *
 * 0 is success. 20001 is a warning (the plain face only: the results are
 * complete and valid); 20002 the error bars' warning (NaN errors for the
 * modes whose bound is singular, every other value complete); 20003 a batch's
 * (some records failed, each with its own status). Codes from
 * -42401 down to -42428 are argument errors, -424xx in the host's numbering;
 * the plain face writes nothing when it returns one. -30001 is the plain
 * face's screen of its own results: a fit ran, but a number it was about to
 * hand back is NaN or infinite. The other negative codes are numeric and FFT
 * failures. The host face also returns -42400 - e
 * when the host's NumericArrayResize fails with its own error e. */
#ifndef QDM_STATUS_H
#define QDM_STATUS_H

/* X(name, code, text), in the order the reference lists them. */
#define QDM_STATUS_TABLE(X)                                                                    \
  X(QDM_OK, 0, "success")                                                                      \
  X(QDM_WARN_RANK_DEFICIENT, 20001,                                                            \
    "success, but a least-squares system inside the fit was rank deficient (minimum-norm "     \
    "solution used)")                                                                          \
  X(QDM_WARN_BOUND_SINGULAR, 20002,                                                            \
    "success, but the error bound is singular or badly conditioned for some modes (their "     \
    "errors are NaN)")                                                                         \
  X(QDM_WARN_RECORD_FAILED, 20003,                                                             \
    "the batch ran, but one or more of its records failed (see their statuses)")               \
  X(QDM_ERR_EMPTY_INPUT, -42401, "input array has no elements (n < 1)")                        \
  X(QDM_ERR_ORDER, -42411, "order or pencil parameter negative or above floor(2n/3)")          \
  X(QDM_ERR_COUNT, -42412,                                                                     \
    "order zero, negative or above floor(2n/3), or components, k or M zero or negative")       \
  X(QDM_ERR_COUNT_ABOVE_ORDER, -42413, "components, k or M greater than the order or L")       \
  X(QDM_ERR_MIN_ORDER, -42414, "MDL minimum order below 1")                                    \
  X(QDM_ERR_MDL_UPPER, -42415,                                                                 \
    "MDL upper order not above the minimum order, or above floor(2n/3)")                       \
  X(QDM_ERR_NO_MODES, -42416, "amplitude fit asked for no modes")                              \
  X(QDM_ERR_SPECTRUM_SIZE, -42417, "spectrum size below 2, or above 2^30")                     \
  X(QDM_ERR_SAMPLE_RATE, -42418, "sampling rate not positive")                                 \
  X(QDM_ERR_NON_FINITE, -42419, "input samples or sampling rate hold NaN or an infinity")      \
  X(QDM_ERR_WORK_LIMIT, -42420,                                                                \
    "the fit would need more work memory than the library's bound (QDM_MAX_WORK_BYTES)")       \
  X(QDM_ERR_NULL_POINTER, -42421, "a required pointer argument is null")                       \
  X(QDM_ERR_SPECTRUM_TOO_SHORT, -42422,                                                        \
    "spectrum length (the power of two at or above the points asked for) below order + 1")     \
  X(QDM_ERR_SOLVER, -42423,                                                                    \
    "solver not one of QDM_SOLVER_AUTO, QDM_SOLVER_DENSE, QDM_SOLVER_KRYLOV")                  \
  X(QDM_ERR_TOO_FEW_SAMPLES, -42424,                                                           \
    "too few samples for the modes' error bars: n must exceed the real parameters (real "      \
    "data) or twice the modes (complex data)")                                                 \
  X(QDM_ERR_MODE_VALUES, -42425,                                                               \
    "a mode value is NaN or infinite, or a mode of real data (real_signal zero) has no "       \
    "conjugate partner")                                                                       \
  X(QDM_ERR_TOLERANCE, -42426, "a stabilization tolerance (frequency or damping) is negative") \
  X(QDM_ERR_ROOM, -42427,                                                                      \
    "the caller's table has fewer rows than the call may write (qdm_stabilization_rows)")      \
  X(QDM_ERR_BATCH, -42428,                                                                     \
    "a batch's count, distance or threads is negative, or its records lie beyond the address " \
    "space")                                                                                   \
  X(QDM_ERR_NON_FINITE_RESULT, -30001,                                                         \
    "a result of the fit is NaN or infinite (a degenerate record: zero, constant, a spike, a " \
    "ramp, or values beyond the range of double)")                                             \
  X(QDM_ERR_NO_MEMORY, -20001, "working memory could not be allocated")                        \
  X(QDM_ERR_BAD_SIZE, -20003, "a size argument is below 1")                                    \
  X(QDM_ERR_NEGATIVE_DIM, -20004, "a matrix-product dimension is negative")                    \
  X(QDM_ERR_OPTION, -20061, "an option argument is out of range")                              \
  X(QDM_ERR_NO_CONVERGENCE, -20062,                                                            \
    "an iteration did not converge (LAPACK, or the polynomial root finder)")                   \
  X(QDM_ERR_KRYLOV_NO_CONVERGENCE, -20070,                                                     \
    "the Lanczos iteration of the Krylov solver did not converge within its restart bound")    \
  X(QDM_ERR_POLYNOMIAL, -20063,                                                                \
    "invalid polynomial: a NaN coefficient, or fewer than two coefficients left")              \
  X(QDM_ERR_EXTREME_VALUE, -20068,                                                             \
    "a matrix holds NaN, an infinity or a value at the extreme ends of the double range")      \
  X(QDM_ERR_ROOT_NAN, -20116, "the root iteration produced NaN (overflow)")                    \
  X(QDM_ERR_ILLEGAL_ARGUMENT, -20999,                                                          \
    "LAPACK reported an illegal argument, or a real transform length mismatch")                \
  X(QDM_ERR_FFT_LENGTH, -1, "complex transform length mismatch")

#define QDM_STATUS_ENUM_ENTRY(name, code, text) name = (code),

/** Every status code a qdm function can return (see qdm_status_text()). */
enum qdm_status { QDM_STATUS_TABLE(QDM_STATUS_ENUM_ENTRY) };

#endif /* QDM_STATUS_H */
