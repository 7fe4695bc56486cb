/* The C call floor of the plain API: the time of one tiny fit (covariance AR
 * and Prony of order 2 on 32 real samples, the matrix pencil with 2 modes),
 * called directly, to set against the same calls from Python
 * (bench/python_overhead.py). Prints one line per fit: name and microseconds. */
#include <math.h>
#include <stdio.h>
#include <time.h>

#include "qdm_api.h"

static double Now(void) {
  struct timespec t;
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &t); /* CPU time: steady on a shared machine */
  return (double)t.tv_sec + 1e-9 * (double)t.tv_nsec;
}

int main(void) {
  enum { kN = 32, kCalls = 100000, kRounds = 5 };
  double x[kN], coef[3], nv, amp[2], ph[2], dmp[2], fr[2], mse;
  qdm_complex poles[2];
  int32_t modes;
  for (int t = 0; t < kN; ++t) x[t] = cos(0.7 * t) * exp(-0.01 * t) + 0.01 * sin(3.1 * t * t);
  const char* names[] = {"covariance", "prony", "matrix_pencil"};
  for (int fit = 0; fit < 3; ++fit) {
    double best = 1e30;
    for (int r = 0; r < kRounds; ++r) {
      double t0 = Now();
      int32_t s = 0;
      for (int i = 0; i < kCalls; ++i) {
        if (fit == 0) s |= qdm_covariance_real(x, kN, 2, coef, poles, &nv);
        if (fit == 1) s |= qdm_prony_real(x, kN, 2, 1.0, 0, amp, ph, dmp, fr, &modes);
        if (fit == 2)
          s |= qdm_matrix_pencil_real(x, kN, kN / 3, 2, 1.0, 0, amp, ph, dmp, fr, &modes, &mse);
      }
      double us = (Now() - t0) / kCalls * 1e6;
      if (s != 0) {
        fprintf(stderr, "%s: status %d\n", names[fit], s);
        return 1;
      }
      if (us < best) best = us;
    }
    printf("%s %.3f\n", names[fit], best);
  }
  return 0;
}
