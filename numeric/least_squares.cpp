// Least-squares solves and pseudo-inverses. The real solve runs DGELSD except for
// very wide systems, which go through the SVD pseudo-inverse solve. The
// pseudo-inverse solves apply pinv(A) = V diag(1/S) U^H over the singular values
// above a threshold without forming it, tall systems through a QR factorization
// first; the pseudo-inverses are formed from the economy SVD A = U diag(S) V^H.

#include <algorithm>
#include <cmath>
#include <cstring>

#include "core/call_record.h"
#include "numeric/lapack_boundary.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

constexpr double kEpsilon = 2.220446049250313e-16;

// Beyond these widths a real system goes to the SVD pseudo-inverse instead of
// DGELSD: one row and more than 739 columns, or more than 66m + 670 + (m-3)(m-2)
// columns for m >= 2 rows.
bool UsesPinvPath(int32_t m, int32_t n) {
  if (m == 1) return n > 739;
  const int64_t mm = m;
  return n > m && n > 66 * mm + 670 + (mm - 3) * (mm - 2);
}

// Column i of V (n-by-k) scaled by 1/S[i] when S[i] > threshold, else zeroed.
// Returns the number of columns kept. A complex element's parts are both
// multiplied by the same real factor.
template <typename T>
int32_t InvertKeptColumns(T* V, int32_t n, int32_t k, const double* S, double threshold) {
  int32_t kept = 0;
  for (int32_t i = 0; i < k; ++i) {
    const bool keep = S[i] > threshold;
    const double factor = keep ? 1.0 / S[i] : 0.0;
    for (int32_t r = 0; r < n; ++r) {
      T& v = V[int64_t{r} * k + i];
      v = keep ? v * factor : T(0.0);
    }
    kept += keep ? 1 : 0;
  }
  return kept;
}

// Storage of the economy factors: the real twin keeps U, S and V in one block of
// (m + n + 1)k values; the complex twin keeps U and V in one block of (m + n)k
// elements and S in a real block of its own.
template <typename T>
struct Factors {
  WorkArray<T> uv;
  WorkArray<double> s_block;
  T* U = nullptr;
  T* V = nullptr;
  double* S = nullptr;

  bool Allocate(int32_t m, int32_t n, int32_t k) {
    const int64_t mk = int64_t{m} * k;
    const int64_t nk = int64_t{n} * k;
    if constexpr (kIsComplex<T>) {
      uv = AllocWork<T>(static_cast<size_t>(mk + nk));
      if (!uv) return false;
      s_block = AllocWork<double>(static_cast<size_t>(k));
      if (!s_block) return false;
      U = uv.get();
      V = U + mk;
      S = s_block.get();
    } else {
      uv = AllocWork<T>(static_cast<size_t>(mk + k + nk));
      if (!uv) return false;
      U = uv.get();
      S = U + mk;
      V = S + k;
    }
    return true;
  }
};

// P (n-by-m) = V U^H from factors whose V columns are already scaled; U is
// overwritten by its adjoint on the way.
template <typename T>
StatusCode FormPinv(Factors<T>& f, int32_t m, int32_t n, int32_t k, T* P) {
  const StatusCode st = Adjoint(f.U, m, k, static_cast<T*>(nullptr));
  if (st != status::kOk) return st;
  return MatMul(f.V, f.U, n, k, m, P);
}

// A system with at least this many rows per column is solved through a QR
// factorization first: the SVD is then taken of the small n-by-n R only.
bool IsTall(int32_t m, int32_t n) { return int64_t{m} >= 2 * int64_t{n}; }

// Rows of A per QR step of a tall solve: about 512 KiB of W = [R; block] for
// N = n + nrhs columns, and at least 4N rows so that R's own rows stay a small
// part of each step; the whole of A when it is no taller than that.
template <typename T>
int32_t BlockRows(int32_t m, int32_t N) {
  const int64_t fit = (int64_t{512} * 1024 / static_cast<int64_t>(sizeof(T))) / N - N;
  const int64_t c = std::max<int64_t>(fit, 4 * int64_t{N});
  return static_cast<int32_t>(std::min<int64_t>(c, m));
}

// One step of the fold: W (ld) holds R, `top` rows (none on the first step),
// above h - top new rows, and is factored in place. The twins differ on
// purpose: the real one runs the compact-WY kernels, and past the first step
// the triangular-pentagonal one, which skips R's zeros; the complex ones run
// slower than the unblocked geqrf on a few dozen columns, so the complex twin
// clears R's lower part and factors the stacked block with geqrf.
StatusCode FoldStep(double* W, int32_t ld, int32_t top, int32_t h, int32_t N, double*) {
  if (top == 0) return lapack::Geqrt(h, N, W, ld);
  return lapack::Tpqrt(h - top, N, W, ld, W + top, ld);
}
StatusCode FoldStep(Complex* W, int32_t ld, int32_t top, int32_t h, int32_t N, Complex* tau) {
  for (int32_t j = 0; j < top; ++j) {
    for (int32_t i = j + 1; i < top; ++i) W[int64_t{j} * ld + i] = Complex(0.0, 0.0);
  }
  return lapack::Geqrf(h, N, W, ld, tau);
}

// Where a solve takes its system from. Fill(W, ld, top, r0, h) writes rows
// r0 .. r0+h-1 of [A B] into rows top .. top+h-1 of the column-major W;
// NonFiniteA(m) and NonFiniteB(m) screen A's and B's m rows; kDense says
// whether A and B exist as arrays (a Hankel system is only ever folded).
template <typename T>
struct RowMajorRows {  // A (m-by-n) and B (m-by-nrhs), both row-major
  static constexpr bool kDense = true;
  const T* A;
  const T* B;
  int32_t n, nrhs;
  bool NonFiniteA(int32_t m) const { return HasNonFinite(A, int64_t{m} * n) != 0; }
  bool NonFiniteB(int32_t m) const { return HasNonFinite(B, int64_t{m} * nrhs) != 0; }
  // A tile of the correction step: rows i0 .. i0+h-1 of A, column-major with
  // `rows` rows a column, and of the first right-hand side; zeros up to `rows`.
  int64_t TileSpan(int32_t rows) const { return int64_t{rows} * n; }
  int64_t ColumnBase(int32_t) const { return 0; }
  int64_t ColumnStride(int32_t rows) const { return rows; }
  void LoadTile(int32_t i0, int32_t h, int32_t rows, double* re, double* im, double* bre,
                double* bim) const {
    for (int32_t i = 0; i < rows; ++i) {
      const bool in = i < h;
      const T* a = A + int64_t{i0 + (in ? i : 0)} * n;
      for (int32_t j = 0; j < n; ++j) {
        re[int64_t{j} * rows + i] = in ? a[j].real() : 0.0;
        im[int64_t{j} * rows + i] = in ? a[j].imag() : 0.0;
      }
      const T b = in ? B[int64_t{i0 + i} * nrhs] : T(0.0);
      bre[i] = b.real();
      bim[i] = b.imag();
    }
  }
  // Tiles of kTile rows: a tile of A is read from cache once per column, and
  // each column of W is written in runs of kTile.
  void operator()(T* W, int32_t ld, int32_t top, int32_t r0, int32_t h) const {
    constexpr int32_t kTile = 16;
    for (int32_t i0 = 0; i0 < h; i0 += kTile) {
      const int32_t i1 = std::min(h, i0 + kTile);
      for (int32_t j = 0; j < n; ++j) {
        T* col = W + int64_t{j} * ld + top;
        for (int32_t i = i0; i < i1; ++i) col[i] = A[int64_t{r0 + i} * n + j];
      }
      for (int32_t j = 0; j < nrhs; ++j) {
        T* col = W + int64_t{n + j} * ld + top;
        for (int32_t i = i0; i < i1; ++i) col[i] = B[int64_t{r0 + i} * nrhs + j];
      }
    }
  }
};
// The forward prediction block of x, A[i][j] = x[i + n - 1 - j], each column a
// run of x; with `rhs`, also b[i] = x[i + n], one more run.
template <typename T>
struct HankelRows {
  static constexpr bool kDense = false;
  const T* x;
  int32_t n;
  bool rhs;
  bool NonFiniteA(int32_t m) const { return HasNonFinite(x, int64_t{m} + n - 1) != 0; }
  bool NonFiniteB(int32_t m) const { return HasNonFinite(x + n, m) != 0; }
  // A tile of the correction step holds the samples of rows i0 .. i0+h-1:
  // column j is the run from sample n-1-j of the tile on.
  int64_t TileSpan(int32_t rows) const { return int64_t{rows} + n - 1; }
  int64_t ColumnBase(int32_t) const { return n - 1; }
  int64_t ColumnStride(int32_t) const { return -1; }
  void LoadTile(int32_t i0, int32_t h, int32_t rows, double* re, double* im, double* bre,
                double* bim) const {
    const int64_t used = int64_t{h} + n - 1;
    for (int64_t k = 0; k < int64_t{rows} + n - 1; ++k) {
      const T a = k < used ? x[i0 + k] : T(0.0);
      re[k] = a.real();
      im[k] = a.imag();
    }
    for (int32_t i = 0; i < rows; ++i) {
      const T b = i < h ? x[int64_t{i0} + i + n] : T(0.0);
      bre[i] = b.real();
      bim[i] = b.imag();
    }
  }
  void operator()(T* W, int32_t ld, int32_t top, int32_t r0, int32_t h) const {
    const size_t bytes = static_cast<size_t>(h) * sizeof(T);
    for (int32_t j = 0; j < n; ++j) {
      std::memcpy(static_cast<void*>(W + int64_t{j} * ld + top), x + int64_t{r0} + n - 1 - j,
                  bytes);
    }
    if (rhs) std::memcpy(static_cast<void*>(W + int64_t{n} * ld + top), x + int64_t{r0} + n, bytes);
  }
};

// The tall A (m-by-n, m >= 2n) and B (m-by-nrhs, nrhs >= 0) folded into R
// (n-by-n, upper triangular with zeros below) and y = (Q^H B)[0:n]
// (n-by-nrhs), both column-major with leading dimension n, where A = QR. B
// rides along as extra columns: the QR of [A B] has R in its leading n columns
// and Q^H B in the first n rows of the others, so no reflector is applied a
// second time. Row blocks are folded in one at a time: W holds [R; next block]
// column-major (ld = N + c) and is factored in place. A block of c rows keeps
// W in cache, and no column-major copy of the whole of A is made. Many
// right-hand sides make this costly (they are factored too); the solves here
// have one.
template <typename T, typename Rows>
StatusCode FoldQr(const Rows& rows, int32_t m, int32_t n, int32_t nrhs, T* R, T* y) {
  const int32_t N = n + nrhs;
  const int32_t c = BlockRows<T>(m, N);
  const int32_t ld = N + c;
  const int64_t w_count = int64_t{ld} * N;
  WorkArray<T> block = AllocWorkUninit<T>(static_cast<size_t>(w_count + N));
  if (!block) return status::kNoMemory;
  T* W = block.get();
  T* tau = W + w_count;
  for (int32_t r0 = 0; r0 < m; r0 += c) {
    // From the second step on, R's N rows sit above the block (c >= N).
    const int32_t top = r0 == 0 ? 0 : N;
    const int32_t h = std::min(c, m - r0);
    rows(W, ld, top, r0, h);
    const StatusCode st = FoldStep(W, ld, top, top + h, N, tau);
    if (st != status::kOk) return st;
  }
  for (int32_t j = 0; j < n; ++j) {
    for (int32_t i = 0; i < n; ++i) R[int64_t{j} * n + i] = i > j ? T(0.0) : W[int64_t{j} * ld + i];
  }
  for (int32_t j = 0; j < nrhs; ++j) {
    std::memcpy(static_cast<void*>(y + int64_t{j} * n), W + int64_t{n + j} * ld,
                static_cast<size_t>(n) * sizeof(T));
  }
  // Finite A and B of extreme magnitude can overflow in the reflectors. The
  // drivers that take R next must never see a NaN or an infinity (LAPACK's own
  // scaling then reports an illegal argument, and the reference xerbla ends
  // the process), so such a fold is refused like such an input.
  if (HasNonFinite(R, int64_t{n} * n) != 0 || HasNonFinite(y, int64_t{n} * nrhs) != 0) {
    return status::kNonFinite;
  }
  return status::kOk;
}

// ---- refinement of an ill-conditioned complex solve -----------------------------------
// The fold rounds R's entries once per row block, so on a long record its
// error grows with the number of blocks, and on an ill-conditioned system the
// solution carries it amplified. One correction step on the semi-normal
// equations, R^H R dw = A^H (b - A w), with the residual formed to well beyond
// the working precision, takes the solution back to the accuracy the data
// allow, and further than an unfolded QR gets.
//
// The residual's cancellation is what needs the extra precision, and it is
// had without double-double arithmetic: a tile of rows and w are each split
// exactly into three parts on ever finer grids of k bits (a = ah + am + al,
// w = w1 + w2 + w3). The grids follow the tile's largest element and w's
// largest part, and k is chosen so that every product ah w1 is an integer
// number of cells of one grid, and every ah w2 and am w1 of the next, with
// 4n of them summing below 2^53 cells: each row's sum of the products of
// either kind is then exact in plain double arithmetic, whatever the order.
// The rest, al w + am (w - w1) + ah w3, is some 2^-2k of A w and is summed
// plainly. A^H r needs the same care, as its errors reach the correction
// amplified by the condition number squared: the tile's residual is split the
// same way, each tile's sums of products of one kind are exact (four lanes,
// row i in lane i mod 4), and the tiles' sums are gathered compensated.
// Every order is fixed and no multiply-add is fused, so every variant and
// every machine gives the same bits. Near the underflow threshold the sums
// are no longer exact (the step then only helps less); data so large that a
// grid's constant overflows make the correction non-finite, and it is dropped.

// Rows per tile of the correction step; a tile's data stays in the first-level
// cache.
constexpr int32_t kTileRows = 64;

// The tile kernels run in 32-byte vectors of four rows. On x86-64 ELF targets
// with GCC they are also built for AVX and picked by the loader (not under
// ThreadSanitizer, whose run-time is not up when the loader runs the
// resolvers); without fused multiply-adds both variants give the same bits.
#if defined(__GNUC__) && !defined(__clang__) && defined(__x86_64__) && defined(__ELF__) && \
    !defined(__SANITIZE_THREAD__)
#define QDM_TILE_CLONES __attribute__((target_clones("avx", "default")))
#else
#define QDM_TILE_CLONES
#endif

typedef double V4 __attribute__((vector_size(32)));

// A tile of rows, de-interleaved: element i of column j has its real part at
// re[base + j * stride + i], its three parts at hre[...], mre[...] and
// lre[...], and likewise for the imaginary part.
struct Tile {
  const double* re;
  const double* im;
  const double* hre;
  const double* him;
  const double* mre;
  const double* mim;
  const double* lre;
  const double* lim;
  int64_t base, stride;
  int32_t n;
};

// r = b - A w for the tile's rows. w holds 10n doubles: the real and
// imaginary parts of w, w1, w2, w3 and w - w1, in that order.
QDM_TILE_CLONES void TileResidual(const Tile& t, const double* bre, const double* bim,
                                  const double* w, double* rr, double* ri) {
  const int32_t n = t.n;
  for (int32_t i = 0; i < kTileRows; i += 4) {
    V4 s1r = {}, s1i = {}, s2r = {}, s2i = {}, s3r = {}, s3i = {};
    for (int32_t j = 0; j < n; ++j) {
      const int64_t o = t.base + j * t.stride + i;
      V4 hr, hi, mr, mi, lr, li;
      std::memcpy(&hr, t.hre + o, sizeof hr);
      std::memcpy(&hi, t.him + o, sizeof hi);
      std::memcpy(&mr, t.mre + o, sizeof mr);
      std::memcpy(&mi, t.mim + o, sizeof mi);
      std::memcpy(&lr, t.lre + o, sizeof lr);
      std::memcpy(&li, t.lim + o, sizeof li);
      const double wr = w[j], wi = w[n + j];
      const double ur = w[2 * n + j], ui = w[3 * n + j];
      const double vr = w[4 * n + j], vi = w[5 * n + j];
      const double zr = w[6 * n + j], zi = w[7 * n + j];
      const double dr = w[8 * n + j], di = w[9 * n + j];
      s1r += hr * ur;  // each step of s1 and s2 exact
      s1r -= hi * ui;
      s1i += hr * ui;
      s1i += hi * ur;
      s2r += hr * vr;
      s2r -= hi * vi;
      s2r += mr * ur;
      s2r -= mi * ui;
      s2i += hr * vi;
      s2i += hi * vr;
      s2i += mr * ui;
      s2i += mi * ur;
      s3r += (lr * wr - li * wi) + (mr * dr - mi * di) + (hr * zr - hi * zi);
      s3i += (lr * wi + li * wr) + (mr * di + mi * dr) + (hr * zi + hi * zr);
    }
    // b - s1 - s2 exactly as d + e1 + e2 (two-sums), then one rounding.
    V4 re1[2];
    std::memcpy(&re1[0], bre + i, sizeof re1[0]);
    std::memcpy(&re1[1], bim + i, sizeof re1[1]);
    const V4 s1[2] = {s1r, s1i}, s2[2] = {s2r, s2i}, s3[2] = {s3r, s3i};
    double* out[2] = {rr + i, ri + i};
    for (int32_t q = 0; q < 2; ++q) {
      const V4 b = re1[q];
      const V4 d = b - s1[q];
      const V4 c = d - b;
      const V4 e1 = (b - (d - c)) - (s1[q] + c);
      const V4 f = d - s2[q];
      const V4 g = f - d;
      const V4 e2 = (d - (f - g)) - (s2[q] + g);
      const V4 r = f + ((e1 + e2) - s3[q]);
      std::memcpy(out[q], &r, sizeof r);
    }
  }
}

// acc += the tile's A^H r, per column: four lanes (row i in lane i mod 4) of
// sum and correction, real then imaginary parts, 16 doubles a column. r holds
// 10 kTileRows doubles: the real and imaginary parts of r, r1, r2, r3 and r -
// r1, in that order.
QDM_TILE_CLONES void TileGradient(const Tile& t, const double* r, double* acc) {
  constexpr int32_t T = kTileRows;
  for (int32_t j = 0; j < t.n; ++j) {
    const int64_t o = t.base + j * t.stride;
    V4 s1r = {}, s1i = {}, s2r = {}, s2i = {}, s3r = {}, s3i = {};
    for (int32_t i = 0; i < T; i += 4) {
      V4 hr, hi, mr, mi, lr, li, xr, xi, ur, ui, vr, vi, zr, zi, dr, di;
      std::memcpy(&hr, t.hre + o + i, sizeof hr);
      std::memcpy(&hi, t.him + o + i, sizeof hi);
      std::memcpy(&mr, t.mre + o + i, sizeof mr);
      std::memcpy(&mi, t.mim + o + i, sizeof mi);
      std::memcpy(&lr, t.lre + o + i, sizeof lr);
      std::memcpy(&li, t.lim + o + i, sizeof li);
      std::memcpy(&xr, r + i, sizeof xr);
      std::memcpy(&xi, r + T + i, sizeof xi);
      std::memcpy(&ur, r + 2 * T + i, sizeof ur);
      std::memcpy(&ui, r + 3 * T + i, sizeof ui);
      std::memcpy(&vr, r + 4 * T + i, sizeof vr);
      std::memcpy(&vi, r + 5 * T + i, sizeof vi);
      std::memcpy(&zr, r + 6 * T + i, sizeof zr);
      std::memcpy(&zi, r + 7 * T + i, sizeof zi);
      std::memcpy(&dr, r + 8 * T + i, sizeof dr);
      std::memcpy(&di, r + 9 * T + i, sizeof di);
      s1r += hr * ur;  // conj(a) r; each step of s1 and s2 exact
      s1r += hi * ui;
      s1i += hr * ui;
      s1i -= hi * ur;
      s2r += hr * vr;
      s2r += hi * vi;
      s2r += mr * ur;
      s2r += mi * ui;
      s2i += hr * vi;
      s2i -= hi * vr;
      s2i += mr * ui;
      s2i -= mi * ur;
      s3r += (lr * xr + li * xi) + (mr * dr + mi * di) + (hr * zr + hi * zi);
      s3i += (lr * xi - li * xr) + (mr * di - mi * dr) + (hr * zi - hi * zr);
    }
    double* a = acc + 16 * int64_t{j};
    V4 s[4];
    std::memcpy(s, a, sizeof s);
    const V4 p1[2] = {s1r, s1i}, p2[2] = {s2r, s2i}, p3[2] = {s3r, s3i};
    for (int32_t q = 0; q < 2; ++q) {  // two-sums of the lanes' sums and the tile's
      V4 sum = s[2 * q] + p1[q];
      V4 bb = sum - s[2 * q];
      const V4 e1 = (s[2 * q] - (sum - bb)) + (p1[q] - bb);
      const V4 next = sum + p2[q];
      bb = next - sum;
      const V4 e2 = (sum - (next - bb)) + (p2[q] - bb);
      s[2 * q + 1] += (e1 + e2) + p3[q];
      s[2 * q] = next;
    }
    std::memcpy(a, s, sizeof s);
  }
}

// The tile's parts split at the grids of sigma and tau: h = (a + sigma) -
// sigma, then m the same of a - h with tau, and l the rest.
QDM_TILE_CLONES void SplitTile(const double* re, double* hre, double* mre, double* lre,
                               int64_t span, double sigma, double tau) {
  for (int64_t k = 0; k < span; ++k) {
    const double h = (re[k] + sigma) - sigma;
    const double rest = re[k] - h;
    const double m = (rest + tau) - tau;
    hre[k] = h;
    mre[k] = m;
    lre[k] = rest - m;
  }
}

// The splitting constant for values up to `largest` in magnitude, to keep
// `bits` bits of the largest: 1.5 2^(E + 53 - bits) with largest <= 2^E. Then
// (a + sigma) - sigma is a, rounded to a multiple of 2^(E + 1 - bits), exactly.
double SplitSigma(double largest, int32_t bits) {
  int e = 0;
  std::frexp(largest, &e);  // largest < 2^e
  return std::ldexp(1.5, e + 53 - bits);
}

double MaxAbs(const double* v, int64_t count) {
  double top = 0.0;
  for (int64_t k = 0; k < count; ++k) top = std::max(top, std::fabs(v[k]));
  return top;
}

// v (count values) followed by its three parts on ever finer grids and the
// rest after the first: v1, v2, v3 and v - v1 at v + count, 2 count, 3 count
// and 4 count. The grid follows v's largest magnitude.
void SplitInParts(double* v, int64_t count, int32_t bits) {
  const double sigma = SplitSigma(MaxAbs(v, count), bits);
  const double tau = std::ldexp(sigma, -bits);
  for (int64_t k = 0; k < count; ++k) {
    const double v1 = (v[k] + sigma) - sigma;
    const double rest = v[k] - v1;
    const double v2 = (rest + tau) - tau;
    v[count + k] = v1;
    v[2 * count + k] = v2;
    v[3 * count + k] = rest - v2;
    v[4 * count + k] = rest;
  }
}

// Doubles of scratch Gradient needs for n columns.
template <typename Rows>
int64_t GradientScratch(const Rows& rows, int32_t n) {
  return 8 * rows.TileSpan(kTileRows) + 12 * kTileRows + 26 * int64_t{n};
}

// g = A^H (b - A w) for one right-hand side, the residual to beyond the
// working precision and rounded once per row. `scratch` holds
// GradientScratch(rows, n) doubles.
template <typename Rows>
void Gradient(const Rows& rows, int32_t m, int32_t n, const Complex* w, Complex* g,
              double* scratch) {
  constexpr int32_t T = kTileRows;
  const int64_t span = rows.TileSpan(T);
  double* re = scratch;
  double* im = re + span;
  double* hre = im + span;
  double* him = hre + span;
  double* mre = him + span;
  double* mim = mre + span;
  double* lre = mim + span;
  double* lim = lre + span;
  double* bre = lim + span;
  double* bim = bre + T;
  double* rr = bim + T;  // r, r1, r2, r3, r - r1: real parts, then imaginary parts
  double* ri = rr + T;
  double* wv = rr + 10 * T;  // w, w1, w2, w3, w - w1: real parts, then imaginary parts
  double* acc = wv + 10 * int64_t{n};
  // Grid bits: a row's 4n products of one kind, and a column's 4 kTileRows,
  // stay below 2^53 cells.
  int32_t headroom = 0;
  while ((int64_t{1} << headroom) < 4 * int64_t{std::max(n, T)}) ++headroom;
  const int32_t bits = (55 - headroom) / 2;
  for (int32_t j = 0; j < n; ++j) {
    wv[j] = w[j].real();
    wv[n + j] = w[j].imag();
  }
  SplitInParts(wv, 2 * int64_t{n}, bits);
  std::fill(acc, acc + 16 * int64_t{n}, 0.0);
  const Tile tile{re, im, hre, him, mre, mim, lre, lim, rows.ColumnBase(T), rows.ColumnStride(T),
                  n};
  for (int32_t i0 = 0; i0 < m; i0 += T) {
    const int32_t h = std::min(T, m - i0);
    rows.LoadTile(i0, h, T, re, im, bre, bim);
    const double a_sigma = SplitSigma(std::max(MaxAbs(re, span), MaxAbs(im, span)), bits);
    const double a_tau = std::ldexp(a_sigma, -bits);
    SplitTile(re, hre, mre, lre, span, a_sigma, a_tau);
    SplitTile(im, him, mim, lim, span, a_sigma, a_tau);
    TileResidual(tile, bre, bim, wv, rr, ri);
    // Rows past the end: a Hankel tile's later columns still reach real samples.
    std::fill(rr + h, rr + T, 0.0);
    std::fill(ri + h, ri + T, 0.0);
    SplitInParts(rr, 2 * int64_t{T}, bits);
    TileGradient(tile, rr, acc);
  }
  for (int32_t j = 0; j < n; ++j) {
    double part[2] = {0.0, 0.0};
    for (int32_t q = 0; q < 2; ++q) {  // the four lanes, compensated, in lane order
      const double* s = acc + 16 * int64_t{j} + 8 * q;
      double sum = 0.0, c = 0.0;
      for (int32_t l = 0; l < 4; ++l) {
        const double next = sum + s[l];
        const double bb = next - sum;
        c += ((sum - (next - bb)) + (s[l] - bb)) + s[4 + l];
        sum = next;
      }
      part[q] = sum + c;
    }
    g[j] = Complex(part[0], part[1]);
  }
}

// Systems at least this ill-conditioned (largest over smallest kept singular
// value) get the correction step; better conditioned ones lose nothing worth
// its cost to the fold.
constexpr double kRefineCondition = 1e4;

// Elements of Complex scratch Refine needs.
template <typename Rows>
int64_t RefineScratch(const Rows& rows, int32_t n, int32_t k) {
  return 2 * int64_t{n} + k + (GradientScratch(rows, n) + 1) / 2;
}

// One correction of the solution w (n values) of a tall system with one
// right-hand side: w += V diag(1/S^2) V^H A^H (b - A w) over the kept singular
// values, which keeps w in their span (the minimum-norm solution of the same
// rank). V is n-by-k, row-major. A non-finite correction is not applied.
// `scratch` holds RefineScratch(rows, n, k) elements.
template <typename Rows>
void Refine(const Rows& rows, int32_t m, int32_t n, int32_t k, const Complex* V, const double* S,
            double threshold, Complex* w, Complex* scratch) {
  Complex* g = scratch;
  Complex* t = g + n;
  Complex* dw = t + k;
  Gradient(rows, m, n, w, g, reinterpret_cast<double*>(dw + n));
  lapack::Gemm(k, 1, n, V, g, t, true);
  for (int32_t i = 0; i < k; ++i)
    t[i] = S[i] > threshold ? t[i] / (S[i] * S[i]) : Complex(0.0, 0.0);
  lapack::Gemm(n, 1, k, V, t, dw);
  if (HasNonFinite(dw, n) != 0) return;
  for (int32_t j = 0; j < n; ++j) w[j] += dw[j];
}

template <typename Rows>
void Refine(const Rows&, int32_t, int32_t, int32_t, const double*, const double*, double, double*,
            double*) {}

// Which singular values a solve keeps: those above max(m, n) S[0] e (relative),
// or those above the midpoint threshold of TruncationThreshold for `keep`
// components (absolute, no warning).
struct Cut {
  bool relative;
  double e;
  int32_t keep;
};

// X = V diag(1/S) U^H B over the kept singular values of A = U diag(S) V^H. A
// tall A is first factored as A = QR (Householder QR over row blocks, B
// folded along as extra columns) and the SVD taken of R = U_R diag(S) V_R^H, whose
// singular values are those of A; then X = V_R diag(1/S) U_R^H (Q^H B)[0:n]. Neither U
// of the tall matrix nor the pseudo-inverse itself is ever formed. *kept is the
// number of singular values kept. nrhs < 1 (possible from the complex solve
// only) factors A for its statuses and writes nothing.
template <typename T, typename Rows>
StatusCode SvdSolve(const Rows& system, int32_t m, int32_t n, int32_t nrhs, T* X, Cut cut,
                    int32_t* kept) {
  const int32_t k = std::min(m, n);
  const bool tall = IsTall(m, n) && nrhs > 0;
  const int32_t rows = tall ? n : m;  // rows of the matrix decomposed

  Factors<T> f;
  if (!f.Allocate(rows, n, k)) return status::kNoMemory;
  WorkArray<T> qr;
  WorkArray<T> y;
  const T* base = nullptr;  // the right-hand sides U^H is applied to
  StatusCode st = status::kOk;
  if (tall) {
    if (system.NonFiniteA(m)) return status::kNonFinite;
    const int64_t nn = int64_t{n} * n;
    const int64_t nr = int64_t{n} * nrhs;
    qr = AllocWorkUninit<T>(static_cast<size_t>(2 * nn + nr));
    y = AllocWorkUninit<T>(static_cast<size_t>(nr));
    if (!qr || !y) return status::kNoMemory;
    T* r_col = qr.get();
    T* r = r_col + nn;
    T* y_col = r + nn;
    st = FoldQr(system, m, n, nrhs, r_col, y_col);
    if (st != status::kOk) return st;
    TransposeTo(r_col, n, n, r, false);
    TransposeTo(y_col, nrhs, n, y.get(), false);
    st = Svd(r, n, n, f.U, f.S, f.V, 0);
    base = y.get();
  } else if constexpr (Rows::kDense) {
    st = Svd(system.A, m, n, f.U, f.S, f.V, 0);
    base = system.B;
  } else {
    return status::kBadSize;  // never reached: a Hankel system comes only tall
  }
  if (st != status::kOk) return st;

  const double threshold =
      cut.relative ? std::max(m, n) * f.S[0] * cut.e : TruncationThreshold(f.S, k, cut.keep);
  int32_t count = 0;
  for (int32_t i = 0; i < k; ++i) count += f.S[i] > threshold ? 1 : 0;
  *kept = count;
  if (nrhs < 1) return nrhs < 0 ? status::kNegativeDim : status::kOk;

  // z = diag(1/S) U^H base (k-by-nrhs), rows of dropped values zero; then V z.
  const int64_t kr = int64_t{k} * nrhs;
  const bool refine = kIsComplex<T> && tall && nrhs == 1 && cut.relative && count > 0 &&
                      f.S[0] > kRefineCondition * f.S[count - 1];
  // Room for the correction: g, V^H g, dw and the gradient's scratch.
  const int64_t extra = refine ? RefineScratch(system, n, k) : 0;
  WorkArray<T> z = AllocWorkUninit<T>(static_cast<size_t>(kr + int64_t{n} * nrhs + extra));
  if (!z) return status::kNoMemory;
  lapack::Gemm(k, nrhs, rows, f.U, base, z.get(), true);
  for (int32_t i = 0; i < k; ++i) {
    const bool keep = f.S[i] > threshold;
    const double factor = keep ? 1.0 / f.S[i] : 0.0;
    T* row = z.get() + int64_t{i} * nrhs;
    for (int32_t j = 0; j < nrhs; ++j) row[j] = keep ? row[j] * factor : T(0.0);
  }
  T* solution = z.get() + kr;
  lapack::Gemm(n, nrhs, k, f.V, z.get(), solution);
  if (refine) Refine(system, m, n, k, f.V, f.S, threshold, solution, solution + n);
  std::memcpy(static_cast<void*>(X), solution, static_cast<size_t>(int64_t{n} * nrhs) * sizeof(T));
  return status::kOk;
}

// X = pinv(A) B, with singular values at or below max(m, n) S[0] e dropped,
// e = rcond when positive, machine epsilon otherwise.
template <typename T, typename Rows>
StatusCode PinvSolve(const Rows& system, int32_t m, int32_t n, int32_t nrhs, T* X, double rcond) {
  if constexpr (kIsComplex<T>) {
    // Deliberately narrower than the real twin: nrhs is not checked (a negative
    // count gives -20004 once A is factored), and only B is screened here; A
    // is screened by its factorization.
    if (m < 1 || n < 1) return status::kBadSize;
    if (system.NonFiniteB(m)) return status::kNonFinite;
  } else {
    if (m < 1 || n < 1 || nrhs < 1) return status::kBadSize;
    if (system.NonFiniteA(m) || system.NonFiniteB(m)) return status::kNonFinite;
  }
  int32_t kept = 0;
  const StatusCode st =
      SvdSolve(system, m, n, nrhs, X, Cut{true, rcond > 0.0 ? rcond : kEpsilon, 0}, &kept);
  if (st != status::kOk) return st;
  return kept == std::min(m, n) ? status::kOk : status::kRankDeficient;
}

}  // namespace

// ---- DGELSD ------------------------------------------------------------------------

namespace {

// A negative or NaN rcond selects machine epsilon; zero stays zero. DGELSD
// takes it times max(m, n).
double GelsdRcond(int32_t m, int32_t n, double rcond) {
  return std::max(m, n) * (rcond >= 0.0 ? rcond : kEpsilon);
}

// DGELSD on R and (Q^H B)[0:n] of the tall A = QR: the same singular values,
// rank and minimum-norm solution as on A itself, RCOND unchanged.
template <typename Rows>
StatusCode GelsdFolded(const Rows& system, int32_t m, int32_t n, int32_t nrhs, double* X,
                       double rcond) {
  const int64_t nn = int64_t{n} * n;
  WorkArray<double> small =
      AllocWorkUninit<double>(static_cast<size_t>(nn + int64_t{n} * nrhs + n));
  if (!small) return status::kNoMemory;
  double* R = small.get();
  double* y = R + nn;
  double* sv = y + int64_t{n} * nrhs;
  StatusCode st = FoldQr(system, m, n, nrhs, R, y);
  if (st != status::kOk) return st;
  lapack_int rank = 0;
  st = lapack::Gelsd(n, n, nrhs, R, n, y, n, sv, GelsdRcond(m, n, rcond), &rank);
  if (st != status::kOk) return st;
  for (int32_t j = 0; j < nrhs; ++j) lapack::Copy(n, y + int64_t{j} * n, 1, X + j, nrhs);
  return rank < n ? status::kRankDeficient : status::kOk;
}

StatusCode GelsdDense(const double* A, int32_t m, int32_t n, const double* B, int32_t nrhs,
                      double* X, double rcond) {
  const int32_t k = std::min(m, n);
  const double lapack_rcond = GelsdRcond(m, n, rcond);
  lapack_int rank = 0;
  const int32_t ldb = std::max(m, n);
  // Column-major right-hand sides; rows m..ldb-1 of each column are DGELSD's
  // room for the solution of a wide system.
  WorkArray<double> rhs = AllocWorkUninit<double>(static_cast<size_t>(int64_t{ldb} * nrhs));
  if (!rhs) return status::kNoMemory;
  for (int32_t j = 0; j < nrhs; ++j) lapack::Copy(m, B + j, nrhs, rhs.get() + int64_t{j} * ldb, 1);

  // A^T row-major is A column-major with lda = m.
  WorkArray<double> a_col = AllocWorkUninit<double>(static_cast<size_t>(int64_t{m} * n));
  if (!a_col) return status::kNoMemory;
  TransposeTo(A, m, n, a_col.get(), false);
  WorkArray<double> sv = AllocWorkUninit<double>(static_cast<size_t>(k));
  if (!sv) return status::kNoMemory;

  StatusCode st =
      lapack::Gelsd(m, n, nrhs, a_col.get(), m, rhs.get(), ldb, sv.get(), lapack_rcond, &rank);
  if (st != status::kOk) return st;

  st = rank < k ? status::kRankDeficient : status::kOk;
  for (int32_t j = 0; j < nrhs; ++j) lapack::Copy(n, rhs.get() + int64_t{j} * ldb, 1, X + j, nrhs);
  return st;
}

template <typename Rows>
StatusCode GelsdSolve(const Rows& system, int32_t m, int32_t n, int32_t nrhs, double* X,
                      double rcond) {
  if (m < 1 || n < 1 || nrhs < 1) return status::kBadSize;
  if (system.NonFiniteA(m) || system.NonFiniteB(m)) return status::kNonFinite;
  if (IsTall(m, n)) return GelsdFolded(system, m, n, nrhs, X, rcond);
  if constexpr (Rows::kDense) {
    if (UsesPinvPath(m, n)) return LeastSquaresPinvReal(system.A, m, n, system.B, nrhs, X, rcond);
    return GelsdDense(system.A, m, n, system.B, nrhs, X, rcond);
  } else {
    return status::kBadSize;  // never reached: a Hankel system comes only tall
  }
}

}  // namespace

template <typename T>
StatusCode LeastSquaresTruncated(const T* A, int32_t m, int32_t n, const T* B, int32_t nrhs, T* X,
                                 int32_t keep) {
  if (m < 1 || n < 1 || nrhs < 1) return status::kBadSize;
  if (HasNonFinite(A, int64_t{m} * n) != 0 || HasNonFinite(B, int64_t{m} * nrhs) != 0) {
    return status::kNonFinite;
  }
  int32_t kept = 0;
  return SvdSolve(RowMajorRows<T>{A, B, n, nrhs}, m, n, nrhs, X, Cut{false, 0.0, keep}, &kept);
}

// pinv(A) into out, or over A when out is null. tol < 0 selects
// max(m, n) S[0] eps; any other tol (NaN included) is used as given.
template <typename T>
StatusCode PseudoInverse(T* A, int32_t m, int32_t n, double tol, T* out) {
  if (m < 1 || n < 1) return status::kBadSize;
  const int32_t k = std::min(m, n);
  const int64_t mn = int64_t{m} * n;

  Factors<T> f;
  if (!f.Allocate(m, n, k)) return status::kNoMemory;
  WorkArray<T> result = AllocWork<T>(static_cast<size_t>(mn));
  if (!result) return status::kNoMemory;

  StatusCode st = Svd(A, m, n, f.U, f.S, f.V, 0);
  if (st != status::kOk) return st;
  if (tol < 0.0) tol = std::max(m, n) * f.S[0] * kEpsilon;
  (void)InvertKeptColumns(f.V, n, k, f.S, tol);
  st = FormPinv(f, m, n, k, result.get());
  if (st != status::kOk) return st;

  T* dst = out != nullptr ? out : A;
  std::memcpy(static_cast<void*>(dst), result.get(), static_cast<size_t>(mn) * sizeof(T));
  return status::kOk;
}

template StatusCode LeastSquaresTruncated(const double*, int32_t, int32_t, const double*, int32_t,
                                          double*, int32_t);
template StatusCode LeastSquaresTruncated(const Complex*, int32_t, int32_t, const Complex*, int32_t,
                                          Complex*, int32_t);
template StatusCode PseudoInverse(double*, int32_t, int32_t, double, double*);
template StatusCode PseudoInverse(Complex*, int32_t, int32_t, double, Complex*);

// The real solve runs the minimum-norm driver, the complex one the
// pseudo-inverse solve.
template <typename T>
StatusCode LeastSquares(const T* A, int32_t m, int32_t n, const T* B, int32_t nrhs, T* X,
                        double rcond) {
  const RowMajorRows<T> system{A, B, n, nrhs};
  StatusCode st = status::kOk;
  if constexpr (kIsComplex<T>) {
    st = PinvSolve(system, m, n, nrhs, X, rcond);
  } else {
    st = GelsdSolve(system, m, n, nrhs, X, rcond);
  }
  call_record::Note(st);
  return st;
}
template StatusCode LeastSquares(const double*, int32_t, int32_t, const double*, int32_t, double*,
                                 double);
template StatusCode LeastSquares(const Complex*, int32_t, int32_t, const Complex*, int32_t,
                                 Complex*, double);

StatusCode LeastSquaresReal(const double* A, int32_t m, int32_t n, const double* B, int32_t nrhs,
                            double* X, double rcond) {
  return LeastSquares(A, m, n, B, nrhs, X, rcond);
}

// ---- pseudo-inverse solves and pseudo-inverses ------------------------------------------

StatusCode LeastSquaresPinvReal(const double* A, int32_t m, int32_t n, const double* B,
                                int32_t nrhs, double* X, double rcond) {
  const StatusCode st = PinvSolve(RowMajorRows<double>{A, B, n, nrhs}, m, n, nrhs, X, rcond);
  call_record::Note(st);
  return st;
}

StatusCode LeastSquaresComplex(const Complex* A, int32_t m, int32_t n, const Complex* B,
                               int32_t nrhs, Complex* X, double rcond) {
  return LeastSquares(A, m, n, B, nrhs, X, rcond);
}

// The forward prediction problem of x, solved as LeastSquares solves it formed
// (the same screens, in the same order, and the same statuses). A tall one is
// folded straight from x.
template <typename T>
StatusCode ForwardLeastSquares(const T* x, int32_t n, int32_t p, T* w, double rcond) {
  const int32_t m = n - p;
  if (m < 1 || p < 1 || !IsTall(m, p)) {
    const int64_t mp = int64_t{std::max(m, 0)} * std::max(p, 0);
    WorkArray<T> A = AllocWorkUninit<T>(static_cast<size_t>(mp));
    if (!A) return status::kNoMemory;
    for (int32_t i = 0; i < m; ++i) {
      for (int32_t j = 0; j < p; ++j) A[int64_t{i} * p + j] = x[i + p - 1 - j];
    }
    return LeastSquares(A.get(), m, p, x + p, 1, w, rcond);
  }
  const HankelRows<T> system{x, p, true};
  StatusCode st = status::kOk;
  if constexpr (kIsComplex<T>) {
    st = PinvSolve(system, m, p, 1, w, rcond);
  } else {
    st = GelsdSolve(system, m, p, 1, w, rcond);
  }
  call_record::Note(st);
  return st;
}
template StatusCode ForwardLeastSquares(const double*, int32_t, int32_t, double*, double);
template StatusCode ForwardLeastSquares(const Complex*, int32_t, int32_t, Complex*, double);

double TruncationThreshold(const double* S, int32_t count, int32_t keep) {
  if (keep == count) return S[keep - 1] * 0.5;
  if (keep >= 1 && keep < count) return (S[keep - 1] + S[keep]) * 0.5;
  return 0.0;
}

template <typename T>
StatusCode QrReduceHankel(const T* x, int32_t m, int32_t n, T* R) {
  if (m < 1 || n < 1 || m < n) return status::kBadSize;
  WorkArray<T> col = AllocWorkUninit<T>(static_cast<size_t>(int64_t{n} * n));
  if (!col) return status::kNoMemory;
  const StatusCode st =
      FoldQr(HankelRows<T>{x, n, false}, m, n, 0, col.get(), static_cast<T*>(nullptr));
  if (st != status::kOk) return st;
  TransposeTo(col.get(), n, n, R, false);
  return status::kOk;
}
template StatusCode QrReduceHankel(const double*, int32_t, int32_t, double*);
template StatusCode QrReduceHankel(const Complex*, int32_t, int32_t, Complex*);

StatusCode PseudoInverseReal(double* A, int32_t m, int32_t n, double tol, double* out) {
  return PseudoInverse(A, m, n, tol, out);
}

StatusCode PseudoInverseComplex(Complex* A, int32_t m, int32_t n, double tol, Complex* out) {
  return PseudoInverse(A, m, n, tol, out);
}
