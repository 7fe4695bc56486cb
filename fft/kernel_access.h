// Memory access policies of the generated kernels. A kernel body is written
// once over a value type T and is instantiated once per policy:
//   ScalarAccess:      one transform (or butterfly) per call, T = double;
//   LaneAccess:        two transforms at once in the two lanes of a 16-byte
//                      vector, lane 1 a fixed number of doubles after lane 0;
//   InterleavedAccess: as LaneAccess for interleaved complex data (im = re + 1),
//                      loading each (re, im) pair with one 16-byte access;
//   Lane4Access, Interleaved4Access: the same with four lanes (wide variant).
// Lane offsets: li for loads, lo for stores, lb for the mirrored side of a
// real combining group (loads and stores), lw for twiddle loads. Tw0(x, v)
// gives the twiddled leg v, except in the lane of a butterfly 0, which keeps
// its untwiddled x. The vector types are GCC's generic ones, so the code stays
// portable (SSE2 on x86-64).
#pragma once

#include <cstddef>
#include <cstring>

#include "fft/wide_lanes.h"

// On x86-64 ELF targets every kernel but radix 2 also has a wide variant:
// the same DFT bodies compiled for AVX (a pragma region in each kernel file)
// that run four transforms (or butterflies) at once in 32-byte vectors,
// leaving the rest to the narrow forms. A kernel takes it at run time when the
// processor has AVX (fftk::WideLanes). The narrow forms' loops are themselves
// built for SSE2 and AVX and picked by the loader (target_clones), which saves
// the register copies of the two-operand SSE2 instructions. No fused
// multiply-adds anywhere, so every variant gives bit-identical results. Not
// on Windows: GCC there does not align the stack for 32-byte spills. Not with
// clang (the fuzzing build): it ignores the pragma regions, and clang 14 names
// the target_clones resolvers of C++ functions apart from their callers. Not
// under ThreadSanitizer: in an executable linked with the kernels the loader
// runs the resolvers, instrumented, before the sanitizer's run-time is up.
#if defined(__GNUC__) && !defined(__clang__) && defined(__x86_64__) && defined(__ELF__) && \
    !defined(__SANITIZE_THREAD__)
#define FFTK_WIDE 1
#define FFTK_CLONES __attribute__((target_clones("avx", "default")))
#else
#define FFTK_WIDE 0
#define FFTK_CLONES
#endif

// The DFT bodies of radix 8 and up stay out of line: inlined into a kernel's
// loops (GCC does so for a body called once), their loop-invariant leg
// offsets are hoisted and spilled, which costs more than the call, and most
// at small repeat counts.
#define FFTK_BODY __attribute__((noinline))

namespace fftk {

typedef double V2 __attribute__((vector_size(16)));
typedef long long V2i __attribute__((vector_size(16)));
typedef double V4 __attribute__((vector_size(32)));
typedef long long V4i __attribute__((vector_size(32)));

struct ScalarAccess {
  using T = double;
  static T Ld(const double* p) { return *p; }
  static T LdB(const double* p) { return *p; }
  static T LdW(const double* p) { return *p; }
  static T Tw0(T, T v) { return v; }
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
  static T Tw0(T, T v) { return v; }
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
  static T Tw0(T, T v) { return v; }
  void LdC(const double* re, const double*, T& r, T& i) const {
    V2 a, b;
    std::memcpy(&a, re, sizeof a);
    std::memcpy(&b, re + li, sizeof b);
    r = __builtin_shufflevector(a, b, 0, 2);
    i = __builtin_shufflevector(a, b, 1, 3);
  }
  void StC(double* re, double*, T r, T i) const {
    const V2 a = __builtin_shufflevector(r, i, 0, 2);
    const V2 b = __builtin_shufflevector(r, i, 1, 3);
    std::memcpy(re, &a, sizeof a);
    std::memcpy(re + lo, &b, sizeof b);
  }
};

#if FFTK_WIDE
// The four-lane policies pass 32-byte vectors by value, so they are compiled
// for AVX like the wide kernels that use them: a call that is not inlined
// (unoptimised or sanitizer builds) then follows the same calling convention
// on both sides.
#pragma GCC push_options
#pragma GCC target("avx")

// Four-lane forms for the wide variant; lane q is q offsets after lane 0.
struct Lane4Access {
  using T = V4;
  ptrdiff_t li, lo, lb, lw;
  // Lane 3 sits at l3 offsets: 3, or 2 to run three transforms (lanes 2 and 3
  // then read the same legs and write the same values to the same places,
  // which is harmless in place too, as every leg is read before any write).
  ptrdiff_t l3 = 3;
  T Gather(const double* p, ptrdiff_t d) const { return T{p[0], p[d], p[2 * d], p[l3 * d]}; }
  void Scatter(double* p, ptrdiff_t d, T v) const {
    p[0] = v[0];
    p[d] = v[1];
    p[2 * d] = v[2];
    p[l3 * d] = v[3];
  }
  T Ld(const double* p) const { return Gather(p, li); }
  T LdB(const double* p) const { return Gather(p, lb); }
  T LdW(const double* p) const { return Gather(p, lw); }
  static T Tw0(T, T v) { return v; }
  void St(double* p, T v) const { Scatter(p, lo, v); }
  void StB(double* p, T v) const { Scatter(p, lb, v); }
  void LdC(const double* re, const double* im, T& r, T& i) const {
    r = Gather(re, li);
    i = Gather(im, li);
  }
  void StC(double* re, double* im, T r, T i) const {
    Scatter(re, lo, r);
    Scatter(im, lo, i);
  }
};

// Interleaved complex data, four (re, im) pairs per pair of vectors. The
// in-lane unpacks leave the lanes in the order 0, 2, 1, 3, which is the order
// of a group in the grouped twiddle table (fft/plan.h), so a twiddle is one
// 32-byte load; the stores undo the order with the same unpacks. l3 as in
// Lane4Access.
struct Interleaved4Access {
  using T = V4;
  ptrdiff_t li, lo, lb, lw;
  ptrdiff_t l3 = 3;
  static V4 Join(const double* a, const double* b) {
    V2 x, y;
    std::memcpy(&x, a, sizeof x);
    std::memcpy(&y, b, sizeof y);
    return __builtin_shufflevector(x, y, 0, 1, 2, 3);
  }
  static void Split(double* a, double* b, V4 v) {
    const V2 x = __builtin_shufflevector(v, v, 0, 1);
    const V2 y = __builtin_shufflevector(v, v, 2, 3);
    std::memcpy(a, &x, sizeof x);
    std::memcpy(b, &y, sizeof y);
  }
  static T LdW(const double* p) {
    T v;
    std::memcpy(&v, p, sizeof v);
    return v;
  }
  static T Tw0(T, T v) { return v; }
  void LdC(const double* re, const double*, T& r, T& i) const {
    const V4 a = Join(re, re + li);
    const V4 b = Join(re + 2 * li, re + l3 * li);
    r = __builtin_shufflevector(a, b, 0, 4, 2, 6);
    i = __builtin_shufflevector(a, b, 1, 5, 3, 7);
  }
  void StC(double* re, double*, T r, T i) const {
    Split(re, re + lo, __builtin_shufflevector(r, i, 0, 4, 2, 6));
    Split(re + 2 * lo, re + l3 * lo, __builtin_shufflevector(r, i, 1, 5, 3, 7));
  }
};

// Lane4Access in a complex combining pass: lanes 0..3 are butterflies
// k..k+3, whose twiddles sit at places 0, 2, 1, 3 of their group.
struct Lane4TwAccess : Lane4Access {
  static T LdW(const double* p) { return T{p[0], p[2], p[1], p[3]}; }
};

// The first group of a combining pass: butterflies 0..3, where butterfly 0
// takes no twiddle. Its lane keeps the untwiddled value (so the result is
// exactly that of the plain DFT); its table entry (1, 0) is never used.
struct Lane4TwFirstAccess : Lane4TwAccess {
  static T Tw0(T x, T v) { return __builtin_shufflevector(x, v, 0, 5, 6, 7); }
};

// As Lane4TwFirstAccess, lanes in the order 0, 2, 1, 3 (butterfly 0 in lane 0).
struct Interleaved4FirstAccess : Interleaved4Access {
  static T Tw0(T x, T v) { return __builtin_shufflevector(x, v, 0, 5, 6, 7); }
};

#pragma GCC pop_options
#endif  // FFTK_WIDE

}  // namespace fftk
