// How far outside its operands a BLAS reads. Each operand in turn is placed
// right after an inaccessible page and then right before one; a read outside
// it faults, and the fault address gives the distance. Prints one line per
// routine, operand and side that faulted, with the farthest distance seen and
// the stride it was seen with. Nothing printed but the totals: no read
// outside any operand.
//
//   d=/usr/lib/x86_64-linux-gnu/openblas-pthread
//   cc -O1 bench/blas_reach.c -o build/blas_reach -I/usr/include/x86_64-linux-gnu/openblas-pthread
//      -L$d -Wl,-rpath,$d -lopenblas
//   OPENBLAS_CORETYPE=Haswell build/blas_reach   # or SkylakeX, Zen, Sandybridge
//
// (The routines here never run past a fault: a faulting call is abandoned with
// siglongjmp, and OpenBLAS may warn that its buffer pool ran out.)
#define _GNU_SOURCE
#include <cblas.h>
#include <complex.h>
#include <setjmp.h>
#include <signal.h>
#include <stdint.h>
#include <stdio.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

static sigjmp_buf g_jump;
static volatile uintptr_t g_fault;
static long g_page;

static void OnFault(int sig, siginfo_t* info, void* context) {
  (void)sig;
  (void)context;
  g_fault = (uintptr_t)info->si_addr;
  siglongjmp(g_jump, 1);
}

// `bytes` of zeroed memory touching an inaccessible page after it (after = 1)
// or before it (after = 0). *base and *total are for munmap.
static char* AtEdge(size_t bytes, int after, char** base, size_t* total) {
  const size_t span = (bytes + g_page - 1) / g_page * g_page;
  *total = span + 2 * g_page;
  char* b = mmap(NULL, *total, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  mprotect(b, g_page, PROT_NONE);
  mprotect(b + g_page + span, g_page, PROT_NONE);
  *base = b;
  char* p = after ? b + g_page + span - bytes : b + g_page;
  memset(p, 0, bytes);
  return p;
}

enum { kRoutines = 14 };
static const char* kNames[kRoutines] = {"dgemv N", "dgemv T", "zgemv N", "zgemv T", "zgemv C",
                                        "ddot",    "zdotc",   "dcopy",   "zcopy",   "daxpy",
                                        "zaxpy",   "dznrm2",  "dgemm",   "zgemm"};
static const char* Operand(int r, int op) {
  static const char* gemv[3] = {"A", "x", "y"};
  static const char* level1[3] = {"x", "y", "-"};
  static const char* gemm[3] = {"A", "B", "C"};
  return (r <= 4 ? gemv : r >= 12 ? gemm : level1)[op];
}

struct Worst {
  long bytes;
  int inc;
  int seen;
};
static struct Worst g_worst[kRoutines][3][2];

// One call of routine r with operands p[3]; m, n the shape, inc the stride of
// the vector operands (gemv: x only), t a transpose flag for gemm.
static void Call(int r, int m, int n, int inc, int t, char** p) {
  const double complex one = 1, zero = 0;
  double complex dot;
  const int k = n;
  switch (r) {
    case 0:
    case 1:
      cblas_dgemv(CblasColMajor, r ? CblasTrans : CblasNoTrans, m, n, 1.0, (double*)p[0], m,
                  (double*)p[1], inc, 0.0, (double*)p[2], 1);
      break;
    case 2:
    case 3:
    case 4:
      cblas_zgemv(CblasColMajor,
                  r == 2   ? CblasNoTrans
                  : r == 3 ? CblasTrans
                           : CblasConjTrans,
                  m, n, &one, p[0], m, p[1], inc, &zero, p[2], 1);
      break;
    case 5:
      (void)cblas_ddot(n, (double*)p[0], inc, (double*)p[1], inc);
      break;
    case 6:
      cblas_zdotc_sub(n, p[0], inc, p[1], inc, &dot);
      break;
    case 7:
      cblas_dcopy(n, (double*)p[0], inc, (double*)p[1], inc);
      break;
    case 8:
      cblas_zcopy(n, p[0], inc, p[1], inc);
      break;
    case 9:
      cblas_daxpy(n, 2.0, (double*)p[0], inc, (double*)p[1], inc);
      break;
    case 10:
      cblas_zaxpy(n, &one, p[0], inc, p[1], inc);
      break;
    case 11:
      (void)cblas_dznrm2(n, p[0], inc);
      break;
    case 12:  // C (m x 3) = op(A) B, A m x k (t = 0) or k x m (t = 1), row-major
      cblas_dgemm(CblasRowMajor, t ? CblasTrans : CblasNoTrans, CblasNoTrans, m, 3, k, 1.0,
                  (double*)p[0], t ? m : k, (double*)p[1], 3, 0.0, (double*)p[2], 3);
      break;
    case 13:
      cblas_zgemm(CblasRowMajor, t ? CblasConjTrans : CblasNoTrans, CblasNoTrans, m, 3, k, &one,
                  p[0], t ? m : k, p[1], 3, &zero, p[2], 3);
      break;
  }
}

// The address of the first read outside memory in one call, or 0.
static uintptr_t FirstFault(int r, int m, int n, int inc, int t, char** p) {
  g_fault = 0;
  if (!sigsetjmp(g_jump, 1)) Call(r, m, n, inc, t, p);
  return g_fault;
}

int main(void) {
  g_page = sysconf(_SC_PAGESIZE);
  struct sigaction sa;
  memset(&sa, 0, sizeof sa);
  sa.sa_sigaction = OnFault;
  sa.sa_flags = SA_SIGINFO | SA_NODEFER;
  sigaction(SIGSEGV, &sa, NULL);
  static char spare[3][1 << 16];
  long calls = 0, faults = 0;
  for (int r = 0; r < kRoutines; ++r)
    for (int m = 1; m <= 13; ++m)
      for (int n = 1; n <= 13; ++n)
        for (int inc = -3; inc <= 3; ++inc) {
          const int gemm = r >= 12, level1 = r >= 5 && r < 12;
          if (inc == 0 || (gemm && inc != 1)) continue;  // gemm: no strides
          if ((gemm || level1) && m > 1) continue;       // one size loop (n) for these
          for (int t = 0; t < 2; ++t) {
            if (!gemm && t) continue;
            const int es =
                (r == 2 || r == 3 || r == 4 || r == 6 || r == 8 || r == 10 || r == 11 || r == 13)
                    ? 16
                    : 8;
            const int ai = inc < 0 ? -inc : inc;
            const int len = level1 ? 3 * n : n;  // level 1: lengths 1 to 39
            size_t size[3];
            int mm = gemm ? n : m;  // gemm: square-ish shapes n x n
            if (r <= 4) {
              const int lx = r == 0 || r == 2 ? n : m, ly = r == 0 || r == 2 ? m : n;
              size[0] = (size_t)m * n * es;
              size[1] = (size_t)((lx - 1) * ai + 1) * es;
              size[2] = (size_t)ly * es;
            } else if (level1) {
              size[0] = size[1] = (size_t)((len - 1) * ai + 1) * es;
              size[2] = es;
            } else {
              size[0] = (size_t)mm * n * es;
              size[1] = (size_t)n * 3 * es;
              size[2] = (size_t)mm * 3 * es;
            }
            for (int op = 0; op < 3; ++op)
              for (int after = 0; after < 2; ++after) {
                char* p[3];
                char* base = NULL;
                size_t total = 0;
                for (int q = 0; q < 3; ++q) {
                  if (q == op) {
                    p[q] = AtEdge(size[q], after, &base, &total);
                  } else {
                    p[q] = spare[q] + 4096;
                    memset(p[q], 0, size[q]);
                  }
                }
                ++calls;
                const uintptr_t fault = FirstFault(r, level1 ? 1 : mm, level1 ? len : n, inc, t, p);
                if (fault) {
                  ++faults;
                  // Distance from the operand's edge to the far end of the
                  // faulting access's page-aligned start: a lower bound of the
                  // reach, exact for the element-sized reads seen here.
                  const long d = after ? (long)(fault - (uintptr_t)(p[op] + size[op])) + es
                                       : (long)((uintptr_t)p[op] - fault);
                  struct Worst* w = &g_worst[r][op][after];
                  if (!w->seen || d > w->bytes) {
                    w->bytes = d;
                    w->inc = inc;
                  }
                  w->seen = 1;
                }
                munmap(base, total);
              }
          }
        }
  for (int r = 0; r < kRoutines; ++r)
    for (int op = 0; op < 3; ++op)
      for (int after = 0; after < 2; ++after) {
        const struct Worst* w = &g_worst[r][op][after];
        if (w->seen)
          printf("%-8s %-2s %s: up to %ld bytes (stride %d)\n", kNames[r], Operand(r, op),
                 after ? "past its end" : "before its start", w->bytes, w->inc);
      }
  printf("%ld calls, %ld read outside an operand\n", calls, faults);
  return 0;
}
