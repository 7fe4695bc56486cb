// qdm: the command-line tool over the plain C API (libqdm_api). One method per run on a CSV
// file, standard input or the built-in example; a table, JSON or CSV on standard output, and a
// plot drawn with gnuplot. With several files (or --jobs) the records of each length and
// type go to the library's batch call on --jobs threads, a chunk of files at a time, and
// are printed as JSON lines, in input order. Exit status: 0 success, 1 bad usage,
// input or value (a -424xx library status included), 2 the fit failed (any other library
// status, or no memory; several files: any record failed), 3 an output not written.
#include <algorithm>
#include <atomic>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <functional>
#include <map>
#include <memory>
#include <new>
#include <optional>
#include <string>
#include <thread>
#include <tuple>
#include <utility>
#include <vector>

#include "CLI/CLI.hpp"
#include "example_signal.h"
#include "nlohmann/json.hpp"
#include "qdm_api.h"
#include "tool.h"

namespace {

using namespace qdm_cli;
using Json = nlohmann::ordered_json;
constexpr auto kReplace = Json::error_handler_t::replace;  // invalid UTF-8 becomes U+FFFD
constexpr double kPi = 3.14159265358979323846;

enum Method {
  kCovariance,
  kProny,
  kPcar,
  kPencil,
  kMdl,
  kCovSpectrum,
  kPcarSpectrum,
  kStabilization
};
constexpr unsigned Bit(Method m) { return 1u << m; }
constexpr unsigned kSpectra = Bit(kCovSpectrum) | Bit(kPcarSpectrum);
constexpr unsigned kModal = Bit(kProny) | Bit(kPencil) | Bit(kPcarSpectrum);

constexpr const char* kMethods[][2] = {
    // name, title
    {"covariance", "covariance-method AR: coefficients, poles, noise variance"},
    {"prony", "Prony damped exponentials"},
    {"pcar", "principal-component AR: coefficients and roots"},
    {"pencil", "matrix pencil damped exponentials"},
    {"mdl", "minimum description length model order"},
    {"covspectrum", "covariance-method AR power spectrum"},
    {"pcarspectrum", "principal-component AR power spectrum and its modes"},
    {"stabilization",
     "stabilization diagram: pencil poles across model orders, stable ones marked"},
};

// Everything the command line sets; unset parameters take the method's default.
struct Options {
  std::optional<int32_t> order, components, pencil, modes, upper, minOrder, nfft, maxOrder;
  std::optional<double> rate, freqTol, dampingTol;
  bool realSignal = false, json = false, csv = false;
  bool noSort = false, oneSided = false, twoSided = false, ignoreUnknown = false;
  std::string example, plot, columns, delimiter = ",", solver = "auto";
  uint64_t maxInputBytes = uint64_t{1} << 30;
  std::vector<std::string> files;
  int jobs = 1;
  CsvFormat format;  // from columns, delimiter and maxInputBytes
};

// The integer parameters, and the methods each applies to.
struct IntOption {
  const char* flag;
  const char* key;
  std::optional<int32_t> Options::*field;
  int32_t fallback;  // pencil and upper: from n, prony's order: 6
  const char* help;
  unsigned methods;
};
const IntOption kIntOptions[] = {
    {"--order", "order", &Options::order, 12, "model order p [12; prony 6]",
     Bit(kCovariance) | Bit(kProny) | Bit(kPcar) | kSpectra},
    {"--components", "components", &Options::components, 6, "singular components / modes k [6]",
     Bit(kPcar) | Bit(kPcarSpectrum)},
    {"--pencil", "pencil", &Options::pencil, 0,
     "pencil parameter L [n/3; mdl: min(n/3, 64), at least 2; stabilization: max(n/3, "
     "max-order)]",
     Bit(kPencil) | Bit(kMdl) | Bit(kStabilization)},
    {"--modes", "modes", &Options::modes, 6, "number of modes M [6]", Bit(kPencil)},
    {"--upper", "upper", &Options::upper, 0, "the old name of --pencil for mdl", Bit(kMdl)},
    {"--min-order", "min_order", &Options::minOrder, 1, "smallest order tried [1]",
     Bit(kMdl) | Bit(kStabilization)},
    {"--nfft,--points", "nfft", &Options::nfft, 512,
     "spectrum length over the full circle, rounded up to a power of two (--points: its old "
     "name) [512]",
     kSpectra},
    {"--max-order", "max_order", &Options::maxOrder, 20, "highest order fitted [20]",
     Bit(kStabilization)},
};

Signal Load(const std::string& path, const Options& o) {
  if (!o.example.empty()) {
    Signal s;
    s.complex = o.example == "complex";
    s.values = qdm_example::Make(s.complex);
    s.n = qdm_example::kLength;
    s.defaultRate = qdm_example::kRate;
    return s;
  }
  if (path == "-") return ReadCsv(stdin, "standard input", o.format);
  std::FILE* in = std::fopen(path.c_str(), "rb");
  if (in == nullptr) Bad("cannot read " + Shown(path, kNameShown) + ": " + std::strerror(errno));
  try {
    Signal s = ReadCsv(in, path, o.format);
    std::fclose(in);
    return s;
  } catch (...) {
    std::fclose(in);
    throw;
  }
}

// One fit: the record (input, method, signal, parameters, status, results) and
// the spectrum, which stays out of the JSON tree and is written as a stream.
// Its implicit members only construct, move and destroy the members; the
// exception check follows a throw it cannot rule out inside the JSON library.
// NOLINTNEXTLINE(bugprone-exception-escape)
struct Record {
  Json json;
  int32_t status = QDM_OK;
  std::string warning;
  // The spectrum's columns, in the order of kSpectrumColumns; psd may be null.
  std::unique_ptr<double[]> frequency, spectrum, psd;
  size_t spectrumLength = 0;
  const double* Column(size_t c) const {
    return c == 0 ? frequency.get() : c == 1 ? spectrum.get() : psd.get();
  }
};
// The spectrum's columns: CSV header, JSON key (the arrays are written as streams).
constexpr const char* kSpectrumColumns[] = {"frequency_hz", "power_db", "psd_per_hz"};

// A value the library refuses (an argument error, -424xx) is bad input, exit 1;
// any other error status is a failed fit, exit 2. The message carries the status
// and, for a refusal, the library's words for it: the argument (as the C header
// names it), its value and the limit it broke.
bool Refused(int32_t status) { return status <= -42401 && status >= -42499; }

Failure Refusal(int32_t status, const char* function, bool complex, const char* words) {
  const bool refused = Refused(status);
  return Failure{refused ? kUsage : kFailed, status,
                 function + std::string(complex ? "_complex" : "_real") + " returned " +
                     std::to_string(status) + ": " +
                     (refused && words[0] != '\0' ? words : qdm_status_text(status))};
}

// Records a call's status; an error throws. The words, when not given, are read
// on the thread that made the call, right after it.
void Check(int32_t status, const char* function, bool complex, Record& r,
           const char* words = nullptr) {
  r.status = status;
  if (status == QDM_WARN_RANK_DEFICIENT) r.warning = qdm_status_text(status);
  if (status == QDM_OK || status == QDM_WARN_RANK_DEFICIENT) return;
  char last[256];
  if (words == nullptr) {
    qdm_last_error_message(last, sizeof last);
    words = last;
  }
  throw Refusal(status, function, complex, words);
}

// A second call of the same fit: only a failure replaces the first call's status.
void CheckFailure(int32_t status, const char* function, bool complex, Record& r) {
  if (status != QDM_OK) Check(status, function, complex, r);
}

// A small caller-allocated output that passes as either twin's pointer type.
struct Array {
  std::vector<double> v;
  explicit Array(size_t doubles) : v(std::max<size_t>(doubles, 2)) {}
  operator double*() { return v.data(); }
  operator qdm_complex*() { return reinterpret_cast<qdm_complex*>(v.data()); }
};

// The spectrum output, allocated but not touched: the library checks its work
// bound before it writes anything, so a refused size costs no memory.
std::unique_ptr<double[]> SpectrumOutput(int32_t length) {
  try {
    return std::unique_ptr<double[]>(new double[std::max<size_t>(length, 2)]);
  } catch (const std::bad_alloc&) {
    throw Failure{kFailed,
                  {},
                  "no memory for a spectrum of " + std::to_string(length) + " values (" +
                      std::to_string((uint64_t(length) * sizeof(double)) >> 20) + " MiB)"};
  }
}

// The twins of a plain-API function that take the same arguments after the samples.
#define QDM_TWIN(fn, ...) \
  Check(s.complex ? fn##_complex(cx, __VA_ARGS__) : fn##_real(re, __VA_ARGS__), #fn, s.complex, r)

// n values, value i at values[i * stride], as a plain JSON array.
Json Column(const double* values, size_t n, size_t stride = 1) {
  Json column = Json::array();
  for (size_t i = 0; i < n; ++i) column.push_back(values[i * stride]);
  return column;
}

// A table as an object of equal-length columns (pandas.DataFrame reads it as
// it is); null columns are left out.
Json Columns(std::initializer_list<const char*> names, std::vector<const double*> values, size_t n,
             size_t stride = 1) {
  Json t = Json::object();
  size_t c = 0;
  for (const char* name : names)
    if (const double* column = values[c++]) t[name] = Column(column, n, stride);
  return t;
}

// Complex values (pairs) with their modulus and frequency.
Json Poles(const double* z, size_t n, double rate) {
  Json t = Columns({"re", "im"}, {z, z + 1}, n, 2);
  std::vector<double> modulus(n), frequency(n);
  for (size_t i = 0; i < n; ++i) {
    modulus[i] = std::hypot(z[2 * i], z[2 * i + 1]);
    frequency[i] = std::atan2(z[2 * i + 1], z[2 * i]) * rate / (2.0 * kPi);
  }
  t["modulus"] = Column(modulus.data(), n);
  t["frequency_hz"] = Column(frequency.data(), n);
  return t;
}

// The modes ordered by frequency (stable), every column alike.
void SortModes(int32_t count, std::initializer_list<double*> columns, const double* frequency) {
  std::vector<int32_t> order(size_t(std::max(count, 0)));
  for (int32_t i = 0; i < count; ++i) order[size_t(i)] = i;
  std::stable_sort(order.begin(), order.end(),
                   [&](int32_t a, int32_t b) { return frequency[a] < frequency[b]; });
  std::vector<double> moved(order.size());
  for (double* column : columns) {
    for (size_t i = 0; i < order.size(); ++i) moved[i] = column[order[i]];
    std::copy(moved.begin(), moved.end(), column);
  }
}

int32_t SolverOf(const Options& o) {
  return o.solver == "krylov"  ? QDM_SOLVER_KRYLOV
         : o.solver == "dense" ? QDM_SOLVER_DENSE
                               : QDM_SOLVER_AUTO;
}

// The stabilization diagram: one row per pole (order, frequency, damping,
// amplitude, flags and the stable bit), the MDL order, and for the plot the
// covariance AR spectrum of the record (order max_order) kept beside the
// record, out of its JSON.
void Stabilize(const Signal& s, double rate, int32_t flag, int32_t L, int32_t minOrder,
               int32_t maxOrder, const Json& par, Json& res, Record& r, bool spectrum) {
  const int32_t n = s.n;
  const double* re = s.values.data();
  const auto* cx = reinterpret_cast<const qdm_complex*>(s.values.data());
  const double freqTol = par["freq_tol"].get<double>(), dampTol = par["damping_tol"].get<double>();
  // A bad order is refused before the table is touched: no room for one above n/2.
  const int64_t room =
      std::max<int64_t>(qdm_stabilization_rows(minOrder, std::min(maxOrder, n / 2)), 1);
  const size_t rowsRoom = static_cast<size_t>(room);
  std::vector<int32_t> order(rowsRoom), flags(rowsRoom);
  std::vector<double> freq(rowsRoom), damping(rowsRoom), amp(rowsRoom);
  int64_t rows = 0;
  int32_t mdl = 0;
  Check(s.complex ? qdm_stabilization_complex(cx, n, L, minOrder, maxOrder, rate, freqTol, dampTol,
                                              room, order.data(), freq.data(), damping.data(),
                                              amp.data(), flags.data(), &rows, &mdl)
                  : qdm_stabilization_real(re, n, L, minOrder, maxOrder, rate, flag, freqTol,
                                           dampTol, room, order.data(), freq.data(), damping.data(),
                                           amp.data(), flags.data(), &rows, &mdl),
        "qdm_stabilization", s.complex, r);
  // Rows by order, then frequency.
  std::vector<size_t> by(static_cast<size_t>(rows));
  for (size_t i = 0; i < by.size(); ++i) by[i] = i;
  std::stable_sort(by.begin(), by.end(), [&](size_t a, size_t b) {
    return order[a] != order[b] ? order[a] < order[b] : freq[a] < freq[b];
  });
  Json t = Json::object();
  for (const char* key : {"order", "frequency_hz", "damping_per_sample", "damping_per_s",
                          "amplitude", "flags", "stable"})
    t[key] = Json::array();
  size_t stable = 0;
  for (size_t i : by) {
    t["order"].push_back(order[i]);
    t["frequency_hz"].push_back(freq[i]);
    t["damping_per_sample"].push_back(damping[i]);
    t["damping_per_s"].push_back(damping[i] * rate);
    t["amplitude"].push_back(amp[i]);
    t["flags"].push_back(flags[i]);
    t["stable"].push_back((flags[i] & QDM_STABLE) ? 1 : 0);
    stable += (flags[i] & QDM_STABLE) ? 1 : 0;
  }
  res["mdl_order"] = mdl;
  res["pole_count"] = rows;
  res["stable_count"] = stable;
  res["diagram"] = std::move(t);
  if (!spectrum) return;
  // The backdrop: a failure here leaves the picture without it, never the fit.
  const int32_t p = std::min<int32_t>(maxOrder, int32_t(qdm_output_room(n, maxOrder)));
  const int32_t points = 1024, oneSided = !s.complex && flag ? 1 : 0;
  std::vector<double> a(2 * size_t(p + 1)), z(2 * size_t(std::max(p, 1)));
  double variance = 0.0;
  const int32_t fitted =
      s.complex ? qdm_covariance_complex(cx, n, p, reinterpret_cast<qdm_complex*>(a.data()),
                                         reinterpret_cast<qdm_complex*>(z.data()), &variance)
                : qdm_covariance_real(re, n, p, a.data(), reinterpret_cast<qdm_complex*>(z.data()),
                                      &variance);
  if (fitted != QDM_OK && fitted != QDM_WARN_RANK_DEFICIENT) return;
  const int32_t length = qdm_spectrum_length(points);
  auto axis = SpectrumOutput(length), db = SpectrumOutput(length);
  int32_t laid = 0;
  const int32_t drawn =
      s.complex ? qdm_ar_psd_complex(reinterpret_cast<const qdm_complex*>(a.data()), p, 0.0, points,
                                     rate, 0, axis.get(), db.get(), nullptr, &laid)
                : qdm_ar_psd_real(a.data(), p, 0.0, points, rate, oneSided, axis.get(), db.get(),
                                  nullptr, &laid);
  if (drawn != QDM_OK) return;
  r.frequency = std::move(axis);
  r.spectrum = std::move(db);
  r.spectrumLength = size_t(laid);
}

// What the records of one group (one length, one type, one default rate)
// share: the method and every parameter resolved for them.
struct Plan {
  Method m;
  int32_t n;
  bool complex;
  double rate;
  int32_t flag, oneSided, solver;
  bool sort;  // modes by frequency
  int32_t p, k, L, M, minOrder, points, maxOrder;
  int32_t length;  // spectrum values, for the spectra
  Json par;
};

Plan MakePlan(Method m, const Options& o, int32_t n, bool complex, double defaultRate) {
  Plan q{};
  q.m = m;
  q.n = n;
  q.complex = complex;
  q.rate = o.rate.value_or(defaultRate);
  q.flag = o.realSignal ? 1 : 0;
  q.solver = SolverOf(o);
  q.sort = !o.noSort;
  int32_t resolved[std::size(kIntOptions)];
  for (size_t i = 0; i < std::size(kIntOptions); ++i)
    resolved[i] = (o.*kIntOptions[i].field).value_or(kIntOptions[i].fallback);
  if (!o.order && m == kProny) resolved[0] = 6;
  if (!o.pencil) resolved[2] = qdm_default_pencil(n);
  if (m == kMdl) {  // the order search's pencil: its own default, and --upper its old name
    if (o.pencil && o.upper)
      throw Failure{kUsage, {}, "give --pencil only (--upper is its old name)"};
    if (!o.pencil) resolved[2] = o.upper ? *o.upper : qdm_default_mdl_upper(n);
  }
  if (!o.pencil && m == kStabilization)
    resolved[2] = std::max(resolved[2], std::min(resolved[7], n / 2));
  q.p = resolved[0], q.k = resolved[1], q.L = resolved[2], q.M = resolved[3];
  q.minOrder = resolved[5], q.points = resolved[6], q.maxOrder = resolved[7];
  if (o.realSignal && complex && ((kModal | Bit(kStabilization)) & Bit(m)))
    throw Failure{kUsage, {}, "--real-signal applies to real data only, not to complex samples"};
  if (o.oneSided && complex)
    throw Failure{kUsage,
                  {},
                  "--one-sided applies to real data only: complex samples have a "
                  "two-sided spectrum"};
  q.oneSided = !complex && !o.twoSided ? 1 : 0;
  q.length = (kSpectra & Bit(m)) ? qdm_spectrum_length(q.points) : 0;
  Json& par = q.par = Json::object();
  for (size_t i = 0; i < std::size(kIntOptions); ++i)
    if ((kIntOptions[i].methods & Bit(m)) && kIntOptions[i].field != &Options::upper)
      par[kIntOptions[i].key] = resolved[i];
  if (m != kMdl) par["rate_hz"] = q.rate;
  if ((kModal & Bit(m)) && !complex) par["real_signal"] = q.flag;
  if (kModal & Bit(m)) par["sorted"] = o.noSort ? 0 : 1;
  if (kSpectra & Bit(m)) par["one_sided"] = q.oneSided;
  if (m == kPencil || m == kPcar) par["solver"] = o.solver;
  if (m == kStabilization) {
    if (!complex) par["real_signal"] = q.flag;
    par["freq_tol"] = o.freqTol.value_or(0.01);
    par["damping_tol"] = o.dampingTol.value_or(0.05);
  }
  return q;
}

// Output rows the library fills: not initialized, so a size it refuses
// touches no memory.
struct Buffer {
  std::unique_ptr<double[]> v;
  void Make(int64_t count, int64_t row) {
    v.reset(new double[size_t(std::max<int64_t>(count * std::max<int64_t>(row, 0), 2))]);
  }
  operator double*() const { return v.get(); }
  operator qdm_complex*() const { return reinterpret_cast<qdm_complex*>(v.get()); }
};

// A group's fits as the batch functions leave them: row i of every output is
// the group's record i.
struct Rows {
  const char* function = "";       // the single-record function each record went through
  std::optional<Failure> refused;  // an argument error: that of every record
  int64_t firstFailed = -1;        // the first record that failed, and its words
  std::string firstWords;
  std::vector<int32_t> status, count, order, errorStatus;
  int32_t errorsRefused = QDM_OK;                 // the error bars' argument error, every record's
  int64_t coefRow = 0, poleRow = 0, modeRow = 0;  // doubles per record
  Buffer a, z, amp, phase, damping, freq, seAmp, sePhase, seDamping, seFreq, spectrum;
  std::vector<double> variance, mse, f0, df, fitError, modeNoise;
};

// Fits `count` records of q.n samples, one after another from x, with the
// method's batch function on `threads` threads (0: one per processor), and
// the modes' error bars with theirs.
Rows Call(const Plan& q, const double* x, int64_t count, int32_t threads) {
  Rows w;
  const int32_t n = q.n, p = q.p, k = q.k, L = q.L, M = q.M;
  const auto* cx = reinterpret_cast<const qdm_complex*>(x);
  const size_t records = size_t(count);
  // A size above floor(2n/3) is refused before anything is written: no rows for it.
  const auto fits = [&](int32_t size) { return qdm_output_room(n, size) == size; };
  const int64_t elements = q.complex ? 2 : 1;
  const bool model = q.m == kCovariance || q.m == kCovSpectrum || q.m == kPcar;
  w.coefRow = model && fits(p) ? elements * (int64_t(p) + 1) : 0;
  w.poleRow = model && fits(p) ? 2 * int64_t(std::max(p, 0)) : 0;
  const int32_t modes = q.m == kProny ? p : q.m == kPencil ? M : q.m == kPcarSpectrum ? k : 0;
  w.modeRow = fits(modes) ? std::max(modes, 0) : 0;
  w.status.assign(records, QDM_OK);
  w.count.assign(records, 0);
  w.order.assign(records, 0);
  for (auto* s : {&w.variance, &w.mse, &w.f0, &w.df, &w.fitError}) s->assign(records, 0.0);
  if (model) {
    w.a.Make(count, w.coefRow);
    w.z.Make(count, w.poleRow);
  }
  if (kModal & Bit(q.m))
    for (Buffer* b : {&w.amp, &w.phase, &w.damping, &w.freq}) b->Make(count, w.modeRow);
  if (q.m == kCovSpectrum) {
    // Null outputs: the library checks the sizes before room is made for them.
    const int32_t sizes = q.complex ? qdm_ar_psd_complex(nullptr, p, 0.0, q.points, q.rate, 0,
                                                         nullptr, nullptr, nullptr, nullptr)
                                    : qdm_ar_psd_real(nullptr, p, 0.0, q.points, q.rate, q.oneSided,
                                                      nullptr, nullptr, nullptr, nullptr);
    if (sizes != QDM_ERR_NULL_POINTER && sizes < 0) {
      char words[256];
      qdm_last_error_message(words, sizeof words);
      w.refused = Refusal(sizes, "qdm_ar_psd", q.complex, words);
      return w;
    }
  }
  if (q.m == kPcarSpectrum) {
    try {
      w.spectrum.Make(count, q.length);
    } catch (const std::bad_alloc&) {
      throw Failure{kFailed,
                    {},
                    "no memory for a spectrum of " + std::to_string(q.length) + " values (" +
                        std::to_string((uint64_t(q.length) * sizeof(double)) >> 20) + " MiB)"};
    }
  }
  int32_t* st = w.status.data();
  int32_t* found = w.count.data();
  int32_t status = QDM_OK;
  switch (q.m) {
    case kCovariance:
    case kCovSpectrum:  // the model here, its density laid out record by record
      w.function = "qdm_covariance";
      status = q.complex ? qdm_covariance_batch_complex(cx, n, count, n, p, w.a, w.z,
                                                        w.variance.data(), st, threads)
                         : qdm_covariance_batch_real(x, n, count, n, p, w.a, w.z, w.variance.data(),
                                                     st, threads);
      break;
    case kPcar:
      w.function = "qdm_pcar_solver";
      status = q.complex
                   ? qdm_pcar_batch_complex(cx, n, count, n, p, k, q.solver, w.a, w.z, st, threads)
                   : qdm_pcar_batch_real(x, n, count, n, p, k, q.solver, w.a, w.z, st, threads);
      break;
    case kMdl:
      w.function = "qdm_mdl_order";
      status = q.complex ? qdm_mdl_order_batch_complex(cx, n, count, n, L, q.minOrder,
                                                       w.order.data(), st, threads)
                         : qdm_mdl_order_batch_real(x, n, count, n, L, q.minOrder, w.order.data(),
                                                    st, threads);
      break;
    case kProny:  // the real twins of these three take the real-signal flag
      w.function = "qdm_prony";
      status = q.complex ? qdm_prony_batch_complex(cx, n, count, n, p, q.rate, w.amp, w.phase,
                                                   w.damping, w.freq, found, st, threads)
                         : qdm_prony_batch_real(x, n, count, n, p, q.rate, q.flag, w.amp, w.phase,
                                                w.damping, w.freq, found, st, threads);
      break;
    case kPencil:
      w.function = "qdm_matrix_pencil_solver";
      status = q.complex ? qdm_matrix_pencil_batch_complex(cx, n, count, n, L, M, q.rate, q.solver,
                                                           w.amp, w.phase, w.damping, w.freq, found,
                                                           w.mse.data(), st, threads)
                         : qdm_matrix_pencil_batch_real(x, n, count, n, L, M, q.rate, q.flag,
                                                        q.solver, w.amp, w.phase, w.damping, w.freq,
                                                        found, w.mse.data(), st, threads);
      break;
    case kPcarSpectrum:
      w.function = "qdm_pcar_psd";
      status = q.complex
                   ? qdm_pcar_psd_batch_complex(cx, n, count, n, p, q.points, k, q.rate, w.amp,
                                                w.phase, w.freq, found, w.spectrum, w.f0.data(),
                                                w.df.data(), w.fitError.data(), st, threads)
                   : qdm_pcar_psd_batch_real(x, n, count, n, p, q.points, k, q.rate, q.flag, w.amp,
                                             w.phase, w.freq, found, w.spectrum, w.f0.data(),
                                             w.df.data(), w.fitError.data(), st, threads);
      break;
    case kStabilization:  // no batch: one record at a time
      break;
  }
  if (status != QDM_OK && status != QDM_WARN_RECORD_FAILED) {
    char words[256];
    qdm_last_error_message(words, sizeof words);
    w.refused = Refusal(status, w.function, q.complex, words);
    return w;
  }
  if (status == QDM_WARN_RECORD_FAILED) {
    // The batch's message names its first failed record: "record 17: x[3] is not finite: nan".
    w.firstFailed = std::find_if(st, st + count, [](int32_t s) { return s < 0; }) - st;
    char words[384];
    qdm_last_error_message(words, sizeof words);
    const std::string prefix = "record " + std::to_string(w.firstFailed) + ": ";
    if (std::strncmp(words, prefix.c_str(), prefix.size()) == 0)
      w.firstWords = words + prefix.size();
  }
  // Prony's and the pencil's modes carry standard errors, for each record fitted.
  if (q.m != kProny && q.m != kPencil) return w;
  std::vector<int32_t> fitted(records);
  for (size_t i = 0; i < records; ++i) fitted[i] = st[i] >= 0 ? found[i] : 0;
  if (std::all_of(fitted.begin(), fitted.end(), [](int32_t c) { return c == 0; })) return w;
  for (Buffer* b : {&w.seAmp, &w.sePhase, &w.seDamping, &w.seFreq}) b->Make(count, w.modeRow);
  w.modeNoise.assign(records, 0.0);
  w.errorStatus.assign(records, QDM_OK);
  const int32_t room = int32_t(w.modeRow);
  const int32_t errors =
      q.complex
          ? qdm_mode_errors_batch_complex(cx, n, count, n, q.rate, room, fitted.data(), w.amp,
                                          w.phase, w.damping, w.freq, w.seAmp, w.sePhase,
                                          w.seDamping, w.seFreq, w.modeNoise.data(),
                                          w.errorStatus.data(), threads)
          : qdm_mode_errors_batch_real(x, n, count, n, q.rate, q.flag, room, fitted.data(), w.amp,
                                       w.phase, w.damping, w.freq, w.seAmp, w.sePhase, w.seDamping,
                                       w.seFreq, w.modeNoise.data(), w.errorStatus.data(), threads);
  if (errors != QDM_OK && errors != QDM_WARN_RECORD_FAILED) w.errorsRefused = errors;
  return w;
}

// The record's JSON: what was fitted, with what, its status and results.
void Describe(const Plan& q, const std::string& input, Json res, Record& r) {
  r.json = {{"input", input},
            {"method", kMethods[q.m][0]},
            {"signal", {{"type", q.complex ? "complex" : "real"}, {"samples", q.n}}},
            {"parameters", q.par},
            {"status", r.status}};
  if (!r.warning.empty()) r.json["warning"] = r.warning;
  r.json["results"] = std::move(res);
}

// The stabilization diagram of one record (it has no batch: its row count varies).
Record StabilizationRecord(const Plan& q, const std::string& input, const Signal& s,
                           bool spectrum) {
  Record r;
  Json res = Json::object();
  Stabilize(s, q.rate, q.flag, q.L, q.minOrder, q.maxOrder, q.par, res, r, spectrum);
  Describe(q, input, std::move(res), r);
  return r;
}

// Record i of a group fitted by Call, as its JSON record and spectrum; x holds
// its samples. A failure throws, worded as the single-record call words it.
Record Present(const Plan& q, const std::string& input, const Rows& w, int64_t i, const double* x) {
  if (w.refused) throw *w.refused;
  Record r;
  const Method m = q.m;
  const int32_t n = q.n, p = q.p, points = q.points, length = q.length;
  const double rate = q.rate;
  const size_t at = size_t(i);
  const int32_t status = w.status[at];
  std::string words;  // a refusal's: the batch words its first, another is asked of its record
  if (Refused(status)) words = i == w.firstFailed ? w.firstWords : Call(q, x, 1, 1).firstWords;
  Check(status, w.function, q.complex, r, words.c_str());
  // Every output has the room the library has for the size arguments.
  const size_t room = size_t(qdm_output_room(n, std::max({p, q.k, q.M}))) + 1;
  Array a(2 * room), z(2 * room), amp(room), phase(room), damping(room), freq(room);
  const auto copy = [&](const Buffer& from, int64_t row, int64_t values, Array& to) {
    std::copy_n(from.v.get() + i * row, size_t(values), to.v.begin());
  };
  const int32_t count = w.count[at];
  if (w.coefRow > 0) {
    copy(w.a, w.coefRow, w.coefRow, a);
    copy(w.z, w.poleRow, w.poleRow, z);
  }
  if (kModal & Bit(m))
    for (auto [from, to] :
         {std::pair{&w.amp, &amp}, {&w.phase, &phase}, {&w.damping, &damping}, {&w.freq, &freq}})
      if (m != kPcarSpectrum || from != &w.damping) copy(*from, w.modeRow, count, *to);
  const double variance = w.variance[at], mse = w.mse[at], fitError = w.fitError[at];
  std::unique_ptr<double[]> db = (kSpectra & Bit(m)) ? SpectrumOutput(length) : nullptr;
  std::unique_ptr<double[]> axis = (kSpectra & Bit(m)) ? SpectrumOutput(length) : nullptr;
  std::unique_ptr<double[]> psd = m == kCovSpectrum ? SpectrumOutput(length) : nullptr;
  int32_t laid = 0;
  if (m == kCovSpectrum) {
    CheckFailure(q.complex
                     ? qdm_ar_psd_complex(static_cast<const qdm_complex*>(a), p, variance, points,
                                          rate, 0, axis.get(), db.get(), psd.get(), &laid)
                     : qdm_ar_psd_real(a.v.data(), p, variance, points, rate, q.oneSided,
                                       axis.get(), db.get(), psd.get(), &laid),
                 "qdm_ar_psd", q.complex, r);
  }
  if (m == kPcarSpectrum) {
    std::copy_n(w.spectrum.v.get() + i * length, size_t(length), db.get());
    CheckFailure(
        qdm_spectrum_layout(db.get(), nullptr, length, rate, q.oneSided, axis.get(), &laid),
        "qdm_spectrum_layout", q.complex, r);
  }
  // Prony's and the pencil's modes carry standard errors. When they cannot be
  // had (too few samples for the noise, a singular bound) the fit stands, the
  // errors concerned are NaN (null in JSON) and the warning says why.
  const bool withErrors = m == kProny || m == kPencil;
  Array seAmp(room), sePhase(room), seDamping(room), seFreq(room);
  double modeNoise = 0.0;
  if (withErrors && count > 0) {
    const int32_t st = w.errorsRefused != QDM_OK ? w.errorsRefused : w.errorStatus[at];
    if (st != QDM_OK && st != QDM_WARN_BOUND_SINGULAR && !Refused(st) &&
        st != QDM_ERR_NON_FINITE_RESULT && st != QDM_ERR_EXTREME_VALUE) {
      Check(st, "qdm_mode_errors", q.complex, r, "");
    }
    if (st != QDM_OK) {
      r.warning +=
          (r.warning.empty() ? "" : "; ") + std::string("standard errors: ") + qdm_status_text(st);
    }
    if (st != QDM_OK && st != QDM_WARN_BOUND_SINGULAR) {
      for (Array* e : {&seAmp, &sePhase, &seDamping, &seFreq})
        std::fill(e->v.begin(), e->v.end(), NAN);
      modeNoise = NAN;
    } else {
      for (auto [from, to] : {std::pair{&w.seAmp, &seAmp},
                              {&w.sePhase, &sePhase},
                              {&w.seDamping, &seDamping},
                              {&w.seFreq, &seFreq}})
        copy(*from, w.modeRow, count, *to);
      modeNoise = w.modeNoise[at];
    }
  }
  if ((kModal & Bit(m)) && q.sort)
    SortModes(count, {amp, phase, damping, seAmp, sePhase, seDamping, seFreq, freq}, freq);
  std::vector<double> perSecond(size_t(std::max(count, 0)));
  std::vector<double> perSecondSe(perSecond.size());
  for (size_t j = 0; j < perSecond.size(); ++j) {
    perSecond[j] = damping.v[j] * rate;
    perSecondSe[j] = seDamping.v[j] * rate;
  }
  Json res = Json::object();
  if (m == kCovariance || m == kCovSpectrum) res["noise_variance"] = variance;
  if (m == kCovariance || m == kPcar) {
    const double* c = a;
    res["coefficients"] =
        q.complex ? Columns({"re", "im"}, {c, c + 1}, p + 1, 2) : Column(c, p + 1);
    res[m == kPcar ? "roots" : "poles"] = Poles(z, p, rate);
  }
  if (m == kMdl) res["order"] = w.order[at];
  if (m == kPcarSpectrum) res["fit_error"] = fitError;
  if (m == kPencil) res["mse"] = mse;
  if (withErrors) res["noise_variance"] = modeNoise;
  if (kModal & Bit(m)) {
    res["mode_count"] = count;
    const bool damped = m != kPcarSpectrum;
    const auto se = [&](const double* v) { return withErrors ? v : nullptr; };
    res["modes"] = Columns(
        {"frequency_hz", "amplitude", "phase_rad", "damping_per_sample", "damping_per_s",
         "frequency_hz_stderr", "amplitude_stderr", "phase_rad_stderr", "damping_per_sample_stderr",
         "damping_per_s_stderr"},
        {freq, amp, phase, damped ? damping.v.data() : nullptr, damped ? perSecond.data() : nullptr,
         se(seFreq), se(seAmp), se(sePhase), se(seDamping), se(perSecondSe.data())},
        size_t(count));
  }
  if (kSpectra & Bit(m)) {
    // The columns are filled in from the record's arrays as it is written.
    res["spectrum"] = {{"one_sided", q.oneSided == 1}, {"length", laid}};
    for (const char* key : kSpectrumColumns)
      if (key != kSpectrumColumns[2] || psd) res["spectrum"][key] = Json::array();
    r.frequency = std::move(axis);
    r.spectrum = std::move(db);
    r.psd = std::move(psd);
    r.spectrumLength = size_t(laid);
  }
  Describe(q, input, std::move(res), r);
  return r;
}

// One file's fit: a batch of one record.
Record Fit(Method m, const Options& o, const std::string& input, const Signal& s) {
  const Plan q = MakePlan(m, o, s.n, s.complex, s.defaultRate);
  if (m == kStabilization) return StabilizationRecord(q, input, s, !o.plot.empty());
  return Present(q, input, Call(q, s.values.data(), 1, 1), 0, s.values.data());
}

// ---- output ---------------------------------------------------------------------------

// Writes in pieces through a buffer, so a long spectrum is never one string.
// To a string instead, the text is kept whole (a line made ahead of its turn).
class Writer {
 public:
  explicit Writer(std::FILE* out) : out_(out) {}
  explicit Writer(std::string* kept) : kept_(kept) {}
  ~Writer() { Flush(); }
  Writer(const Writer&) = delete;
  Writer& operator=(const Writer&) = delete;
  Writer& operator<<(std::string_view s) {
    (kept_ ? *kept_ : buffer_).append(s);
    if (buffer_.size() >= (size_t{1} << 16)) Flush();
    return *this;
  }
  void Flush() {
    if (out_ != nullptr) std::fwrite(buffer_.data(), 1, buffer_.size(), out_);
    buffer_.clear();
  }

 private:
  std::FILE* out_ = nullptr;
  std::string* kept_ = nullptr;
  std::string buffer_;
};

// Shortest text that reads back as the same double (NaN: nan).
std::string Exact(double v) {
  char b[32];
  return std::string(b, std::to_chars(b, b + sizeof b, v).ptr);
}
std::string Exact(const Json& v) { return Exact(v.is_null() ? NAN : v.get<double>()); }

// A double as the JSON writer puts it: shortest form, a point if integral, null if not finite.
std::string JsonNumber(double v) {
  if (!std::isfinite(v)) return "null";
  std::string text = Exact(v);
  if (text.find_first_of(".e") == std::string::npos) text += ".0";
  return text;
}

// The record as JSON (indent < 0: one line), with the spectrum's columns
// spliced into their empty arrays (the last of each name: the spectrum is the
// record's last member, and a name inside a JSON string has its quotes escaped).
void WriteJson(Writer& w, const Record& r, int indent) {
  const std::string text = r.json.dump(indent, ' ', false, kReplace);
  size_t done = 0;
  for (size_t c = 0; c < std::size(kSpectrumColumns) && r.spectrum; ++c) {
    const std::string key = std::string("\"") + kSpectrumColumns[c] + "\":";
    const std::string empty = key + (indent < 0 ? "[]" : " []");
    const size_t at = text.rfind(empty);
    const double* values = r.Column(c);
    if (at == std::string::npos || at < done || values == nullptr) continue;
    const size_t open = at + empty.size() - 1;  // the ']' of "[]"
    const size_t lineStart = text.rfind('\n', at) + 1;
    const std::string pad = indent < 0 ? "" : "\n" + std::string(at - lineStart, ' ');
    const std::string inner = indent < 0 ? "" : pad + std::string(size_t(indent), ' ');
    w << std::string_view(text).substr(done, open - done);
    for (size_t i = 0; i < r.spectrumLength; ++i)
      w << (i == 0 ? "" : ",") << inner << JsonNumber(values[i]);
    w << (r.spectrumLength ? pad : "");
    done = open;
  }
  w << std::string_view(text).substr(done) << "\n";
}

void WriteJson(std::FILE* out, const Record& r, int indent) {
  Writer w(out);
  WriteJson(w, r, indent);
}

std::string Brief(const Json& v) {
  if (v.is_string()) return v.get<std::string>();
  char buf[32];
  std::snprintf(buf, sizeof buf, "%.8g", v.is_null() ? NAN : v.get<double>());
  return v.is_number_float() || v.is_null() ? buf : v.dump();
}

// A value and its standard error, the error to two significant digits and the
// value to the same decimals ("120.000 +- 0.031"); without a usable error, the
// value as Brief shows it and the error as it is.
std::string WithError(const Json& value, const Json& error) {
  const double v = value.is_null() ? NAN : value.get<double>();
  const double e = error.is_null() ? NAN : error.get<double>();
  if (!std::isfinite(v) || !std::isfinite(e) || e <= 0.0) {
    return Brief(value) + " +- " + (std::isfinite(e) ? Brief(error) : std::string("nan"));
  }
  const int decimals = std::clamp(1 - int(std::floor(std::log10(e))), 0, 12);
  char b[96];
  std::snprintf(b, sizeof b, "%.*f +- %.*f", decimals, v, decimals, e);
  return b;
}

std::string Padded(const std::string& text, size_t width) {
  return std::string(width > text.size() ? width - text.size() : 1, ' ') + text;
}

// A table's columns: an object of equal-length arrays, or one plain array (a
// real coefficient vector) as the column "value".
std::vector<std::pair<std::string, const Json*>> TableColumns(const Json& table) {
  std::vector<std::pair<std::string, const Json*>> columns;
  if (table.is_array()) columns.emplace_back("value", &table);
  if (table.is_object())
    for (const auto& [name, column] : table.items())
      if (column.is_array()) columns.emplace_back(name, &column);
  return columns;
}

std::string Table(const Json& j) {
  const std::string input = j["input"];
  std::string out = "qdm " + j["method"].get<std::string>() + ": " +
                    (input == "-" ? "standard input" : Shown(input, kNameShown)) + ", " +
                    j["signal"]["type"].get<std::string>() + ", " + j["signal"]["samples"].dump() +
                    " samples\nparameters:";
  for (const auto& [key, v] : j["parameters"].items()) out += " " + key + " = " + Brief(v);
  out += "\n\n";
  for (const auto& [key, v] : j["results"].items())
    if (v.is_primitive()) out += key + Padded(Brief(v), 30 - key.size()) + "\n";
  for (const auto& [key, v] : j["results"].items()) {
    if (key == "spectrum") {
      out += "\nspectrum: " + v["length"].dump() + " values, " +
             (v["one_sided"].get<bool>() ? "one-sided (0 to fs/2)" : "two-sided (-fs/2 up)") +
             ", in dB" + (v.contains("psd_per_hz") ? " and per Hz" : "") +
             " (--csv or --json lists them)\n";
      continue;
    }
    const auto columns = TableColumns(v);
    if (v.is_primitive() || columns.empty()) continue;
    const size_t rows = columns[0].second->size();
    out += "\n" + key + (rows == 0 ? ": none\n" : "\n   #");
    if (rows == 0) continue;
    // A column with a standard error beside it is shown as "value +- error".
    std::vector<std::pair<const Json*, const Json*>> shown;
    for (const auto& [name, column] : columns) {
      const std::string tail = "_stderr";
      if (name.size() > tail.size() &&
          name.compare(name.size() - tail.size(), tail.size(), tail) == 0 &&
          v.contains(name.substr(0, name.size() - tail.size())))
        continue;
      const std::string errorName = name + tail;
      const Json* error = v.contains(errorName) ? &v[errorName] : nullptr;
      shown.emplace_back(column, error);
      out += Padded(name, error ? 24 : 19);
    }
    for (size_t i = 0; i < rows; ++i) {
      out += "\n" + Padded(std::to_string(i), 4);
      for (const auto& [column, error] : shown)
        out += error ? Padded(WithError((*column)[i], (*error)[i]), 24)
                     : Padded(Brief((*column)[i]), 19);
    }
    out += "\n";
  }
  return out;
}

// One table of the results as CSV, numbers exact: the spectrum (frequency_hz,
// power_db and, for the covariance model, psd_per_hz) or a table of columns
// (modes, coefficients, poles).
void WriteCsvTable(std::FILE* out, const Record& r, const std::string& key) {
  Writer w(out);
  const Json& res = r.json["results"];
  if (key == "spectrum") {
    const size_t columns = r.psd ? 3 : 2;
    for (size_t c = 0; c < columns; ++c) w << (c ? "," : "") << kSpectrumColumns[c];
    w << "\n";
    for (size_t i = 0; i < r.spectrumLength; ++i) {
      for (size_t c = 0; c < columns; ++c) w << (c ? "," : "") << Exact(r.Column(c)[i]);
      w << "\n";
    }
    return;
  }
  const auto columns = TableColumns(res[key]);
  std::string line;
  for (const auto& [name, _] : columns) line.append(",").append(name);
  w << line.substr(1) << "\n";
  const size_t rows = columns.empty() ? 0 : columns[0].second->size();
  for (size_t i = 0; i < rows; ++i) {
    line.clear();
    for (const auto& [_, column] : columns) line.append(",").append(Exact((*column)[i]));
    w << line.substr(1) << "\n";
  }
}

// The method's main table: the spectrum, the modes, the coefficients, or the order.
void WriteCsv(std::FILE* out, const Record& r) {
  const Json& res = r.json["results"];
  for (const char* key : {"spectrum", "modes", "diagram", "coefficients"})
    if (res.contains(key)) return WriteCsvTable(out, r, key);
  Writer(out) << "order\n" << res["order"].dump() << "\n";
}

// ---- the plot -------------------------------------------------------------------------

// Text as gnuplot's data reader gives it back: shown as a message shows it,
// with quotes escaped and every backslash doubled (the reader removes one).
std::string PlotText(const std::string& text) {
  std::string out;
  for (const char c : Shown(text, 1024, true))
    out += c == '\\' ? std::string(2, c) : std::string(1, c);
  return out;
}

// A mode's label: its frequency to a tenth of a per cent of the Nyquist
// frequency ("120.0 Hz" at 1 kHz, "0.120 Hz" at 1 Hz), never more digits.
std::string FrequencyLabel(double f, double rate) {
  const int decimals = std::clamp(2 - int(std::floor(std::log10(rate / 2.0))), 1, 9);
  char b[64];
  std::snprintf(b, sizeof b, "%.*f Hz", decimals, f);
  return b;
}

// The labelled modes, by frequency, each with a label row 0..2: a label closer
// than `gap` to the one before goes one row down, so neighbours never overlap.
struct ModeLabel {
  double frequency, amplitude;
  int row;
};
std::vector<ModeLabel> Stagger(std::vector<ModeLabel> modes, double gap) {
  std::stable_sort(modes.begin(), modes.end(), [](const ModeLabel& a, const ModeLabel& b) {
    return a.frequency < b.frequency;
  });
  for (size_t i = 1; i < modes.size(); ++i)
    if (modes[i].frequency - modes[i - 1].frequency < gap)
      modes[i].row = (modes[i - 1].row + 1) % 3;
  return modes;
}

// The stabilization diagram: frequency across, model order up, stable poles
// filled, the others small open circles, the AR spectrum behind on the right
// axis and the MDL order as a labelled line. Every number is in a data file.
bool PlotDiagram(const std::string& png, const Record& r, std::vector<PlotFile> files,
                 std::string script, const std::string& terminal) {
  const Json& j = r.json;
  const Json& res = j["results"];
  const double rate = j["parameters"].value("rate_hz", 1.0);
  const Json& orders = res["diagram"]["order"];
  const Json& freqs = res["diagram"]["frequency_hz"];
  double lo = 0.0, hi = 0.0;
  for (size_t i = 0; i < freqs.size(); ++i) {
    lo = std::min(lo, freqs[i].get<double>());
    hi = std::max(hi, freqs[i].get<double>());
  }
  // The frequency range: the spectrum's when there is one, else the poles'
  // within the band the sampling rate allows.
  const bool oneSided = lo >= 0.0;
  double x0 = oneSided ? 0.0 : -rate / 2.0, x1 = rate / 2.0;
  if (r.spectrum && r.spectrumLength > 1) {
    x0 = r.frequency[0];
    x1 = r.frequency[r.spectrumLength - 1];
  }
  const int32_t bottom = j["parameters"]["min_order"].get<int32_t>();
  const int32_t top = orders.empty() ? bottom : orders.back().get<int32_t>();
  const int32_t mdl = res["mdl_order"].get<int32_t>();
  files.push_back({"frame.csv", [=](std::FILE* f) {
                     Writer(f) << "x0,x1,y0,y1,mdl,label\n"
                               << Exact(x0) << "," << Exact(x1) << "," << Exact(bottom - 0.7) << ","
                               << Exact(top + 0.7) << "," << std::to_string(mdl) << ",MDL order "
                               << std::to_string(mdl) << "\n";
                   }});
  const bool backdrop = r.spectrum && r.spectrumLength > 1;
  if (backdrop) {
    files.push_back({"spectrum.csv", [&r](std::FILE* f) {
                       Writer w(f);
                       w << "frequency_hz,power_db\n";
                       for (size_t i = 0; i < r.spectrumLength; ++i)
                         w << Exact(r.frequency[i]) << "," << Exact(r.spectrum[i]) << "\n";
                     }});
  }
  script +=
      "stats 'frame.csv' using 1:2 nooutput prefix 'X'\n"
      "stats 'frame.csv' using 3:4 nooutput prefix 'Y'\n"
      "stats 'frame.csv' using 5 nooutput prefix 'M'\n"
      "set xrange [X_min_x:X_min_y]\nset yrange [Y_min_x:Y_min_y]\n"
      "set xlabel 'Frequency (Hz)'\nset ylabel 'Model order'\n"
      "set ytics 1 nomirror\nset mytics 1\nset grid xtics ytics\n"
      "set title font ',10'\n"
      "set key at screen 0.99, screen 0.90 right top vertical box opaque\n"
      "set lmargin at screen 0.07\nset rmargin at screen 0.70\n";
  if (backdrop)
    script +=
        "set y2label 'AR spectrum (dB, peak = 0 dB)'\nset y2tics\n"
        "set y2range [-100<*:10]\n";
  script += terminal + "plot ";
  if (backdrop)
    script +=
        "'spectrum.csv' using 1:2 axes x1y2 with lines lw 1.5 lc rgb '#b8b8b8' "
        "title 'AR spectrum', ";
  script +=
      "'data.csv' using ((int($6) & 4) ? NaN : $2):1 with points pt 6 ps 0.7 "
      "lc rgb '#c0392b' title 'not stable', "
      "'data.csv' using ((int($6) & 4) ? $2 : NaN):1 with points pt 7 ps 1.2 "
      "lc rgb '#1f5fa8' title 'stable'";
  if (mdl > 0)
    script +=
        ", 'frame.csv' using 1:5:($2 - $1):(0) with vectors nohead dt 2 lw 2 "
        "lc rgb '#27ae60' title 'MDL order', 'frame.csv' using ($1 + 0.01 * ($2 - $1)):($5 + "
        "0.35):6 "
        "with labels left tc rgb '#27ae60' notitle";
  return RunGnuplot(script + "\n", files, png);
}

// Draws the spectrum (modes marked), the modes, or the poles; false: no gnuplot.
// The script is fixed text; the title (which names the input), every number
// and every label are data files it reads.
bool Plot(const std::string& png, const Record& r) {
  const Json& j = r.json;
  const Json& res = j["results"];
  std::string key;
  for (const char* k : {"diagram", "spectrum", "modes", "poles", "roots"})
    if (key.empty() && res.contains(k)) key = k;
  std::string title = "qdm " + j["method"].get<std::string>() + ", " +
                      (j["input"] == "-" ? "standard input" : j["input"].get<std::string>());
  for (const auto& [name, v] : j["parameters"].items()) title += ", " + name + " " + Brief(v);
  std::vector<PlotFile> files = {
      {"title.txt", [&](std::FILE* f) { Writer(f) << PlotText(title) << "\n"; }},
      {"data.csv", [&](std::FILE* f) { WriteCsvTable(f, r, key); }},
  };
  // The legend sits below the frame, clear of the data.
  std::string script =
      "set datafile separator \"\\t\"\n"
      "set datafile commentschars \"\"\n"
      "stats 'title.txt' using (T = strcol(1), 0) nooutput\n"
      "set title T noenhanced\n"
      "set grid\nset key below horizontal\n"
      "set datafile separator ','\nset datafile columnheaders\n";
  const std::string terminal =
      "set terminal pngcairo size 1100,650 font 'DejaVu Sans,11'\nset output\n";
  const double rate = j["parameters"].value("rate_hz", 1.0);
  if (res.contains("diagram")) return PlotDiagram(png, r, files, script, terminal);
  std::vector<ModeLabel> labels;
  if (res.contains("modes")) {
    const Json& m = res["modes"];
    for (size_t i = 0; i < m["frequency_hz"].size(); ++i)
      labels.push_back({m["frequency_hz"][i].get<double>(), m["amplitude"][i].get<double>(), 0});
  }
  const auto writeLabels = [&](std::vector<ModeLabel> shown) {
    files.push_back({"modes.csv", [shown, rate](std::FILE* f) {
                       Writer w(f);
                       w << "frequency_hz,amplitude,row,label\n";
                       for (const ModeLabel& l : shown)
                         w << Exact(l.frequency) << "," << Exact(l.amplitude) << ","
                           << std::to_string(l.row) << "," << FrequencyLabel(l.frequency, rate)
                           << "\n";
                     }});
  };
  if (key == "spectrum") {
    const bool oneSided = res["spectrum"]["one_sided"].get<bool>();
    // One-sided, a mode at a negative frequency is its positive twin's mirror image.
    if (oneSided)
      labels.erase(std::remove_if(labels.begin(), labels.end(),
                                  [](const ModeLabel& l) { return l.frequency < 0.0; }),
                   labels.end());
    // A first pass on no terminal finds the y range; the labels get the band above it.
    script +=
        "set xlabel 'Frequency (Hz)'\nset ylabel 'Power (dB, peak = 0 dB)'\n"
        "set yrange [-160<*:*]\nset terminal unknown\nplot 'data.csv' using 1:2 notitle\n"
        "lo = GPVAL_Y_MIN\nhi = GPVAL_Y_MAX\nband = (hi - lo) * 0.08\n"
        "set yrange [lo:hi + 3.4 * band]\nset xrange [GPVAL_X_MIN:GPVAL_X_MAX]\n" +
        terminal + "plot 'data.csv' using 1:2 with lines lw 2 lc rgb '#1f5fa8' title 'AR spectrum'";
    if (!labels.empty()) {
      writeLabels(Stagger(labels, (oneSided ? 0.5 : 1.0) * rate * 0.09));
      script +=
          ", 'modes.csv' using 1:(lo):(0):(hi - lo) with vectors nohead dt 2 lw 1.5 "
          "lc rgb '#c0392b' title 'fitted modes', 'modes.csv' using 1:(hi + band * (0.7 + $3)):4 "
          "with labels center tc rgb '#c0392b' notitle";
    }
  } else if (key == "modes") {
    double lo = 0.0, hi = 0.0;
    for (size_t i = 0; i < labels.size(); ++i) {
      lo = i ? std::min(lo, labels[i].frequency) : labels[i].frequency;
      hi = i ? std::max(hi, labels[i].frequency) : labels[i].frequency;
    }
    // Margins keep the outermost stems off the frame; the labels stand in rows
    // above the tallest stem, clear of every stem.
    script +=
        "set xlabel 'Frequency (Hz)'\nset ylabel 'Amplitude'\nset yrange [0:*]\n"
        "set offsets graph 0.06, graph 0.06, 0, 0\n";
    std::string plot =
        "plot 'data.csv' using 'frequency_hz':'amplitude' with impulses lw 3 "
        "lc rgb '#1f5fa8' title 'fitted modes'";
    if (!labels.empty()) {
      writeLabels(Stagger(labels, std::max(hi - lo, 1e-300) * 0.1));
      script +=
          "stats 'modes.csv' using 2 nooutput\ntop = STATS_max > 0 ? STATS_max : 1\n"
          "set yrange [0:top * 1.4]\n";
      plot += ", 'modes.csv' using 1:(top * (1.1 + 0.09 * $3)):4 with labels center notitle";
    }
    script += terminal + plot;
  } else {
    script +=
        "set parametric\nset trange [0:2*pi]\nset size ratio -1\nset xlabel 'Real'\n"
        "set ylabel 'Imaginary'\nset offsets graph 0.05, graph 0.05, graph 0.05, graph 0.05\n" +
        terminal +
        "plot cos(t), sin(t) with lines lc rgb 'gray' title 'unit circle', 'data.csv' "
        "using 1:2 with points pt 7 ps 1.5 lc rgb '#1f5fa8' title '" +
        std::string(key == "roots" ? "roots" : "poles") + "'";
  }
  return RunGnuplot(script + "\n", files, png);
}

// ---- runs -----------------------------------------------------------------------------

// Makes one input's record; the record, or the error record, and the exit code it gives.
template <typename Make>
Record Guarded(Method m, const std::string& path, int* exitCode, Make make) {
  Failure f{kOk, {}, {}};
  try {
    *exitCode = kOk;
    return make();
  } catch (const Failure& failure) {
    f = failure;
    if (f.exit != kUsage || f.status)  // read errors name the file already
      f.message = Shown(path, kNameShown) + ": " + f.message;
  } catch (const std::bad_alloc&) {
    f = {kFailed, {}, Shown(path, kNameShown) + ": out of memory"};
  } catch (const std::exception& e) {
    f = {kFailed, {}, Shown(path, kNameShown) + ": " + Shown(e.what(), 200)};
  }
  *exitCode = f.exit;
  Record r;
  r.json = {{"input", path},
            {"method", kMethods[m][0]},
            {"status", nullptr},
            {"exit", f.exit},
            {"error", f.message}};
  if (f.status) r.json["status"] = *f.status;
  return r;
}

// Fits one input; the record, or the error record, and the exit code it gives.
Record RunOne(Method m, const Options& o, const std::string& path, int* exitCode) {
  return Guarded(m, path, exitCode, [&] { return Fit(m, o, path, Load(path, o)); });
}

// Runs body(0 .. count - 1) on `threads` threads (0: one per core), the calling one included.
void OnThreads(size_t count, int threads, const std::function<void(size_t)>& body) {
  const unsigned wanted =
      threads > 0 ? unsigned(threads) : std::max(1u, std::thread::hardware_concurrency());
  std::atomic<size_t> next{0};
  const auto work = [&] {
    for (size_t i; (i = next++) < count;) body(i);
  };
  std::vector<std::jthread> pool;
  for (size_t t = 1; t < std::min<size_t>(wanted, count); ++t) pool.emplace_back(work);
  work();
}

// Several files are read, fitted and printed a chunk at a time, so the
// samples and outputs held stay bounded: at most kChunkRecords files, or
// about kChunkBytes of samples and output rows (one file at least).
constexpr size_t kChunkRecords = 4096;
constexpr uint64_t kChunkBytes = uint64_t{256} << 20;

// A file of a chunk: its samples, or what reading them threw, and its row in its group.
struct Entry {
  size_t file = 0;
  Signal signal;
  std::exception_ptr error;
  size_t group = 0;
  int64_t row = 0;
};

// The chunk's records of one length, type and default rate: one batch call.
struct Group {
  int32_t n = 0;
  bool complex = false;
  double defaultRate = 1.0;
  std::vector<size_t> members;  // entries, in input order
  std::optional<Plan> plan;
  std::exception_ptr error;     // what the plan or the call threw, every member's
  std::vector<double> samples;  // the members' records one after another
  const double* x = nullptr;    // those records (a lone member's own samples)
  Rows rows;
};

// Resolves the group's parameters and fits its records with one batch call.
void FitGroup(Method m, const Options& o, std::vector<Entry>& chunk, Group& g) {
  try {
    g.plan = MakePlan(m, o, g.n, g.complex, g.defaultRate);
    if (m == kStabilization) return;  // no batch: each record by itself
    g.x = chunk[g.members[0]].signal.values.data();
    if (g.members.size() > 1) {
      const size_t values = size_t(g.n) * (g.complex ? 2 : 1);
      g.samples.resize(values * g.members.size());
      for (size_t j = 0; j < g.members.size(); ++j) {
        std::vector<double>& own = chunk[g.members[j]].signal.values;
        std::copy(own.begin(), own.end(), g.samples.begin() + std::ptrdiff_t(j * values));
        std::vector<double>().swap(own);
      }
      g.x = g.samples.data();
    }
    g.rows = Call(*g.plan, g.x, int64_t(g.members.size()), o.jobs);
  } catch (...) {
    g.error = std::current_exception();
  }
}

// What a record of a chunk holds, roughly: its samples, its output rows and its
// line, where a spectrum's or a diagram's text weighs the most (a number is at
// most 24 characters).
uint64_t RecordBytes(Method m, const Options& o, const Signal& s) {
  uint64_t bytes = sizeof(double) * (s.values.size() + 12 * (uint64_t(s.n) + 1));
  if (kSpectra & Bit(m)) bytes += uint64_t(qdm_spectrum_length(o.nfft.value_or(512))) * 3 * 32;
  if (m == kStabilization) {
    const int32_t top = std::min(o.maxOrder.value_or(20), s.n / 2);
    bytes += uint64_t(std::max<int64_t>(qdm_stabilization_rows(o.minOrder.value_or(1), top), 0)) *
             8 * 32;
  }
  return bytes;
}

// A file's JSON line, made ahead of its turn, and what goes to stderr with it.
struct Line {
  std::string text, warning, error;
  int code = kOk;
};

// The files in chunks: each chunk's records grouped by length and type, each
// group fitted by one batch call on --jobs threads, then one JSON line per
// file, in input order. The stabilization diagram has no batch: its records
// are fitted one by one on --jobs threads, where every line is made.
int RunBatch(Method m, const Options& o) {
  int exit = kOk;
  for (size_t next = 0; next < o.files.size();) {
    std::vector<Entry> chunk;
    std::vector<Group> groups;
    std::map<std::tuple<int32_t, bool, double>, size_t> groupOf;
    for (uint64_t bytes = 0;
         next < o.files.size() && chunk.size() < kChunkRecords && bytes < kChunkBytes;) {
      Entry& e = chunk.emplace_back();
      e.file = next++;
      try {
        e.signal = Load(o.files[e.file], o);
      } catch (...) {
        e.error = std::current_exception();
        continue;
      }
      const Signal& s = e.signal;
      bytes += RecordBytes(m, o, s);
      const auto [it, added] = groupOf.try_emplace({s.n, s.complex, s.defaultRate}, groups.size());
      if (added) {
        Group& g = groups.emplace_back();
        g.n = s.n, g.complex = s.complex, g.defaultRate = s.defaultRate;
      }
      e.group = it->second;
      e.row = int64_t(groups[e.group].members.size());
      groups[e.group].members.push_back(chunk.size() - 1);
    }
    for (Group& g : groups) FitGroup(m, o, chunk, g);
    // The chunk's lines are made on the --jobs threads (the diagrams fitted
    // there), then printed in input order.
    std::vector<Line> lines(chunk.size());
    OnThreads(chunk.size(), o.jobs, [&](size_t c) {
      const Entry& e = chunk[c];
      const std::string& path = o.files[e.file];
      Line& line = lines[c];
      try {
        const Record r = Guarded(m, path, &line.code, [&] {
          if (e.error) std::rethrow_exception(e.error);
          const Group& g = groups[e.group];
          if (g.error) std::rethrow_exception(g.error);
          if (m == kStabilization) return StabilizationRecord(*g.plan, path, e.signal, false);
          const size_t values = size_t(g.n) * (g.complex ? 2 : 1);
          return Present(*g.plan, path, g.rows, e.row, g.x + size_t(e.row) * values);
        });
        Writer w(&line.text);
        WriteJson(w, r, -1);
        w.Flush();
        line.warning = r.warning;
        if (line.code != kOk) line.error = r.json["error"].get<std::string>();
      } catch (...) {  // no memory even for the error record: written below
        line = Line{};
        line.code = kFailed;
      }
    });
    for (size_t c = 0; c < chunk.size(); ++c) {
      const std::string& path = o.files[chunk[c].file];
      Line& line = lines[c];
      if (line.text.empty()) {
        Record r;
        r.json = {{"input", path},
                  {"method", kMethods[m][0]},
                  {"status", nullptr},
                  {"exit", kFailed},
                  {"error", Shown(path, kNameShown) + ": out of memory"}};
        WriteJson(stdout, r, -1);
        line.error = r.json["error"].get<std::string>();
      }
      std::fwrite(line.text.data(), 1, line.text.size(), stdout);
      if (!line.warning.empty())
        std::fprintf(stderr, "qdm: %s: warning: %s\n", Shown(path, kNameShown).c_str(),
                     line.warning.c_str());
      if (line.code != kOk) {
        exit = kFailed;
        std::fprintf(stderr, "qdm: %s\n", line.error.c_str());
      }
      line = Line{};
    }
  }
  return exit;
}

int RunSingle(Method m, const Options& o) {
  const std::string path = o.files.empty() ? "-" : o.files[0];
  int code = kOk;
  Record r = RunOne(m, o, path, &code);
  if (code != kOk) {
    if (o.json) WriteJson(stdout, r, 2);
    std::fprintf(stderr, "qdm: %s\n", r.json["error"].get<std::string>().c_str());
    return code;
  }
  if (!r.warning.empty()) std::fprintf(stderr, "qdm: warning: %s\n", r.warning.c_str());
  if (o.json) {
    WriteJson(stdout, r, 2);
  } else if (o.csv) {
    WriteCsv(stdout, r);
  } else {
    std::fputs(Table(r.json).c_str(), stdout);
  }
  if (!o.plot.empty() && !Plot(o.plot, r))
    std::fprintf(stderr, "qdm: gnuplot not found on PATH, %s not drawn (install gnuplot-nox)\n",
                 Shown(o.plot, kNameShown).c_str());
  return kOk;
}

// ---- the command line -----------------------------------------------------------------

// CLI11 takes `--order ''` as no value at all; here it is an error.
const CLI::Validator kNonEmpty(
    [](std::string& value) {
      return value.empty() ? std::string("an empty value") : std::string();
    },
    "", "NonEmpty");

// --column(s) and --delimiter into the CSV format; a usage message, or "".
std::string MakeFormat(Options& o) {
  CsvFormat& f = o.format;
  f.maxBytes = o.maxInputBytes;
  const std::string& d = o.delimiter;
  if (d == "tab" || d == "\t")
    f.delimiter = '\t';
  else if (d == "space" || d == " ")
    f.blanks = true;
  else if (d == "," || d == ";" || d == "|")
    f.delimiter = d[0];
  else
    return "--delimiter takes ',', ';', '|', tab or space, not '" + Shown(d, kFieldShown) + "'";
  if (o.columns.empty()) return "";
  for (size_t i = 0;;) {
    const size_t end = std::min(o.columns.find(',', i), o.columns.size());
    f.columns.push_back(o.columns.substr(i, end - i));
    if (end == o.columns.size()) break;
    i = end + 1;
  }
  const bool empty = std::any_of(f.columns.begin(), f.columns.end(),
                                 [](const std::string& c) { return c.empty(); });
  if (f.columns.size() > 2 || empty)
    return "--column takes one column (real samples) or two, as N,M or NAME,NAME (real, "
           "imaginary), not '" +
           Shown(o.columns, kFieldShown) + "'";
  return "";
}

int Main(int argc, char** argv) {
  CLI::App app{
      "qdm: AR models, damped exponentials and AR spectra of a signal: a CSV file (one "
      "column: real samples;\ntwo: real and imaginary parts), standard input (FILE '-' "
      "or none), or the built-in example.",
      "qdm"};
  app.set_version_flag("--version", std::string("qdm ") + qdm_version());
  app.require_subcommand(1);
  app.footer(
      "Exit status: 0 success, 1 bad usage, input or value (a library status -424xx "
      "included), 2 the fit failed (any other library status, or no memory; with several "
      "files: any record failed), 3 an output that cannot be written.");
  Options o;
  std::vector<std::pair<CLI::App*, Method>> subs;
  // The options each subcommand has that its method does not use.
  std::vector<std::vector<CLI::Option*>> foreign(kStabilization + 1);
  const char* const kIgnored = "Options of other methods (an error without --ignore-unknown)";
  for (int m = kCovariance; m <= kStabilization; ++m) {
    CLI::App* sub = app.add_subcommand(kMethods[m][0], kMethods[m][1]);
    subs.push_back({sub, Method(m)});
    const unsigned bit = Bit(Method(m));
    const auto group = [&](CLI::Option* option, unsigned methods) {
      option->group(methods & bit ? "Parameters" : kIgnored);
      if (!(methods & bit)) foreign[size_t(m)].push_back(option);
    };
    for (const IntOption& io : kIntOptions)
      group(sub->add_option(io.flag, o.*io.field, io.help)->check(kNonEmpty), io.methods);
    group(sub->add_option("--rate", o.rate, "sampling rate in Hz [1000 for the example, else 1]")
              ->check(kNonEmpty),
          ~Bit(kMdl));
    group(sub->add_option("--solver", o.solver,
                          "how the pencil or pcar finds its singular triplets: auto, dense, or "
                          "krylov (Lanczos over FFT products, for long records) [auto]")
              ->check(CLI::IsMember({"auto", "dense", "krylov"})),
          Bit(kPencil) | Bit(kPcar));
    group(sub->add_flag("--real-signal", o.realSignal,
                        "real data: one mode per conjugate pair, at its non-negative frequency"),
          kModal | Bit(kStabilization));
    group(sub->add_option("--freq-tol", o.freqTol,
                          "relative frequency tolerance of a stable pole, of max(|f|, fs/n) "
                          "[0.01]")
              ->check(kNonEmpty),
          Bit(kStabilization));
    group(sub->add_option("--damping-tol", o.dampingTol,
                          "relative damping tolerance of a stable pole, of max(|d|, 1/n) [0.05]")
              ->check(kNonEmpty),
          Bit(kStabilization));
    group(sub->add_flag("--no-sort", o.noSort,
                        "modes in the library's order, not sorted by frequency"),
          kModal);
    CLI::Option* one =
        sub->add_flag("--one-sided", o.oneSided,
                      "spectrum from 0 to fs/2, the density doubled but at 0 and fs/2 (the "
                      "default for real data; an error for complex)");
    group(one, kSpectra);
    group(sub->add_flag("--two-sided", o.twoSided,
                        "spectrum from -fs/2 to fs/2 (always so for complex data)")
              ->excludes(one),
          kSpectra);
    sub->add_flag("--ignore-unknown", o.ignoreUnknown,
                  "accept and ignore options that do not apply to the method (for loops over "
                  "methods)");
    sub->add_option("files", o.files, "CSV files; '-' or none: standard input");
    sub->add_option("--example", o.example, "fit the built-in example signal: real or complex")
        ->expected(0, 1)
        ->default_str("real")
        ->check(CLI::IsMember({"real", "complex"}));
    sub->add_option("--column,--columns", o.columns,
                    "the CSV column of real samples, or two (real, imaginary) as N,M; by "
                    "1-based number or header name")
        ->check(kNonEmpty)
        ->group("Input");
    sub->add_option("--delimiter", o.delimiter,
                    "CSV field separator: ',' (default), ';', '|', tab, or space (runs of "
                    "spaces and tabs); other than ',', a comma in a number is its decimal point")
        ->check(kNonEmpty)
        ->group("Input");
    sub->add_option("--max-input-bytes", o.maxInputBytes,
                    "refuse input longer than this (units as 64MiB or 2GiB) [1GiB]")
        ->transform(CLI::AsSizeValue(false))
        ->check(CLI::Range(uint64_t{1}, uint64_t{1} << 62))
        ->group("Input");
    CLI::Option* json = sub->add_flag("--json", o.json, "print JSON");
    sub->add_flag("--csv", o.csv, "print the main table as CSV")->excludes(json);
    sub->add_option("--plot", o.plot, "draw the results to FILE.png with gnuplot")
        ->check(kNonEmpty);
    sub->add_option("--jobs", o.jobs,
                    "fit the files on N threads (0: one per core), one JSON line each: the "
                    "records of each length and type in one batch call (stabilization: file "
                    "by file, N at a time) [1]")
        ->check(kNonEmpty)
        ->check(CLI::Range(0, 1024));
    sub->footer("An option of another method is an error, or ignored with --ignore-unknown.");
  }
  Method method = kCovariance;  // the first argument names it
  CLI::App* chosen = nullptr;
  for (const auto& [sub, m] : subs)
    if (argc > 1 && sub->get_name() == argv[1]) chosen = sub, method = m;
  if (chosen == nullptr && (argc < 2 || argv[1][0] != '-')) {
    std::fprintf(stderr,
                 "qdm: %s%s%s; methods: covariance, prony, pcar, pencil, mdl, covspectrum, "
                 "pcarspectrum, stabilization (see qdm --help)\n",
                 argc < 2 ? "no method given" : "unknown method '",
                 argc < 2 ? "" : Shown(argv[1], kFieldShown).c_str(), argc < 2 ? "" : "'");
    return kUsage;
  }
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    if (e.get_exit_code() == 0) return app.exit(e);
    std::fprintf(stderr, "qdm: %s (see qdm --help)\n", Shown(e.what(), 200).c_str());
    return kUsage;
  }
  const bool batch = o.files.size() > 1 || chosen->count("--jobs") > 0;
  std::string usage = MakeFormat(o);
  for (const CLI::Option* option : foreign[method])
    if (option->count() > 0 && !o.ignoreUnknown)
      usage = option->get_name(false, true).substr(0, option->get_name(false, true).find(',')) +
              " does not apply to " + kMethods[method][0] +
              " (--ignore-unknown accepts it, for loops over methods)";
  if (!o.example.empty() && !o.files.empty()) usage = "--example takes no FILE";
  if (batch && (o.csv || !o.plot.empty())) usage = "--csv and --plot take one FILE, not --jobs";
  if (method == kMdl && !o.plot.empty()) usage = "--plot draws nothing for mdl";
  if (std::count(o.files.begin(), o.files.end(), "-") > 1)
    usage = "standard input ('-') can be read only once";
  if (!usage.empty()) {
    std::fprintf(stderr, "qdm: %s (see qdm %s --help)\n", usage.c_str(), kMethods[method][0]);
    return kUsage;
  }
  // gnuplot never sees the path, but a name with control bytes is no picture's name.
  if (std::any_of(o.plot.begin(), o.plot.end(),
                  [](unsigned char c) { return c < 0x20 || c == 0x7f; })) {
    std::fprintf(stderr, "qdm: refused --plot name '%s': it holds control characters\n",
                 Shown(o.plot, kNameShown).c_str());
    return kOutput;
  }
  if (o.files.empty())
    o.files.push_back(o.example.empty() ? "-" : "built-in example (" + o.example + ")");
  int code = kOk;
  try {
    code = batch ? RunBatch(method, o) : RunSingle(method, o);
  } catch (const Failure& f) {
    std::fprintf(stderr, "qdm: %s\n", f.message.c_str());
    code = f.exit;
  }
  if (std::fflush(stdout) != 0 || std::ferror(stdout)) {
    std::fprintf(stderr, "qdm: cannot write standard output: %s\n", std::strerror(errno));
    return kOutput;
  }
  return code;
}

}  // namespace

// Every exception ends here as one line and a documented exit code.
int main(int argc, char** argv) {
  try {
    return Main(argc, argv);
  } catch (const Failure& f) {
    std::fprintf(stderr, "qdm: %s\n", f.message.c_str());
    return f.exit;
  } catch (const std::bad_alloc&) {
    std::fputs("qdm: out of memory\n", stderr);
  } catch (const std::exception& e) {
    std::fprintf(stderr, "qdm: %s\n", Shown(e.what(), 200).c_str());
  } catch (...) {
    std::fputs("qdm: unexpected error\n", stderr);
  }
  return kFailed;
}
