// FFT plans: factorisation, stage tables (twiddles, prime tables, Rader data)
// and the process-wide list of shared plans with reference counts.
//
// The list and the counts are guarded by the plan mutex; everything built here
// is read-only once the plan is published, so transforms run without the lock.
// The one exception is the half-length plan of the even real transforms,
// attached on first use under the mutex and read through an atomic view.

#include <atomic>
#include <cmath>

#include "fft/plan.h"
#include "core/platform.h"
#include "fft/kernels/kernels.h"
#include "numeric/work.h"

namespace {

constexpr double kTwoPi = 6.283185307179586476925286766559;

// Head of the shared plan list (guarded by the plan mutex).
FftPlan* g_plan_head = nullptr;

template <typename T>
T* AllocRaw(size_t count) {
  return AllocWork<T>(count).release();  // zero-filled; null on failure
}

// cos(j*k*theta) and -sin(j*k*theta) for k = 1..count, written at stride
// `step`, by the trigonometric recurrence seeded from x = j*theta: the k = 1
// entry is (1 - alpha, -beta) with alpha = 2 sin^2(x/2), beta = sin(x).
void TwiddleRecurrence(double x, int64_t count, ptrdiff_t step, double* c_out, double* s_out) {
  const double half = std::sin(0.5 * x);
  const double alpha = 2.0 * half * half;
  const double beta = std::sin(x);
  double c = 1.0 - alpha;
  double s = -beta;
  for (int64_t k = 0; k < count; ++k) {
    if (k > 0) {
      const double next_c = c - (alpha * c - beta * s);
      const double next_s = s - (alpha * s + beta * c);
      c = next_c;
      s = next_s;
    }
    c_out[k * step] = c;
    s_out[k * step] = s;
  }
}

// Smallest g >= 2 of multiplicative order r - 1 modulo r; 1 when none is found.
int32_t PrimitiveRoot(int32_t r) {
  for (int32_t g = 2; g < r; ++g) {
    int64_t power = g;
    int32_t order = 1;
    while (power != 1) {
      power *= g;
      while (power >= r) power -= r;
      ++order;
    }
    if (order == r - 1) return g;
  }
  return 1;
}

void FreeStage(FftStage* st) {
  if (st == nullptr) return;
  (void)NumFree(st->primeCos);
  (void)NumFree(st->primeSin);
  (void)NumFree(st->twCos);
  (void)NumFree(st->twSin);
  (void)NumFree(st->twGrouped);
  FftPlanReleaseLocked(st->raderPlan);
  (void)NumFree(st->raderKernelRe);
  (void)NumFree(st->raderKernelIm);
  (void)NumFree(st->raderIndex);
  (void)NumFree(st->raderInverseIndex);
  (void)NumFree(st);
}

void FreePlan(FftPlan* plan) {
  for (int32_t s = 0; s < plan->factorCount; ++s) FreeStage(plan->stage[s]);
  FftPlanReleaseLocked(plan->half);
  (void)NumFree(plan->halfCos);
  (void)NumFree(plan->halfSin);
  (void)NumFree(plan);
}

// Index tables, generator, sub-plan and transformed kernel of a Rader stage.
StatusCode BuildRader(FftStage* st, int32_t r) {
  st->raderPlan = FftPlanAcquireLocked(r - 1);
  st->raderKernelRe = AllocRaw<double>(r - 1);
  st->raderKernelIm = AllocRaw<double>(r - 1);
  st->raderIndex = AllocRaw<int32_t>(r);
  st->raderInverseIndex = AllocRaw<int32_t>(r);
  WorkArray<double> h_re = AllocWork<double>(r - 1);
  WorkArray<double> h_im = AllocWork<double>(r - 1);
  if (!st->raderPlan || !st->raderKernelRe || !st->raderKernelIm || !st->raderIndex ||
      !st->raderInverseIndex || !h_re || !h_im) {
    return status::kNoMemory;
  }
  const int32_t g = PrimitiveRoot(r);
  // raderInverseIndex = 0, 1, g, ..., g^(r-2); raderIndex = 0, 1, g^(r-2), ..., g.
  st->raderInverseIndex[0] = 0;
  st->raderIndex[0] = 0;
  int64_t power = 1;
  for (int32_t q = 0; q <= r - 2; ++q) {
    st->raderInverseIndex[1 + q] = static_cast<int32_t>(power);
    st->raderIndex[q == 0 ? 1 : r - q] = static_cast<int32_t>(power);
    power = power * g % r;
  }
  // Kernel h_q = exp(-2 pi i g^-q / r), transformed once and scaled by 1/(r-1).
  for (int32_t q = 0; q <= r - 2; ++q) {
    const double angle = kTwoPi * st->raderIndex[1 + q] / r;
    h_re[q] = std::cos(angle);
    h_im[q] = -std::sin(angle);
  }
  const StatusCode st_fft = FftComplex(st->raderPlan, h_re.get(), h_im.get(), st->raderKernelRe,
                                       st->raderKernelIm, 1, 1, r - 1);
  if (st_fft < 0) return st_fft;
  const double scale = 1.0 / (r - 1);
  for (int32_t q = 0; q <= r - 2; ++q) {
    st->raderKernelRe[q] *= scale;
    st->raderKernelIm[q] *= scale;
  }
  return status::kOk;
}

// The grouped table of a kernel stage (FftStage::twGrouped) from its plain one.
StatusCode GroupTwiddles(FftStage* stage, int32_t r, int64_t m) {
  const int64_t tw = r - 1;
  const int64_t groups = (m + 3) / 4;
  double* g = AllocRaw<double>(static_cast<size_t>(8 * tw * groups));
  if (g == nullptr) return status::kNoMemory;
  for (int64_t k = 0; k < 4 * groups; ++k) {
    double* at = g + (k / 4) * 8 * tw + (k % 2) * 2 + (k % 4) / 2;
    for (int64_t j = 1; j <= tw; ++j) {
      const bool inside = k >= 1 && k < m;
      at[8 * (j - 1)] = inside ? stage->twCos[(k - 1) * tw + (j - 1)] : 1.0;
      at[8 * (j - 1) + 4] = inside ? stage->twSin[(k - 1) * tw + (j - 1)] : 0.0;
    }
  }
  stage->twGrouped = g;
  return status::kOk;
}

// Allocates and fills a plan of length n >= 1; null when memory ran out.
FftPlan* CreatePlan(int32_t n) {
  FftPlan* plan = AllocRaw<FftPlan>(1);
  if (plan == nullptr) return nullptr;
  plan->n = n;
  plan->factorCount = FftFactorize(n, plan->factor, plan->kind);
  const int32_t fc = plan->factorCount;
  if (n >= kFftLeafFirstMin && fc >= 3 && plan->kind[fc - 1] == kFftKindKernel &&
      plan->factor[0] < 4) {
    // The leaf pass runs the first factor's leaves in the lanes of one kernel
    // call: a first factor below 4 would leave lanes empty, so the largest
    // middle factor goes first and the small one takes its place.
    int32_t big = 1;
    for (int32_t s = 2; s < fc - 1; ++s) {
      if (plan->factor[s] > plan->factor[big]) big = s;
    }
    const int32_t f = plan->factor[0], k = plan->kind[0];
    plan->factor[0] = plan->factor[big];
    plan->kind[0] = plan->kind[big];
    plan->factor[big] = f;
    plan->kind[big] = k;
  }
  for (int32_t s = 0; s < plan->factorCount; ++s) {
    plan->stage[s] = AllocRaw<FftStage>(1);
    if (plan->stage[s] == nullptr) {
      FreePlan(plan);
      return nullptr;
    }
  }
  StatusCode st = status::kOk;
  int64_t len = n;  // N_s
  for (int32_t s = 0; s < plan->factorCount && st == status::kOk; ++s) {
    const int32_t r = plan->factor[s];
    const int64_t m = len / r;
    FftStage* stage = plan->stage[s];
    if (plan->kind[s] == kFftKindKernel) {
      plan->realLeaf[s] = kFftRealLeaf[r];
      plan->realTwiddle[s] = kFftRealTwiddle[r];
      plan->complexLeaf[s] = kFftComplexLeaf[r];
      plan->complexTwiddle[s] = kFftComplexTwiddle[r];
    }
    if (s + 1 < plan->factorCount) {
      const size_t count = static_cast<size_t>(r - 1) * static_cast<size_t>(m - 1);
      stage->twCos = AllocRaw<double>(count);
      stage->twSin = AllocRaw<double>(count);
      if (stage->twCos == nullptr || stage->twSin == nullptr) {
        st = status::kNoMemory;
        break;
      }
      const double theta = kTwoPi / static_cast<double>(len);
      for (int32_t j = 1; j < r; ++j) {
        TwiddleRecurrence(j * theta, m - 1, r - 1, stage->twCos + (j - 1), stage->twSin + (j - 1));
      }
      if (plan->kind[s] == kFftKindKernel) {
        st = GroupTwiddles(stage, r, m);
        if (st != status::kOk) break;
        // The plain table stays for the real kernels, which only odd and short
        // n reach (longer even real lengths run on the half-length plan).
        if (n % 2 == 0 && n >= kFftRealByHalfMin) {
          (void)NumFree(stage->twCos);
          (void)NumFree(stage->twSin);
          stage->twCos = stage->twSin = nullptr;
        }
      }
    }
    if (plan->kind[s] == kFftKindGeneric) {
      stage->primeCos = AllocRaw<double>(r);
      stage->primeSin = AllocRaw<double>(r);
      if (stage->primeCos == nullptr || stage->primeSin == nullptr) {
        st = status::kNoMemory;
        break;
      }
      stage->primeCos[0] = 1.0;
      stage->primeSin[0] = 0.0;
      TwiddleRecurrence(kTwoPi / r, r - 1, 1, stage->primeCos + 1, stage->primeSin + 1);
    } else if (plan->kind[s] == kFftKindRader) {
      st = BuildRader(stage, r);
    }
    len = m;
  }
  if (st != status::kOk) {
    FreePlan(plan);
    return nullptr;
  }
  return plan;
}

}  // namespace

int32_t FftFactorize(int32_t n, int32_t* factor, int32_t* kind) {
  int32_t count = 0;
  int32_t rest = n;
  for (int32_t r : kFftRadixOrder) {  // the generator's order, with its kernels
    if (rest == 1) break;
    while (rest % r == 0) {
      factor[count] = r;
      kind[count] = kFftKindKernel;
      ++count;
      rest /= r;
    }
  }
  if (rest != 1) {
    if (rest >= 9) {
      // d <= rest / d: d * d would overflow for a prime rest near 2^31.
      for (int32_t d = 3; d <= rest / d; d += 2) {
        while (rest % d == 0) {
          factor[count] = d;
          kind[count] = d < 50 ? kFftKindGeneric : kFftKindRader;
          ++count;
          rest /= d;
        }
      }
    }
    if (rest != 1) {
      factor[count] = rest;
      kind[count] = rest < 50 ? kFftKindGeneric : kFftKindRader;
      ++count;
    }
  }
  // Ascending order, kinds carried along (exchange sort).
  for (int32_t i = 0; i < count; ++i) {
    for (int32_t j = i + 1; j < count; ++j) {
      if (factor[j] < factor[i]) {
        const int32_t f = factor[i], k = kind[i];
        factor[i] = factor[j];
        kind[i] = kind[j];
        factor[j] = f;
        kind[j] = k;
      }
    }
  }
  return count;
}

FftPlan* FftPlanAcquireLocked(int32_t n) {
  if (n < 1) return nullptr;
  for (FftPlan* p = g_plan_head; p != nullptr; p = p->next) {
    if (p->n == n) {
      ++p->refCount;
      return p;
    }
  }
  FftPlan* plan = CreatePlan(n);
  if (plan == nullptr) return nullptr;
  plan->refCount = 1;
  plan->prev = nullptr;
  plan->next = g_plan_head;
  if (g_plan_head != nullptr) g_plan_head->prev = plan;
  g_plan_head = plan;
  return plan;
}

void FftPlanReleaseLocked(FftPlan* plan) {
  if (plan == nullptr) return;
  if (--plan->refCount > 0) return;
  if (plan->prev != nullptr) {
    plan->prev->next = plan->next;
  } else {
    g_plan_head = plan->next;
  }
  if (plan->next != nullptr) plan->next->prev = plan->prev;
  FreePlan(plan);
}

FftPlan* FftRealHalf(const FftPlan* plan) {
  // The plan is shared read-only; `half` is its one field written after it
  // was published, always under the mutex, and read through an atomic view.
  FftPlan* owner = const_cast<FftPlan*>(plan);
  std::atomic_ref<FftPlan*> half(owner->half);
  FftPlan* h = half.load(std::memory_order_acquire);
  if (h != nullptr || plan->n % 2 != 0) return h;
  platform::PlanMutexLock();
  h = half.load(std::memory_order_relaxed);
  if (h == nullptr) {
    const int32_t n = plan->n;
    const int32_t quarter = n / 4;
    double* c = AllocRaw<double>(static_cast<size_t>(quarter) + 1);
    double* s = AllocRaw<double>(static_cast<size_t>(quarter) + 1);
    FftPlan* sub = c != nullptr && s != nullptr ? FftPlanAcquireLocked(n / 2) : nullptr;
    if (sub == nullptr) {
      (void)NumFree(c);
      (void)NumFree(s);
    } else {
      // Direct values: the table is read at every k, so no recurrence error
      // is allowed to build up along it.
      for (int32_t k = 0; k <= quarter; ++k) {
        const double angle = kTwoPi * static_cast<double>(k) / static_cast<double>(n);
        c[k] = std::cos(angle);
        s[k] = -std::sin(angle);
      }
      owner->halfCos = c;
      owner->halfSin = s;
      h = sub;
      half.store(sub, std::memory_order_release);
    }
  }
  platform::PlanMutexUnlock();
  return h;
}

FftPlan* FftPlanAcquire(int32_t n) {
  platform::PlanMutexLock();
  FftPlan* plan = FftPlanAcquireLocked(n);
  platform::PlanMutexUnlock();
  return plan;
}

void FftPlanRelease(FftPlan* plan) {
  if (plan == nullptr) return;
  platform::PlanMutexLock();
  FftPlanReleaseLocked(plan);
  platform::PlanMutexUnlock();
}
