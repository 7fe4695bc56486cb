// Singular value decomposition of a row-major matrix over the divide-and-conquer
// drivers DGESDD / ZGESDD. The row-major array of A is handed to LAPACK as it
// stands, where it reads as the column-major n-by-m matrix A^T; the factors of A
// are then read off those of A^T = U' diag(S) V'^H:
//   U = conj(V'^H)^T = V'^H read row-major     (no data movement)
//   V = conj(U')                               (one transpose afterwards)

#include <algorithm>
#include <cstring>

#include "numeric/lapack_boundary.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

template <typename T>
StatusCode Svd(const T* A, int32_t m, int32_t n, T* U, double* S, T* V, int32_t full) {
  if (m < 1 || n < 1) return status::kBadSize;
  const int64_t mn = int64_t{m} * n;
  if (HasNonFinite(A, mn) != 0) return status::kNonFinite;

  const int32_t k = std::min(m, n);
  const char jobz = full != 0 ? 'A' : 'S';
  const int32_t p = full != 0 ? m : k;  // left singular vectors of A kept
  const int32_t q = full != 0 ? n : k;  // right singular vectors of A kept

  // The copy is A^T in column-major order, n rows by m columns, lda = n.
  WorkArray<T> at = AllocWorkUninit<T>(static_cast<size_t>(mn));
  if (!at) return status::kNoMemory;
  std::memcpy(static_cast<void*>(at.get()), A, static_cast<size_t>(mn) * sizeof(T));

  // One block for the factors of A^T: its right factor V'^H (p-by-m, ldvt = p),
  // its left factor U' (n-by-q, ldu = n), and the k singular values.
  const int64_t right_count = int64_t{p} * m;
  const int64_t left_count = int64_t{q} * n;
  WorkArray<T> factors = AllocWorkUninit<T>(static_cast<size_t>(right_count + left_count + k));
  if (!factors) return status::kNoMemory;
  T* right = factors.get();
  T* left = right + right_count;
  double* sv = reinterpret_cast<double*>(left + left_count);

  StatusCode st = lapack::Gesdd(jobz, n, m, at.get(), n, sv, left, n, right, p);
  if (st != status::kOk) return st;

  // V (n-by-q) = conj of U', whose column-major array reads row-major as q-by-n.
  st = Adjoint(left, q, n, V);
  if (st != status::kOk) return st;
  std::memcpy(S, sv, static_cast<size_t>(k) * sizeof(double));
  // V'^H, p-by-m column-major with ldvt = p, is exactly the row-major m-by-p U.
  std::memcpy(static_cast<void*>(U), right, static_cast<size_t>(right_count) * sizeof(T));
  return status::kOk;
}

// The leading `count` singular triplets: the economy decomposition, of which
// the first `count` columns of U and V and values of S are kept. (The
// selective driver gesvdx would compute only those, but on records whose
// singular values tie its bisection step writes past its arrays.)
template <typename T>
StatusCode SvdLeading(const T* A, int32_t m, int32_t n, int32_t count, T* U, double* S, T* V) {
  if (m < 1 || n < 1 || count < 1 || count > std::min(m, n)) return status::kBadSize;
  const int32_t k = std::min(m, n);
  const int64_t uk = int64_t{m} * k;
  const int64_t vk = int64_t{n} * k;
  WorkArray<T> block = AllocWorkUninit<T>(static_cast<size_t>(uk + vk));
  WorkArray<double> sv = AllocWorkUninit<double>(static_cast<size_t>(k));
  if (!block || !sv) return status::kNoMemory;
  T* u = block.get();
  T* v = u + uk;
  const StatusCode st = Svd(A, m, n, u, sv.get(), v, 0);
  if (st != status::kOk) return st;
  std::memcpy(S, sv.get(), static_cast<size_t>(count) * sizeof(double));
  for (int32_t i = 0; i < m; ++i) {
    std::memcpy(static_cast<void*>(U + int64_t{i} * count), u + int64_t{i} * k,
                static_cast<size_t>(count) * sizeof(T));
  }
  for (int32_t i = 0; i < n; ++i) {
    std::memcpy(static_cast<void*>(V + int64_t{i} * count), v + int64_t{i} * k,
                static_cast<size_t>(count) * sizeof(T));
  }
  return status::kOk;
}

// The leading `count` singular values and right vectors alone. The row-major A
// reads as the column-major A^T, whose left singular vectors are conj(V).
template <typename T>
StatusCode SvdLeadingRight(const T* A, int32_t m, int32_t n, int32_t count, double* S, T* V) {
  if (m < 1 || n < 1 || count < 1 || count > std::min(m, n)) return status::kBadSize;
  const int64_t mn = int64_t{m} * n;
  if (HasNonFinite(A, mn) != 0) return status::kNonFinite;
  WorkArray<T> at = AllocWorkUninit<T>(static_cast<size_t>(mn));
  WorkArray<T> left = AllocWorkUninit<T>(static_cast<size_t>(int64_t{n} * count));
  if (!at || !left) return status::kNoMemory;
  std::memcpy(static_cast<void*>(at.get()), A, static_cast<size_t>(mn) * sizeof(T));
  const StatusCode st = lapack::LeadingLeftSvd(n, m, at.get(), n, count, S, left.get(), n);
  if (st != status::kOk) return st;
  // The column-major n-by-count left factor reads row-major as count-by-n.
  return Adjoint(left.get(), count, n, V);
}

template StatusCode Svd(const double*, int32_t, int32_t, double*, double*, double*, int32_t);
template StatusCode Svd(const Complex*, int32_t, int32_t, Complex*, double*, Complex*, int32_t);
template StatusCode SvdLeading(const double*, int32_t, int32_t, int32_t, double*, double*, double*);
template StatusCode SvdLeading(const Complex*, int32_t, int32_t, int32_t, Complex*, double*,
                               Complex*);
template StatusCode SvdLeadingRight(const double*, int32_t, int32_t, int32_t, double*, double*);
template StatusCode SvdLeadingRight(const Complex*, int32_t, int32_t, int32_t, double*, Complex*);

StatusCode SvdReal(const double* A, int32_t m, int32_t n, double* U, double* S, double* V,
                   int32_t full) {
  return Svd(A, m, n, U, S, V, full);
}

StatusCode SvdComplex(const Complex* A, int32_t m, int32_t n, Complex* U, double* S, Complex* V,
                      int32_t full) {
  return Svd(A, m, n, U, S, V, full);
}
