// Hankel matrices that are never formed: products by FFT convolution with the
// record, and their leading singular triplets by a restarted Lanczos
// bidiagonalization over those products. For long records, where the dense
// routes of numeric.h cost O(rows * cols^2) time and O(rows * cols) memory.
//
// H (rows-by-cols) is H[i][j] = x[i + cols - 1 - j]: row i holds the samples
// x[i .. i+cols-1], newest first (the forward prediction block of x). It reads
// x[0 .. rows+cols-2]. Matrices beside it are row-major, as in numeric.h.
//
// The forward-backward prediction matrix of the n samples x for order p
// (q = n - p) stacks two such blocks, 2q-by-p:
//   F  (rows 0 .. q-1)   F[i][j]  = x[i + p - 1 - j]
//   Bk (rows q .. 2q-1)  Bk[i][j] = conj(x[i + 1 + j])
// (the backward equations predict conj(x[i]) from conj(x[i+1 .. i+p])).
#pragma once

#include <cstdint>

#include "core/types.h"

// Z (rows-by-k) = H V for V cols-by-k: one FFT convolution per column, in
// O(k (rows + cols) log(rows + cols)). The same numbers as HankelProduct* to
// rounding. T is double or Complex throughout.
template <typename T>
[[nodiscard]] StatusCode HankelProductFft(const T* x, int32_t rows, int32_t cols, const T* V,
                                          int32_t k, T* Z);
// W (cols-by-k) = H^H U for U rows-by-k (the transpose for real data).
template <typename T>
[[nodiscard]] StatusCode HankelAdjointProductFft(const T* x, int32_t rows, int32_t cols, const T* U,
                                                 int32_t k, T* W);

// The `count` largest singular values of H (non-increasing) and their right
// singular vectors V (cols-by-count), and, when U is not null, their left ones
// (rows-by-count): H = U diag(S) V^H + the rest, as SvdLeading* gives them, to
// rounding, for the triplets that stand clear of the next one.
//
// Method: Golub-Kahan-Lanczos bidiagonalization with full reorthogonalization
// (classical Gram-Schmidt, a second pass when the first cancels much) and
// thick restarts that keep the best Ritz vectors, on a subspace of at most
// max(2 count + 8, count + 16) vectors, started on the smaller side of H (on
// H^H when H is wide). The Ritz triplets are tested after every step from
// `count` on; it stops as soon as every wanted triplet has
// ||H^H u - s v|| <= kKrylovTolerance s_1 (H v = s u holds by construction),
// and gives up with
// status::kKrylovNoConvergence after kKrylovMaxRestarts restarts. Memory is
// O((rows + cols) * subspace) plus the FFT buffers; nothing is shared between
// calls but the FFT plans, so it is thread-safe. x is not screened.
constexpr double kKrylovTolerance = 1e-13;
constexpr int32_t kKrylovMaxRestarts = 200;
template <typename T>
[[nodiscard]] StatusCode HankelSvdLeading(const T* x, int32_t rows, int32_t cols, int32_t count,
                                          double* S, T* U, T* V);

// The same for the forward-backward matrix [F; Bk] of x (n samples, order p,
// 1 <= p < n, 1 <= count <= min(2(n - p), p)): its products are four Hankel
// products over one DFT of x, and the triplets come from the same
// bidiagonalization, with the same tolerance, restarts and statuses. U, when
// not null, is 2(n - p)-by-count.
template <typename T>
[[nodiscard]] StatusCode ForwardBackwardSvdLeading(const T* x, int32_t n, int32_t p, int32_t count,
                                                   double* S, T* U, T* V);
