// Memory access policies of the generated kernels. A kernel body is written
// once over a value type T and is instantiated three ways:
//   ScalarAccess:      one transform (or butterfly) per call, T = double;
//   LaneAccess:        two transforms at once in the two lanes of a 16-byte
//                      vector, lane 1 a fixed number of doubles after lane 0;
//   InterleavedAccess: as LaneAccess for interleaved complex data (im = re + 1),
//                      loading each (re, im) pair with one 16-byte access.
// Lane offsets: li for loads, lo for stores, lb for the mirrored side of a
// real combining group (loads and stores), lw for twiddle loads. The vector
// type is GCC's generic one, so the code stays portable (SSE2 on x86-64).
#pragma once

#include <cstddef>
#include <cstring>

// On x86-64 ELF targets the exported kernels are built twice, for the
// baseline (SSE2) and for AVX, and the loader picks one per machine. The AVX
// build runs the same operations (no fused multiply-adds, so the same results)
// with three-operand instructions, which saves the register copies that the
// two-operand SSE2 forms need.
#if defined(__GNUC__) && defined(__x86_64__) && defined(__ELF__)
#define FFTK_CLONES __attribute__((target_clones("avx", "default")))
#else
#define FFTK_CLONES
#endif

namespace fftk {

typedef double V2 __attribute__((vector_size(16)));
typedef long long V2i __attribute__((vector_size(16)));

struct ScalarAccess {
  using T = double;
  static T Ld(const double* p) { return *p; }
  static T LdB(const double* p) { return *p; }
  static T LdW(const double* p) { return *p; }
  static void St(double* p, T v) { *p = v; }
  static void StB(double* p, T v) { *p = v; }
  static void LdC(const double* re, const double* im, T& r, T& i) {
    r = *re;
    i = *im;
  }
  static void StC(double* re, double* im, T r, T i) {
    *re = r;
    *im = i;
  }
};

struct LaneAccess {
  using T = V2;
  ptrdiff_t li, lo, lb, lw;
  T Ld(const double* p) const { return T{p[0], p[li]}; }
  T LdB(const double* p) const { return T{p[0], p[lb]}; }
  T LdW(const double* p) const { return T{p[0], p[lw]}; }
  void St(double* p, T v) const {
    p[0] = v[0];
    p[lo] = v[1];
  }
  void StB(double* p, T v) const {
    p[0] = v[0];
    p[lb] = v[1];
  }
  void LdC(const double* re, const double* im, T& r, T& i) const {
    r = T{re[0], re[li]};
    i = T{im[0], im[li]};
  }
  void StC(double* re, double* im, T r, T i) const {
    re[0] = r[0];
    re[lo] = r[1];
    im[0] = i[0];
    im[lo] = i[1];
  }
};

struct InterleavedAccess {
  using T = V2;
  ptrdiff_t li, lo, lb, lw;
  T LdW(const double* p) const { return T{p[0], p[lw]}; }
  void LdC(const double* re, const double*, T& r, T& i) const {
    V2 a, b;
    std::memcpy(&a, re, sizeof a);
    std::memcpy(&b, re + li, sizeof b);
    r = __builtin_shuffle(a, b, V2i{0, 2});
    i = __builtin_shuffle(a, b, V2i{1, 3});
  }
  void StC(double* re, double*, T r, T i) const {
    const V2 a = __builtin_shuffle(r, i, V2i{0, 2});
    const V2 b = __builtin_shuffle(r, i, V2i{1, 3});
    std::memcpy(re, &a, sizeof a);
    std::memcpy(re + lo, &b, sizeof b);
  }
};

}  // namespace fftk
