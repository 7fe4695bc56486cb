// Model order by minimum description length: one reduced matrix pencil for the
// largest order, then for each candidate m the poles of its leading m x m block,
// the least-squares amplitudes and the fit error E, scored as
//   D(m) = n ln E + 10 m ln n.
// The lowest score below 10000 wins; the first order that fits to within
// machine precision ends the search at once.
#include <cmath>
#include <cstddef>
#include <cstring>
#include <type_traits>

#include "estimation/estimation.h"
#include "estimation/twins.h"
#include "numeric/numeric.h"
#include "numeric/work.h"

namespace {

using namespace twin;

constexpr double kPenalty = 10.0;        // weight of m ln n
constexpr double kStartScore = 10000.0;  // a score must fall below this to be chosen
constexpr double kPerfectFit = 2.2e-16;  // |E| below this stops the search

template <typename T>
StatusCode MdlOrder(const T* x, int32_t n, int32_t L, int32_t minOrder, int32_t* order) {
  if constexpr (kIsComplex<T>) {
    // The complex form leaves minOrder to its entry point and reports a bad upper
    // order with the general order code.
    if (n < 1) return status::kEmptyInput;
    if (L < 1 || L > MaxOrder(n)) return status::kBadOrder;
  } else {
    if (n < 1) return status::kEmptyInput;
    if (minOrder < 1) return status::kBadMinOrder;
    if (L <= minOrder || L > MaxOrder(n)) return status::kBadMdlUpper;
  }

  // A pencil parameter of exactly n/2 is moved one below it.
  const int32_t Lp = (L == n / 2) ? L - 1 : L;
  const int32_t r = (n - Lp) < Lp ? (n - Lp) : Lp;

  // The real form builds the pencil with parameter and order r; the complex form
  // with L' for both, which yields the same r x r size (the leading L' x L' block
  // when r = L', the whole r x r matrix when n - L' < L'), but from a pencil with
  // L' columns rather than r.
  int32_t pencilL = r;
  if constexpr (kIsComplex<T>) pencilL = Lp;

  const size_t rr = static_cast<size_t>(r > 0 ? r : 0);
  auto K = AllocWork<T>(static_cast<size_t>(pencilL > 0 ? pencilL : 0) *
                        static_cast<size_t>(pencilL > 0 ? pencilL : 0));
  auto block = AllocWork<T>(rr * rr);
  auto poles = AllocWork<Complex>(rr);
  auto amplitudes = AllocWork<Complex>(rr);
  if (!K || !block || !poles || !amplitudes) return status::kNoMemory;

  StatusCode st = PencilMatrix(x, n, pencilL, pencilL, K.get());
  if (st != status::kOk) return st;

  double best = kStartScore;
  const double c = kPenalty * std::log(static_cast<double>(n));
  for (int32_t m = minOrder; m <= r; ++m) {
    // Leading m x m block of K (row stride r), packed.
    for (int32_t i = 0; i < m; ++i) {
      std::memcpy(block.get() + static_cast<size_t>(i) * static_cast<size_t>(m),
                  K.get() + static_cast<size_t>(i) * rr, static_cast<size_t>(m) * sizeof(T));
    }
    st = EigenvaluesOf(block.get(), m, poles.get());
    if (st != status::kOk) return st;
    double E = 0.0;
    st = ModeAmplitudes(x, n, poles.get(), m, amplitudes.get(), &E);
    if (st != status::kOk) return st;
    if (std::fabs(E) < kPerfectFit) {
      *order = m;
      break;
    }
    const double D = static_cast<double>(n) * std::log(E) + static_cast<double>(m) * c;
    if (D < best) {  // strict: ties keep the smaller order, NaN never wins
      best = D;
      *order = m;
    }
  }
  return status::kOk;
}

}  // namespace

StatusCode MdlOrderReal(const double* x, int32_t n, int32_t L, int32_t minOrder, int32_t* order) {
  return MdlOrder<double>(x, n, L, minOrder, order);
}
StatusCode MdlOrderComplex(const Complex* x, int32_t n, int32_t L, int32_t minOrder,
                           int32_t* order) {
  return MdlOrder<Complex>(x, n, L, minOrder, order);
}
