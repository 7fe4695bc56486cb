// Standard errors of exponential modes from the Cramer-Rao bound at the modes
// (see mode_errors.h for the models). The Jacobian is never held whole: its
// rows are made a block of samples at a time, beside the model and its
// residual, and folded into a triangular factor by one tpqrt per block, so
// the work memory is that of the P-by-P factor and one block whatever n is.
// The factor's SVD, after scaling its columns to unit norm, gives the bound
// and tells the determined directions from the undetermined ones.
#include "estimation/mode_errors.h"

#include <algorithm>
#include <cfloat>
#include <cmath>
#include <cstring>
#include <limits>

#include "core/scalar.h"
#include "numeric/lapack_boundary.h"
#include "numeric/work.h"

namespace {

constexpr double kTwoPi = 6.283185307179586;
// Samples per block of Jacobian rows. Within a block each mode advances by
// running products from an anchor computed afresh, so rounding cannot build
// up over a long record.
constexpr int32_t kBlockSamples = 2048;

// How one mode enters the model.
enum class Term : int32_t {
  kExponential,  // complex data: a e^{j phi} z^t, four parameters
  kCosine,       // real data: 2 a e^{alpha t} cos(w t + phi), four parameters
  kRealPole,     // real data, w = 0 or pi: a cos(phi) e^{alpha t}, amplitude and damping
  kPartner,      // real data with pairs: the conjugate of another mode, no parameters
};

int32_t Parameters(Term t) { return t == Term::kPartner ? 0 : (t == Term::kRealPole ? 2 : 4); }

bool Finite(double v) { return std::fabs(v) <= DBL_MAX; }

// A frequency of 0 or +-fs/2 (to a few ulps: the fits' poles on the negative
// real axis come back as pi fs / (2 pi)).
bool OnRealAxis(double f, double fs) {
  if (f == 0.0) return true;
  return std::fabs(2.0 * std::fabs(f) / fs - 1.0) <= 8.0 * DBL_EPSILON;
}

bool Conjugates(const ModeSet& m, int32_t i, int32_t j) {
  const double tol = kModePairTolerance;
  return std::fabs(m.frequency[i] + m.frequency[j]) <= tol * m.fs &&
         std::fabs(m.damping[i] - m.damping[j]) <= tol * (1.0 + std::fabs(m.damping[i]));
}

// The conjugate partner of mode i among the others, or -1.
int32_t PartnerOf(const ModeSet& m, int32_t i) {
  for (int32_t j = 0; j < m.count; ++j) {
    if (j != i && !OnRealAxis(m.frequency[j], m.fs) && Conjugates(m, i, j)) return j;
  }
  return -1;
}

// The term of mode i, and for a partner the mode whose errors it takes.
// kBadModes when a real record's mode has no partner.
StatusCode Classify(const ModeSet& m, bool complexData, bool pairs, int32_t i, Term* term,
                    int32_t* source) {
  *source = i;
  if (complexData) {
    *term = Term::kExponential;
    return status::kOk;
  }
  if (OnRealAxis(m.frequency[i], m.fs)) {
    *term = Term::kRealPole;
    return status::kOk;
  }
  *term = Term::kCosine;
  if (!pairs) return status::kOk;
  const int32_t j = PartnerOf(m, i);
  if (j < 0) return status::kBadModes;
  if (m.frequency[i] < 0.0) {
    *term = Term::kPartner;
    *source = j;
  }
  return status::kOk;
}

template <typename T>
StatusCode ModeErrors(const T* x, int32_t n, bool pairs, const ModeSet& m,
                      const ModeStdErrors& out) {
  constexpr bool cx = kIsComplex<T>;
  // The rows one sample adds to the Jacobian: its real and imaginary parts
  // for complex data.
  constexpr int32_t rowsPerSample = cx ? 2 : 1;
  const int32_t M = m.count;
  const size_t modes = static_cast<size_t>(M);

  WorkArray<Term> term = AllocWorkUninit<Term>(modes);
  WorkArray<int32_t> source = AllocWorkUninit<int32_t>(modes);
  WorkArray<int32_t> column = AllocWorkUninit<int32_t>(modes);
  if (!term || !source || !column) return status::kNoMemory;
  int32_t P = 0;
  for (int32_t i = 0; i < M; ++i) {
    const StatusCode s = Classify(m, cx, pairs, i, &term[i], &source[i]);
    if (s != status::kOk) return s;
    column[i] = P;
    P += Parameters(term[i]);
  }
  const size_t p = static_cast<size_t>(P);
  const int32_t blockRows = kBlockSamples * rowsPerSample;

  WorkArray<double> R = AllocWork<double>(p * p);
  WorkArray<double> rows = AllocWorkUninit<double>(static_cast<size_t>(blockRows) * p);
  WorkArray<Complex> u = AllocWorkUninit<Complex>(modes);     // e^{alpha t + j(w t + phi)}
  WorkArray<Complex> step = AllocWorkUninit<Complex>(modes);  // e^{alpha + j w}
  WorkArray<double> sv = AllocWorkUninit<double>(p);
  WorkArray<double> U = AllocWorkUninit<double>(p * p);
  WorkArray<double> VT = AllocWorkUninit<double>(p * p);
  WorkArray<double> norm = AllocWorkUninit<double>(p);
  WorkArray<double> variance = AllocWorkUninit<double>(p);
  WorkArray<unsigned char> undetermined = AllocWork<unsigned char>(p);
  if (!R || !rows || !u || !step || !sv || !U || !VT || !norm || !variance || !undetermined) {
    return status::kNoMemory;
  }

  const double perHz = kTwoPi / m.fs;  // d w / d f
  for (int32_t i = 0; i < M; ++i) {
    const double w = m.frequency[i] * perHz;
    step[i] = std::exp(m.damping[i]) * Complex(std::cos(w), std::sin(w));
  }

  double rss = 0.0;
  for (int32_t t0 = 0; t0 < n; t0 += kBlockSamples) {
    const int32_t count = std::min(kBlockSamples, n - t0);
    const int32_t ld = count * rowsPerSample;
    for (int32_t i = 0; i < M; ++i) {
      const double w = m.frequency[i] * perHz;
      const double angle = w * t0 + m.phase[i];
      u[i] = std::exp(m.damping[i] * t0) * Complex(std::cos(angle), std::sin(angle));
    }
    for (int32_t k = 0; k < count; ++k) {
      const double t = static_cast<double>(t0) + k;
      Complex model(0.0, 0.0);
      for (int32_t i = 0; i < M; ++i) {
        const double a = m.amplitude[i];
        const Complex v = u[i];
        double* c = rows.get() + static_cast<size_t>(column[i]) * ld + k * rowsPerSample;
        switch (term[i]) {
          case Term::kExponential: {
            // d/da = v, d/dphi = j a v, d/dalpha = t a v, d/df = j t a v dw/df;
            // the real part in row 2k, the imaginary part in row 2k + 1.
            const Complex av = a * v;
            model += av;
            c[0] = v.real();
            c[1] = v.imag();
            c[ld] = -av.imag();
            c[ld + 1] = av.real();
            c[2 * ld] = t * av.real();
            c[2 * ld + 1] = t * av.imag();
            c[3 * ld] = -t * perHz * av.imag();
            c[3 * ld + 1] = t * perHz * av.real();
            break;
          }
          case Term::kCosine: {
            const double cw = 2.0 * v.real(), sw = 2.0 * v.imag();
            model += a * cw;
            c[0] = cw;
            c[ld] = -a * sw;
            c[2 * ld] = t * a * cw;
            c[3 * ld] = -t * perHz * a * sw;
            break;
          }
          case Term::kRealPole:
            model += a * v.real();
            c[0] = v.real();
            c[ld] = t * a * v.real();
            break;
          case Term::kPartner:
            break;
        }
        u[i] = v * step[i];
      }
      const T r = x[t0 + k] - MakeScalar<T>(model.real(), model.imag());
      rss += AbsSquared(r);
    }
    const StatusCode s = lapack::Tpqrt(ld, P, R.get(), P, rows.get(), ld);
    if (s != status::kOk) return s;
    // A mode growing past the double range over the record: its model, and
    // so the residual, overflows.
    if (!Finite(rss)) return status::kNonFinite;
  }
  for (size_t j = 0; j < p * p; ++j) {
    if (!Finite(R[j])) return status::kNonFinite;
  }

  // Column norms of the Jacobian are those of R; scale them to 1.
  for (size_t j = 0; j < p; ++j) {
    double* col = R.get() + j * p;
    double sum = 0.0;
    for (size_t i = 0; i <= j; ++i) sum += col[i] * col[i];
    norm[j] = std::sqrt(sum);
    if (norm[j] > 0.0) {
      for (size_t i = 0; i <= j; ++i) col[i] /= norm[j];
    }
  }
  const StatusCode s = lapack::Gesdd('S', P, P, R.get(), P, sv.get(), U.get(), P, VT.get(), P);
  if (s != status::kOk) return s;

  const double dof = cx ? double(n) - 2.0 * M : double(n) - P;
  const double s2 = rss / dof;
  const double scale = cx ? 0.5 * s2 : s2;
  const double floor = kModeBoundRcond * sv[0];
  for (size_t j = 0; j < p; ++j) {
    double determined = 0.0, leak = 0.0;
    for (size_t k = 0; k < p; ++k) {
      const double v = VT[k + j * p];
      if (sv[k] > floor && sv[k] > 0.0) {
        const double q = v / sv[k];
        determined += q * q;
      } else {
        leak += v * v;
      }
    }
    undetermined[j] = norm[j] == 0.0 || leak > kModeBoundLeak;
    variance[j] = norm[j] > 0.0 ? scale * determined / (norm[j] * norm[j]) : 0.0;
  }

  StatusCode verdict = status::kOk;
  const double nan = std::numeric_limits<double>::quiet_NaN();
  double* const se[4] = {out.amplitude, out.phase, out.damping, out.frequency};
  // Parameter order within a mode: amplitude, phase, damping, frequency; a
  // real pole has amplitude and damping only.
  for (int32_t i = 0; i < M; ++i) {
    if (term[i] == Term::kPartner) continue;
    const size_t c0 = static_cast<size_t>(column[i]);
    const int32_t np = Parameters(term[i]);
    bool bad = false;
    for (int32_t q = 0; q < np; ++q) bad = bad || undetermined[c0 + q] != 0;
    if (bad) {
      verdict = status::kBoundSingular;
      for (double* e : se) e[i] = nan;
      continue;
    }
    if (np == 4) {
      for (int32_t q = 0; q < 4; ++q) se[q][i] = std::sqrt(variance[c0 + q]);
    } else {
      out.amplitude[i] = std::sqrt(variance[c0]);
      out.damping[i] = std::sqrt(variance[c0 + 1]);
      out.phase[i] = 0.0;
      out.frequency[i] = 0.0;
    }
  }
  for (int32_t i = 0; i < M; ++i) {
    if (term[i] != Term::kPartner) continue;
    for (double* e : se) e[i] = e[source[i]];
  }
  *out.noiseVariance = s2;
  return verdict;
}

}  // namespace

StatusCode ModeErrorsPlan(int32_t n, bool complexData, bool pairs, const ModeSet& modes,
                          int64_t* parameters) {
  *parameters = 0;
  for (int32_t i = 0; i < modes.count; ++i) {
    if (!Finite(modes.amplitude[i]) || !Finite(modes.phase[i]) || !Finite(modes.damping[i]) ||
        !Finite(modes.frequency[i])) {
      return status::kBadModes;
    }
  }
  int64_t P = 0;
  for (int32_t i = 0; i < modes.count; ++i) {
    Term term = Term::kExponential;
    int32_t source = 0;
    const StatusCode s = Classify(modes, complexData, pairs, i, &term, &source);
    if (s != status::kOk) return s;
    P += Parameters(term);
  }
  *parameters = P;
  // Complex data: 2n real observations for 4M parameters.
  const int64_t needed = complexData ? P / 2 : P;
  if (int64_t{n} <= needed) return status::kTooFewSamples;
  return status::kOk;
}

StatusCode ModeErrorsComplex(const Complex* x, int32_t n, const ModeSet& modes,
                             const ModeStdErrors& out) {
  return ModeErrors<Complex>(x, n, false, modes, out);
}

StatusCode ModeErrorsReal(const double* x, int32_t n, bool pairs, const ModeSet& modes,
                          const ModeStdErrors& out) {
  return ModeErrors<double>(x, n, pairs, modes, out);
}

double ModeErrorsWork(int32_t modes) {
  const double P = 4.0 * modes;
  return 8.0 * (8.0 * P * P + 2.0 * kBlockSamples * P + 16.0 * P) + 64.0 * modes;
}
