// An illegal argument reaching LAPACK or CBLAS must not end the process: the
// Windows build's error handlers return, LAPACK reports the argument through
// INFO and CBLAS leaves the output untouched. The reference handlers would
// end the process, possibly with exit code 0, so each check runs in a child
// process that must reach its own exit code 42 (a death test).
#include <gtest/gtest.h>

#include <complex>
#include <cstdlib>
#include <vector>

#include "numeric/lapack_api.h"

namespace {

constexpr int kReachedTheEnd = 42;

void IllegalSvdArguments() {
  struct Case {
    const char* what;
    lapack_int m, n, lda;
    lapack_int expected;  // -(position of the first illegal argument)
  };
  const Case cases[] = {
      {"negative row count", -1, 3, 3, -2},
      {"negative column count", 3, -2, 3, -3},
      {"leading dimension below the rows", 4, 3, 2, -5},
  };
  for (const Case& c : cases) {
    std::vector<double> a(16, 1.0), s(4), u(16), vt(16), work(64);
    std::vector<lapack_int> iwork(32);
    const char jobz = 'A';
    const lapack_int ldu = 4, ldvt = 4, lwork = 64;
    lapack_int info = 0;
    LAPACK_dgesdd(&jobz, &c.m, &c.n, a.data(), &c.lda, s.data(), u.data(), &ldu, vt.data(), &ldvt,
                  work.data(), &lwork, iwork.data(), &info);
    if (info != c.expected) std::exit(1);

    std::vector<std::complex<double>> z(16, {1.0, 0.5}), zu(16), zvt(16), zwork(64);
    std::vector<double> rwork(128);
    info = 0;
    LAPACK_zgesdd(&jobz, &c.m, &c.n, z.data(), &c.lda, s.data(), zu.data(), &ldu, zvt.data(), &ldvt,
                  zwork.data(), &lwork, rwork.data(), iwork.data(), &info);
    if (info != c.expected) std::exit(2);
  }
  std::exit(kReachedTheEnd);
}

void IllegalProductArguments() {
  const double a[4] = {1, 2, 3, 4}, b[4] = {5, 6, 7, 8};
  double c[4] = {-1, -1, -1, -1};
  // Row-major with lda below the column count.
  cblas_dgemm(CblasRowMajor, CblasNoTrans, CblasNoTrans, 2, 2, 2, 1.0, a, 1, b, 2, 0.0, c, 2);
  for (double v : c)
    if (v != -1.0) std::exit(1);
  // Layout value out of range.
  cblas_dgemm(static_cast<CBLAS_LAYOUT>(7), CblasNoTrans, CblasNoTrans, 2, 2, 2, 1.0, a, 2, b, 2,
              0.0, c, 2);
  for (double v : c)
    if (v != -1.0) std::exit(2);
  // And a legal call still computes.
  cblas_dgemm(CblasRowMajor, CblasNoTrans, CblasNoTrans, 2, 2, 2, 1.0, a, 2, b, 2, 0.0, c, 2);
  if (c[0] != 19.0 || c[3] != 50.0) std::exit(3);
  std::exit(kReachedTheEnd);
}

TEST(LapackErrors, IllegalArgumentComesBackThroughInfo) {
  EXPECT_EXIT(IllegalSvdArguments(), ::testing::ExitedWithCode(kReachedTheEnd), "");
}

TEST(LapackErrors, IllegalProductArgumentLeavesTheOutputUntouched) {
  EXPECT_EXIT(IllegalProductArguments(), ::testing::ExitedWithCode(kReachedTheEnd), "");
}

}  // namespace
