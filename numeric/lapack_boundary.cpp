// The LAPACK boundary: workspace, allocation and the INFO mapping of every
// driver, in one place.
//
// What INFO means, per driver:
//   gesdd          any INFO != 0 (negative or positive alike)  -> -20062
//   gelsd          INFO > 0 -> -20062; INFO < 0 is not treated separately: the
//                  caller goes on with the rank LAPACK left
//   geqrf, geqrt,  INFO < 0 -> -20999 (they report nothing else)
//   tpqrt
//   geev, syevd,   INFO < 0 -> -20999, INFO > 0 -> -20062
//   heevd
//   potrf, pocon   INFO < 0 -> -20999; potrf's own INFO > 0 (not positive
//                  definite) is handed back as a result, not as a failure
//                  (an injected one is a failure, -20062)
// Workspace: gesdd, gelsd and geqrf take the size their own query (LWORK = -1)
// reports; geqrt and tpqrt, which have no query, and the eigenvalue drivers are
// sized by fixed formulas; pocon's workspace is fixed by LAPACK (2n + n real).

#include "numeric/lapack_boundary.h"

#include <algorithm>
#include <atomic>
#include <cassert>
#include <cmath>
#include <limits>

#include "core/call_record.h"
#include "core/scalar.h"
#include "numeric/work.h"

namespace {

enum class Driver { kGesdd, kGelsd, kGeqrf, kGeev, kSyevd, kPotrf };

// ---- injection ------------------------------------------------------------------------
std::atomic<int64_t> g_fail_at{0};
std::atomic<int32_t> g_fail_info{0};
std::atomic<bool> g_fail_persistent{false};
std::atomic<int64_t> g_calls{0};

// Counts one driver call; true (with *info set) when this call is to fail.
bool Injected(lapack_int* info) {
  const int64_t call = g_calls.fetch_add(1, std::memory_order_relaxed) + 1;
  const int64_t k = g_fail_at.load(std::memory_order_relaxed);
  if (k <= 0) return false;
  const bool hit = g_fail_persistent.load(std::memory_order_relaxed) ? call >= k : call == k;
  if (hit) *info = g_fail_info.load(std::memory_order_relaxed);
  return hit;
}

StatusCode Mapped(Driver driver, lapack_int info) {
  switch (driver) {
    case Driver::kGesdd:
      return status::kNoConvergence;
    case Driver::kGelsd:
      return info > 0 ? status::kNoConvergence : status::kOk;
    case Driver::kGeqrf:
    case Driver::kPotrf:
    case Driver::kGeev:
    case Driver::kSyevd:
      return info < 0 ? status::kIllegalArgument : status::kNoConvergence;
  }
  return status::kNoConvergence;
}

// Every non-zero INFO, reported by LAPACK or injected, passes through here. The
// call record hears of each one, also of the gelsd INFO < 0 that the solve
// itself goes on from: a face that never reports success after a failure
// returns it.
StatusCode Failed(Driver driver, lapack_int info) {
  const StatusCode s = Mapped(driver, info);
  call_record::Note(s != status::kOk ? s : status::kIllegalArgument);
  return s;
}

// The INFO of a driver that ran. Every argument is ours and checked before
// the call, so a negative INFO (an illegal argument) is a bug here, never the
// caller's data, with one exception: gesdd reports a NaN in its matrix as
// INFO = -4. Release builds map every INFO all the same.
StatusCode Done(Driver driver, lapack_int info) {
  assert(info >= 0 || (driver == Driver::kGesdd && info == -4));
  return info == 0 ? status::kOk : Failed(driver, info);
}

// The workspace a query left in WORK(1), truncated toward zero. Every size a
// 32-bit LWORK can hold is an integer-valued double, so nothing is lost.
template <typename T>
WorkArray<T> QueriedWork(const T& query, lapack_int* lwork) {
  const int64_t size = std::max<int64_t>(static_cast<int64_t>(RealPart(query)), 0);
  *lwork = static_cast<lapack_int>(std::min<int64_t>(size, std::numeric_limits<lapack_int>::max()));
  return AllocWorkUninit<T>(static_cast<size_t>(size));
}

// run(work, &lwork) once as a workspace query (LWORK = -1), then with the
// workspace it asked for; -20001 when that cannot be had.
template <typename T, typename Run>
StatusCode RunQueried(Run run) {
  T query{};
  lapack_int lwork = -1;
  run(&query, &lwork);
  WorkArray<T> work = QueriedWork(query, &lwork);
  if (!work) return status::kNoMemory;
  run(work.get(), &lwork);
  return status::kOk;
}

// n * trunc(2 (log2 n + 1) + c1 n + c0) + 1, with log2 n = ln n / ln 2; -1 when
// the size does not fit LAPACK's 32-bit integer.
int64_t LogWorkSize(int32_t n, double c1, double c0) {
  const double log2n = std::log(static_cast<double>(n)) / std::log(2.0);
  const double per_column = std::trunc(2.0 * (log2n + 1.0) + c1 * n + c0);
  const double size = static_cast<double>(n) * per_column + 1.0;
  if (size > static_cast<double>(std::numeric_limits<lapack_int>::max())) return -1;
  return static_cast<int64_t>(size);
}

}  // namespace

void LapackFailAt(int64_t k, int32_t info, bool persistent) {
  g_fail_persistent.store(persistent, std::memory_order_relaxed);
  g_fail_info.store(info, std::memory_order_relaxed);
  g_calls.store(0, std::memory_order_relaxed);
  g_fail_at.store(k, std::memory_order_relaxed);
}

int64_t LapackCalls() { return g_calls.load(std::memory_order_relaxed); }

namespace lapack {

// ---- gesdd ----------------------------------------------------------------------------
// IWORK: 8 min(m, n). ZGESDD's RWORK: (5k + 7)k, raised where needed to the
// minimum LAPACK documents, max(5k^2 + 5k, 2 max(m,n) k + 2k^2 + k), which is
// larger when one side exceeds the other by more than about half.
template <typename T>
StatusCode Gesdd(char jobz, lapack_int m, lapack_int n, T* a, lapack_int lda, double* s, T* u,
                 lapack_int ldu, T* vt, lapack_int ldvt) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGesdd, info);
  const int64_t k = std::min(m, n);
  WorkArray<lapack_int> iwork = AllocWorkUninit<lapack_int>(static_cast<size_t>(8 * k));
  if (!iwork) return status::kNoMemory;
  WorkArray<double> rwork;
  if constexpr (kIsComplex<T>) {
    const int64_t mx = std::max(m, n);
    const int64_t lrwork = std::max((5 * k + 7) * k, 2 * mx * k + 2 * k * k + k);
    rwork = AllocWorkUninit<double>(static_cast<size_t>(lrwork));
    if (!rwork) return status::kNoMemory;
  }
  const StatusCode st = RunQueried<T>([&](T* work, lapack_int* lwork) {
    if constexpr (kIsComplex<T>) {
      LAPACK_zgesdd(&jobz, &m, &n, a, &lda, s, u, &ldu, vt, &ldvt, work, lwork, rwork.get(),
                    iwork.get(), &info);
    } else {
      LAPACK_dgesdd(&jobz, &m, &n, a, &lda, s, u, &ldu, vt, &ldvt, work, lwork, iwork.get(), &info);
    }
  });
  if (st != status::kOk) return st;
  return Done(Driver::kGesdd, info);
}
template StatusCode Gesdd(char, lapack_int, lapack_int, double*, lapack_int, double*, double*,
                          lapack_int, double*, lapack_int);
template StatusCode Gesdd(char, lapack_int, lapack_int, Complex*, lapack_int, double*, Complex*,
                          lapack_int, Complex*, lapack_int);

// ---- leading singular triplets ---------------------------------------------------------
// gesdd's own route for a matrix that is not much taller than wide, with only
// `count` left vectors carried back: scale into range as gesdd does, reduce to
// bidiagonal B = Q^H a P (gebrd), take B's SVD by divide and conquer (dbdsdc,
// real also for complex data), and apply Q to the first `count` left vectors
// of B alone. Q applied to all of them, and P to any, is most of gesdd's cost.
namespace {
// B = Q^H a P (gebrd) for the m-by-n a.
template <typename T>
void Gebrd(lapack_int m, lapack_int n, T* a, lapack_int lda, double* d, double* e, T* tauq, T* taup,
           T* work, lapack_int* lwork, lapack_int* info) {
  if constexpr (kIsComplex<T>) {
    LAPACK_zgebrd(&m, &n, a, &lda, d, e, tauq, taup, work, lwork, info);
  } else {
    LAPACK_dgebrd(&m, &n, a, &lda, d, e, tauq, taup, work, lwork, info);
  }
}
// C (m-by-ncol) replaced by Q C, Q from Gebrd of an m-by-k matrix.
template <typename T>
void ApplyQ(lapack_int m, lapack_int ncol, lapack_int k, const T* a, lapack_int lda, const T* tau,
            T* c, lapack_int ldc, T* work, lapack_int* lwork, lapack_int* info) {
  const char vect = 'Q', side = 'L', trans = 'N';
  if constexpr (kIsComplex<T>) {
    LAPACK_zunmbr(&vect, &side, &trans, &m, &ncol, &k, a, &lda, tau, c, &ldc, work, lwork, info);
  } else {
    LAPACK_dormbr(&vect, &side, &trans, &m, &ncol, &k, a, &lda, tau, c, &ldc, work, lwork, info);
  }
}
template <typename T>
double MaxAbs(lapack_int m, lapack_int n, const T* a, lapack_int lda) {
  double unused = 0.0;
  if constexpr (kIsComplex<T>) {
    return LAPACK_zlange("M", &m, &n, a, &lda, &unused);
  } else {
    return LAPACK_dlange("M", &m, &n, a, &lda, &unused);
  }
}
template <typename T>
void Rescale(double from, double to, lapack_int m, lapack_int n, T* a, lapack_int lda) {
  const lapack_int zero = 0;
  lapack_int info = 0;
  if constexpr (kIsComplex<T>) {
    LAPACK_zlascl("G", &zero, &zero, &from, &to, &m, &n, a, &lda, &info);
  } else {
    LAPACK_dlascl("G", &zero, &zero, &from, &to, &m, &n, a, &lda, &info);
  }
}

}  // namespace

template <typename T>
StatusCode LeadingLeftSvd(lapack_int m, lapack_int n, T* a, lapack_int lda, lapack_int count,
                          double* s, T* u, lapack_int ldu) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGesdd, info);
  const lapack_int k = std::min(m, n);
  const int64_t kk = int64_t{k} * k;
  // d, e, B's left and right vectors, dbdsdc's workspace (3k^2 + 4k), and
  // IWORK (8k); the reflectors' scalars.
  WorkArray<double> real = AllocWorkUninit<double>(static_cast<size_t>(5 * kk + 6 * int64_t{k}));
  WorkArray<T> taus = AllocWorkUninit<T>(static_cast<size_t>(2 * int64_t{k}));
  WorkArray<lapack_int> iwork = AllocWorkUninit<lapack_int>(static_cast<size_t>(8 * int64_t{k}));
  if (!real || !taus || !iwork) return status::kNoMemory;
  double* d = real.get();
  double* e = d + k;
  double* ub = e + k;
  double* vtb = ub + kk;
  double* bwork = vtb + kk;
  T* tauq = taus.get();
  T* taup = tauq + k;

  // gesdd's range: max |a_ij| brought into [small, 1/small].
  const double small =
      std::sqrt(std::numeric_limits<double>::min()) / std::numeric_limits<double>::epsilon();
  const double anrm = MaxAbs(m, n, a, lda);
  double scaled = 0.0;
  if (anrm > 0.0 && anrm < small) scaled = small;
  if (anrm > 1.0 / small) scaled = 1.0 / small;
  if (scaled != 0.0) Rescale(anrm, scaled, m, n, a, lda);

  StatusCode st = RunQueried<T>([&](T* work, lapack_int* lwork) {
    Gebrd(m, n, a, lda, d, e, tauq, taup, work, lwork, &info);
  });
  if (st != status::kOk) return st;
  if (info != 0) return Done(Driver::kGesdd, info);

  const char uplo = m >= n ? 'U' : 'L';
  double q_unused = 0.0;
  lapack_int iq_unused = 0;
  LAPACK_dbdsdc(&uplo, "I", &k, d, e, ub, &k, vtb, &k, &q_unused, &iq_unused, bwork, iwork.get(),
                &info);
  if (info != 0) return Done(Driver::kGesdd, info);

  for (lapack_int j = 0; j < count; ++j) {
    T* col = u + int64_t{j} * ldu;
    for (lapack_int i = 0; i < k; ++i) col[i] = ub[i + int64_t{j} * k];
    for (lapack_int i = k; i < m; ++i) col[i] = T{};
  }
  st = RunQueried<T>([&](T* work, lapack_int* lwork) {
    ApplyQ(m, count, n, a, lda, tauq, u, ldu, work, lwork, &info);
  });
  if (st != status::kOk) return st;
  if (info != 0) return Done(Driver::kGesdd, info);

  if (scaled != 0.0) Rescale(scaled, anrm, k, 1, d, k);
  std::copy(d, d + count, s);
  return status::kOk;
}

// ---- gelsd ----------------------------------------------------------------------------
// IWORK: (3 depth + 14) k with depth = floor(log2 k), k = min(m, n): enough for
// the divide-and-conquer tree of any block size.
StatusCode Gelsd(lapack_int m, lapack_int n, lapack_int nrhs, double* a, lapack_int lda, double* b,
                 lapack_int ldb, double* s, double rcond, lapack_int* rank) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGelsd, info);
  const int64_t k = std::min(m, n);
  const int64_t depth = static_cast<int64_t>(std::log(static_cast<double>(k)) / std::log(2.0));
  WorkArray<lapack_int> iwork =
      AllocWorkUninit<lapack_int>(static_cast<size_t>((3 * depth + 14) * k));
  if (!iwork) return status::kNoMemory;
  const StatusCode st = RunQueried<double>([&](double* work, lapack_int* lwork) {
    LAPACK_dgelsd(&m, &n, &nrhs, a, &lda, b, &ldb, s, &rcond, rank, work, lwork, iwork.get(),
                  &info);
  });
  if (st != status::kOk) return st;
  return Done(Driver::kGelsd, info);
}

// ---- QR -------------------------------------------------------------------------------
template <typename T>
StatusCode Geqrf(lapack_int m, lapack_int n, T* a, lapack_int lda, T* tau) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGeqrf, info);
  const StatusCode st = RunQueried<T>([&](T* work, lapack_int* lwork) {
    if constexpr (kIsComplex<T>) {
      LAPACK_zgeqrf(&m, &n, a, &lda, tau, work, lwork, &info);
    } else {
      LAPACK_dgeqrf(&m, &n, a, &lda, tau, work, lwork, &info);
    }
  });
  if (st != status::kOk) return st;
  return Done(Driver::kGeqrf, info);
}
template StatusCode Geqrf(lapack_int, lapack_int, double*, lapack_int, double*);
template StatusCode Geqrf(lapack_int, lapack_int, Complex*, lapack_int, Complex*);

// Compact-WY blocking: block reflectors of 8 columns (32 when there are more
// than 64), their triangular factors T kept in the workspace and dropped; only
// R is wanted. T and the work array are both nb-by-n.
namespace {
lapack_int QrBlock(lapack_int m, lapack_int n) {
  const lapack_int nb = n > 64 ? 32 : 8;
  return std::max<lapack_int>(1, std::min({nb, m, n}));
}
}  // namespace

StatusCode Geqrt(lapack_int m, lapack_int n, double* a, lapack_int lda) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGeqrf, info);
  lapack_int nb = QrBlock(m, n);
  WorkArray<double> tw = AllocWorkUninit<double>(static_cast<size_t>(2 * int64_t{nb} * n));
  if (!tw) return status::kNoMemory;
  LAPACK_dgeqrt(&m, &n, &nb, a, &lda, tw.get(), &nb, tw.get() + int64_t{nb} * n, &info);
  return Done(Driver::kGeqrf, info);
}

StatusCode Tpqrt(lapack_int m, lapack_int n, double* a, lapack_int lda, double* b, lapack_int ldb) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGeqrf, info);
  lapack_int nb = QrBlock(n, n);
  const lapack_int l = 0;
  WorkArray<double> tw = AllocWorkUninit<double>(static_cast<size_t>(2 * int64_t{nb} * n));
  if (!tw) return status::kNoMemory;
  LAPACK_dtpqrt(&m, &n, &l, &nb, a, &lda, b, &ldb, tw.get(), &nb, tw.get() + int64_t{nb} * n,
                &info);
  return Done(Driver::kGeqrf, info);
}

// ---- eigenproblems --------------------------------------------------------------------
// LWORK 4n for DGEEV and 2n for ZGEEV, their documented minima when vectors are
// computed; no query.
int64_t GeevWorkSize(int32_t n, bool complex) { return (complex ? 2 : 4) * int64_t{n}; }

namespace {
// The real driver's eigenvalues come as WR and WI (`w` and `extra`), the
// complex one's as W, with RWORK (2n) in `extra`.
template <typename T>
StatusCode GeevAny(char jobvl, lapack_int n, T* a, T* w, T* vl, T* work, double* extra) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGeev, info);
  const char jobvr = 'N';
  const lapack_int lwork = static_cast<lapack_int>(GeevWorkSize(n, kIsComplex<T>));
  T unused{};
  T* left = vl != nullptr ? vl : &unused;
  if constexpr (kIsComplex<T>) {
    LAPACK_zgeev(&jobvl, &jobvr, &n, a, &n, w, left, &n, &unused, &n, work, &lwork, extra, &info);
  } else {
    LAPACK_dgeev(&jobvl, &jobvr, &n, a, &n, w, extra, left, &n, &unused, &n, work, &lwork, &info);
  }
  return Done(Driver::kGeev, info);
}
}  // namespace

StatusCode Geev(char jobvl, lapack_int n, double* a, double* wr, double* wi, double* vl,
                double* work) {
  return GeevAny(jobvl, n, a, wr, vl, work, wi);
}

StatusCode Geev(char jobvl, lapack_int n, Complex* a, Complex* w, Complex* vl, Complex* work,
                double* rwork) {
  return GeevAny(jobvl, n, a, w, vl, work, rwork);
}

// Sized for JOBZ = 'V' whatever is asked. DSYEVD needs WORK >= 1 + 6n + 2n^2;
// ZHEEVD needs WORK >= 2n + n^2 and RWORK >= 1 + 5n + 2n^2. Both need
// IWORK >= 3 + 5n. Here: LIWORK = 5n + 3; LWORK = n trunc(2 (log2 n + 1) + 3n + 5)
// + 1 for DSYEVD and the RWORK of ZHEEVD, n trunc(2 (log2 n + 1) + n) + 1 for
// ZHEEVD's WORK.
template <typename T>
StatusCode Syevd(char jobz, lapack_int n, T* a, double* w) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kSyevd, info);
  const int64_t lwork = kIsComplex<T> ? LogWorkSize(n, 1.0, 0.0) : LogWorkSize(n, 3.0, 5.0);
  const int64_t lrwork = kIsComplex<T> ? LogWorkSize(n, 3.0, 5.0) : 0;
  const int64_t liwork = 5 * int64_t{n} + 3;
  if (lwork < 0 || lrwork < 0 || liwork > std::numeric_limits<lapack_int>::max()) {
    return status::kNoMemory;
  }
  WorkArray<T> work = AllocWorkUninit<T>(static_cast<size_t>(lwork));
  WorkArray<double> rwork;
  if constexpr (kIsComplex<T>) rwork = AllocWorkUninit<double>(static_cast<size_t>(lrwork));
  WorkArray<lapack_int> iwork = AllocWorkUninit<lapack_int>(static_cast<size_t>(liwork));
  if (!work || (kIsComplex<T> && !rwork) || !iwork) return status::kNoMemory;
  const char uplo = 'U';
  const lapack_int lw = static_cast<lapack_int>(lwork), lrw = static_cast<lapack_int>(lrwork),
                   liw = static_cast<lapack_int>(liwork);
  if constexpr (kIsComplex<T>) {
    LAPACK_zheevd(&jobz, &uplo, &n, a, &n, w, work.get(), &lw, rwork.get(), &lrw, iwork.get(), &liw,
                  &info);
  } else {
    (void)lrw;
    LAPACK_dsyevd(&jobz, &uplo, &n, a, &n, w, work.get(), &lw, iwork.get(), &liw, &info);
  }
  return Done(Driver::kSyevd, info);
}
template StatusCode Syevd(char, lapack_int, double*, double*);
template StatusCode Syevd(char, lapack_int, Complex*, double*);

// ---- Cholesky ---------------------------------------------------------------------------
StatusCode Potrf(lapack_int n, Complex* a, lapack_int lda, lapack_int* notDefinite) {
  lapack_int info = 0;
  *notDefinite = 0;
  if (Injected(&info)) return Failed(Driver::kPotrf, info);
  const char uplo = 'U';
  LAPACK_zpotrf(&uplo, &n, a, &lda, &info);
  if (info > 0) {
    *notDefinite = info;
    return status::kOk;
  }
  return Done(Driver::kPotrf, info);
}

StatusCode Pocon(lapack_int n, const Complex* a, lapack_int lda, double anorm, double* rcond) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kPotrf, info);
  WorkArray<Complex> work = AllocWorkUninit<Complex>(static_cast<size_t>(2 * int64_t{n}));
  WorkArray<double> rwork = AllocWorkUninit<double>(static_cast<size_t>(n));
  if (!work || !rwork) return status::kNoMemory;
  const char uplo = 'U';
  LAPACK_zpocon(&uplo, &n, a, &lda, &anorm, rcond, work.get(), rwork.get(), &info);
  return Done(Driver::kPotrf, info);
}

template StatusCode LeadingLeftSvd(lapack_int, lapack_int, double*, lapack_int, lapack_int, double*,
                                   double*, lapack_int);
template StatusCode LeadingLeftSvd(lapack_int, lapack_int, Complex*, lapack_int, lapack_int,
                                   double*, Complex*, lapack_int);

}  // namespace lapack
