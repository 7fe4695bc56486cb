// The LAPACK boundary: workspace, allocation and the INFO mapping of every
// driver, in one place.
//
// What INFO means, per driver:
//   gesdd, gesvdx  any INFO != 0 (negative or positive alike)  -> -20062
//   gelsd          INFO > 0 -> -20062; INFO < 0 is not treated separately: the
//                  caller goes on with the rank LAPACK left
//   geqrf, unmqr   INFO < 0 -> -20999 (they report nothing else)
//   geev, syevd,   INFO < 0 -> -20999, INFO > 0 -> -20062
//   heevd
// Workspace: gesdd, gesvdx, gelsd, geqrf and unmqr take the size their own query
// (LWORK = -1) reports; the eigenvalue drivers are sized by fixed formulas and
// never queried.

#include "numeric/lapack_boundary.h"

#include <algorithm>
#include <atomic>
#include <cmath>
#include <limits>

#include "core/call_record.h"
#include "numeric/work.h"

namespace {

enum class Driver { kGesdd, kGesvdx, kGelsd, kGeqrf, kUnmqr, kGeev, kSyevd };

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
    case Driver::kGesvdx:
      return status::kNoConvergence;
    case Driver::kGelsd:
      return info > 0 ? status::kNoConvergence : status::kOk;
    case Driver::kGeqrf:
    case Driver::kUnmqr:
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

StatusCode Done(Driver driver, lapack_int info) {
  return info == 0 ? status::kOk : Failed(driver, info);
}

// The size a workspace query left in WORK(1), truncated toward zero.
int64_t Queried(double w) { return static_cast<int64_t>(w); }
int64_t Queried(const Complex& w) { return static_cast<int64_t>(w.real()); }

template <typename T>
WorkArray<T> QueriedWork(const T& query, lapack_int* lwork) {
  const int64_t size = std::max<int64_t>(Queried(query), 0);
  *lwork = static_cast<lapack_int>(std::min<int64_t>(size, std::numeric_limits<lapack_int>::max()));
  return AllocWorkUninit<T>(static_cast<size_t>(size));
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
StatusCode Gesdd(char jobz, lapack_int m, lapack_int n, double* a, lapack_int lda, double* s,
                 double* u, lapack_int ldu, double* vt, lapack_int ldvt) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGesdd, info);
  const int64_t k = std::min(m, n);
  WorkArray<lapack_int> iwork = AllocWorkUninit<lapack_int>(static_cast<size_t>(8 * k));
  if (!iwork) return status::kNoMemory;
  double query = 0.0;
  lapack_int lwork = -1;
  LAPACK_dgesdd(&jobz, &m, &n, a, &lda, s, u, &ldu, vt, &ldvt, &query, &lwork, iwork.get(), &info);
  WorkArray<double> work = QueriedWork(query, &lwork);
  if (!work) return status::kNoMemory;
  LAPACK_dgesdd(&jobz, &m, &n, a, &lda, s, u, &ldu, vt, &ldvt, work.get(), &lwork, iwork.get(),
                &info);
  return Done(Driver::kGesdd, info);
}

StatusCode Gesdd(char jobz, lapack_int m, lapack_int n, Complex* a, lapack_int lda, double* s,
                 Complex* u, lapack_int ldu, Complex* vt, lapack_int ldvt) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGesdd, info);
  const int64_t k = std::min(m, n);
  const int64_t mx = std::max(m, n);
  WorkArray<lapack_int> iwork = AllocWorkUninit<lapack_int>(static_cast<size_t>(8 * k));
  if (!iwork) return status::kNoMemory;
  const int64_t lrwork = std::max((5 * k + 7) * k, 2 * mx * k + 2 * k * k + k);
  WorkArray<double> rwork = AllocWorkUninit<double>(static_cast<size_t>(lrwork));
  if (!rwork) return status::kNoMemory;
  Complex query;
  lapack_int lwork = -1;
  LAPACK_zgesdd(&jobz, &m, &n, a, &lda, s, u, &ldu, vt, &ldvt, &query, &lwork, rwork.get(),
                iwork.get(), &info);
  WorkArray<Complex> work = QueriedWork(query, &lwork);
  if (!work) return status::kNoMemory;
  LAPACK_zgesdd(&jobz, &m, &n, a, &lda, s, u, &ldu, vt, &ldvt, work.get(), &lwork, rwork.get(),
                iwork.get(), &info);
  return Done(Driver::kGesdd, info);
}

// ---- gesvdx ---------------------------------------------------------------------------
// IWORK: 12 min(m, n); ZGESVDX's RWORK: min(m, n) (min(m, n) 2 + 15 min(m, n)).
StatusCode Gesvdx(lapack_int m, lapack_int n, double* a, lapack_int lda, lapack_int count,
                  double* s, double* u, lapack_int ldu, double* vt, lapack_int ldvt) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGesvdx, info);
  const int64_t k = std::min(m, n);
  WorkArray<lapack_int> iwork = AllocWorkUninit<lapack_int>(static_cast<size_t>(12 * k));
  if (!iwork) return status::kNoMemory;
  const char job = 'V', range = 'I';
  const double vl = 0.0, vu = 0.0;
  const lapack_int il = 1;
  lapack_int ns = 0;
  double query = 0.0;
  lapack_int lwork = -1;
  LAPACK_dgesvdx(&job, &job, &range, &m, &n, a, &lda, &vl, &vu, &il, &count, &ns, s, u, &ldu, vt,
                 &ldvt, &query, &lwork, iwork.get(), &info);
  WorkArray<double> work = QueriedWork(query, &lwork);
  if (!work) return status::kNoMemory;
  LAPACK_dgesvdx(&job, &job, &range, &m, &n, a, &lda, &vl, &vu, &il, &count, &ns, s, u, &ldu, vt,
                 &ldvt, work.get(), &lwork, iwork.get(), &info);
  return Done(Driver::kGesvdx, info);
}

StatusCode Gesvdx(lapack_int m, lapack_int n, Complex* a, lapack_int lda, lapack_int count,
                  double* s, Complex* u, lapack_int ldu, Complex* vt, lapack_int ldvt) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGesvdx, info);
  const int64_t k = std::min(m, n);
  WorkArray<lapack_int> iwork = AllocWorkUninit<lapack_int>(static_cast<size_t>(12 * k));
  WorkArray<double> rwork = AllocWorkUninit<double>(static_cast<size_t>(k * (k * 2 + 15 * k)));
  if (!iwork || !rwork) return status::kNoMemory;
  const char job = 'V', range = 'I';
  const double vl = 0.0, vu = 0.0;
  const lapack_int il = 1;
  lapack_int ns = 0;
  Complex query;
  lapack_int lwork = -1;
  LAPACK_zgesvdx(&job, &job, &range, &m, &n, a, &lda, &vl, &vu, &il, &count, &ns, s, u, &ldu, vt,
                 &ldvt, &query, &lwork, rwork.get(), iwork.get(), &info);
  WorkArray<Complex> work = QueriedWork(query, &lwork);
  if (!work) return status::kNoMemory;
  LAPACK_zgesvdx(&job, &job, &range, &m, &n, a, &lda, &vl, &vu, &il, &count, &ns, s, u, &ldu, vt,
                 &ldvt, work.get(), &lwork, rwork.get(), iwork.get(), &info);
  return Done(Driver::kGesvdx, info);
}

// ---- gelsd ----------------------------------------------------------------------------
// IWORK: (3 depth + 14) k with depth = floor(log2 k), k = min(m, n): enough for
// the divide-and-conquer tree of any block size.
StatusCode Gelsd(lapack_int m, lapack_int n, lapack_int nrhs, double* a, lapack_int lda,
                 double* b, lapack_int ldb, double* s, double rcond, lapack_int* rank) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGelsd, info);
  const int64_t k = std::min(m, n);
  const int64_t depth = static_cast<int64_t>(std::log(static_cast<double>(k)) / std::log(2.0));
  WorkArray<lapack_int> iwork = AllocWorkUninit<lapack_int>(static_cast<size_t>((3 * depth + 14) * k));
  if (!iwork) return status::kNoMemory;
  double query = 0.0;
  lapack_int lwork = -1;
  LAPACK_dgelsd(&m, &n, &nrhs, a, &lda, b, &ldb, s, &rcond, rank, &query, &lwork, iwork.get(),
                &info);
  WorkArray<double> work = QueriedWork(query, &lwork);
  if (!work) return status::kNoMemory;
  LAPACK_dgelsd(&m, &n, &nrhs, a, &lda, b, &ldb, s, &rcond, rank, work.get(), &lwork,
                iwork.get(), &info);
  return Done(Driver::kGelsd, info);
}

// ---- QR -------------------------------------------------------------------------------
StatusCode Geqrf(lapack_int m, lapack_int n, double* a, lapack_int lda, double* tau) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGeqrf, info);
  double query = 0.0;
  lapack_int lwork = -1;
  LAPACK_dgeqrf(&m, &n, a, &lda, tau, &query, &lwork, &info);
  WorkArray<double> work = QueriedWork(query, &lwork);
  if (!work) return status::kNoMemory;
  LAPACK_dgeqrf(&m, &n, a, &lda, tau, work.get(), &lwork, &info);
  return Done(Driver::kGeqrf, info);
}

StatusCode Geqrf(lapack_int m, lapack_int n, Complex* a, lapack_int lda, Complex* tau) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGeqrf, info);
  Complex query;
  lapack_int lwork = -1;
  LAPACK_zgeqrf(&m, &n, a, &lda, tau, &query, &lwork, &info);
  WorkArray<Complex> work = QueriedWork(query, &lwork);
  if (!work) return status::kNoMemory;
  LAPACK_zgeqrf(&m, &n, a, &lda, tau, work.get(), &lwork, &info);
  return Done(Driver::kGeqrf, info);
}

StatusCode ApplyQAdjoint(lapack_int m, lapack_int nrhs, lapack_int k, const double* a,
                         lapack_int lda, const double* tau, double* c, lapack_int ldc) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kUnmqr, info);
  const char side = 'L', trans = 'T';
  double query = 0.0;
  lapack_int lwork = -1;
  LAPACK_dormqr(&side, &trans, &m, &nrhs, &k, a, &lda, tau, c, &ldc, &query, &lwork, &info);
  WorkArray<double> work = QueriedWork(query, &lwork);
  if (!work) return status::kNoMemory;
  LAPACK_dormqr(&side, &trans, &m, &nrhs, &k, a, &lda, tau, c, &ldc, work.get(), &lwork, &info);
  return Done(Driver::kUnmqr, info);
}

StatusCode ApplyQAdjoint(lapack_int m, lapack_int nrhs, lapack_int k, const Complex* a,
                         lapack_int lda, const Complex* tau, Complex* c, lapack_int ldc) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kUnmqr, info);
  const char side = 'L', trans = 'C';
  Complex query;
  lapack_int lwork = -1;
  LAPACK_zunmqr(&side, &trans, &m, &nrhs, &k, a, &lda, tau, c, &ldc, &query, &lwork, &info);
  WorkArray<Complex> work = QueriedWork(query, &lwork);
  if (!work) return status::kNoMemory;
  LAPACK_zunmqr(&side, &trans, &m, &nrhs, &k, a, &lda, tau, c, &ldc, work.get(), &lwork, &info);
  return Done(Driver::kUnmqr, info);
}

// ---- eigenproblems --------------------------------------------------------------------
// LWORK 4n for DGEEV and 2n for ZGEEV, their documented minima when vectors are
// computed; no query.
int64_t GeevWorkSize(int32_t n, bool complex) { return (complex ? 2 : 4) * int64_t{n}; }

StatusCode Geev(char jobvl, lapack_int n, double* a, double* wr, double* wi, double* vl,
                double* work) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGeev, info);
  const char jobvr = 'N';
  const lapack_int lwork = static_cast<lapack_int>(GeevWorkSize(n, false));
  double unused = 0.0;
  LAPACK_dgeev(&jobvl, &jobvr, &n, a, &n, wr, wi, vl != nullptr ? vl : &unused, &n, &unused, &n,
               work, &lwork, &info);
  return Done(Driver::kGeev, info);
}

StatusCode Geev(char jobvl, lapack_int n, Complex* a, Complex* w, Complex* vl, Complex* work,
                double* rwork) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kGeev, info);
  const char jobvr = 'N';
  const lapack_int lwork = static_cast<lapack_int>(GeevWorkSize(n, true));
  Complex unused;
  LAPACK_zgeev(&jobvl, &jobvr, &n, a, &n, w, vl != nullptr ? vl : &unused, &n, &unused, &n, work,
               &lwork, rwork, &info);
  return Done(Driver::kGeev, info);
}

// Sized for JOBZ = 'V' whatever is asked. DSYEVD needs WORK >= 1 + 6n + 2n^2;
// ZHEEVD needs WORK >= 2n + n^2 and RWORK >= 1 + 5n + 2n^2. Both need
// IWORK >= 3 + 5n. Here: LIWORK = 5n + 3; LWORK = n trunc(2 (log2 n + 1) + 3n + 5)
// + 1 for DSYEVD and the RWORK of ZHEEVD, n trunc(2 (log2 n + 1) + n) + 1 for
// ZHEEVD's WORK.
StatusCode Syevd(char jobz, lapack_int n, double* a, double* w) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kSyevd, info);
  const int64_t lwork = LogWorkSize(n, 3.0, 5.0);
  const int64_t liwork = 5 * int64_t{n} + 3;
  if (lwork < 0 || liwork > std::numeric_limits<lapack_int>::max()) return status::kNoMemory;
  WorkArray<double> work = AllocWorkUninit<double>(static_cast<size_t>(lwork));
  WorkArray<lapack_int> iwork = AllocWorkUninit<lapack_int>(static_cast<size_t>(liwork));
  if (!work || !iwork) return status::kNoMemory;
  const char uplo = 'U';
  const lapack_int lw = static_cast<lapack_int>(lwork), liw = static_cast<lapack_int>(liwork);
  LAPACK_dsyevd(&jobz, &uplo, &n, a, &n, w, work.get(), &lw, iwork.get(), &liw, &info);
  return Done(Driver::kSyevd, info);
}

StatusCode Syevd(char jobz, lapack_int n, Complex* a, double* w) {
  lapack_int info = 0;
  if (Injected(&info)) return Failed(Driver::kSyevd, info);
  const int64_t lwork = LogWorkSize(n, 1.0, 0.0);
  const int64_t lrwork = LogWorkSize(n, 3.0, 5.0);
  const int64_t liwork = 5 * int64_t{n} + 3;
  if (lwork < 0 || lrwork < 0 || liwork > std::numeric_limits<lapack_int>::max()) {
    return status::kNoMemory;
  }
  WorkArray<Complex> work = AllocWorkUninit<Complex>(static_cast<size_t>(lwork));
  WorkArray<double> rwork = AllocWorkUninit<double>(static_cast<size_t>(lrwork));
  WorkArray<lapack_int> iwork = AllocWorkUninit<lapack_int>(static_cast<size_t>(liwork));
  if (!work || !rwork || !iwork) return status::kNoMemory;
  const char uplo = 'U';
  const lapack_int lw = static_cast<lapack_int>(lwork), lrw = static_cast<lapack_int>(lrwork),
                   liw = static_cast<lapack_int>(liwork);
  LAPACK_zheevd(&jobz, &uplo, &n, a, &n, w, work.get(), &lw, rwork.get(), &lrw, iwork.get(), &liw,
                &info);
  return Done(Driver::kSyevd, info);
}

}  // namespace lapack
