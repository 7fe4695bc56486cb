// qdm: the command-line tool over the plain C API (libqdm_api). One method per run on a CSV
// file, standard input or the built-in example; a table, JSON or CSV on standard output, and a
// plot drawn with gnuplot. With several files (or --jobs) the files are fitted on a pool of
// threads and printed as JSON lines, in input order. Exit status: 0 success, 1 bad usage or
// input, 2 a library status (several files: any record failed), 3 an output not written.
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <charconv>
#include <cmath>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <iostream>
#include <mutex>
#include <optional>
#include <sstream>
#include <string>
#include <thread>
#include <utility>
#include <vector>

#include "CLI/CLI.hpp"
#include "example_signal.h"
#include "nlohmann/json.hpp"
#include "qdm_api.h"

namespace {

using Json = nlohmann::ordered_json;
enum Exit { kOk = 0, kUsage = 1, kLibrary = 2, kOutput = 3 };
constexpr double kPi = 3.14159265358979323846;

// A failed record or run: its exit code, the library status if any, one line.
struct Failure {
  int exit;
  std::optional<int32_t> status;
  std::string message;
};

enum Method { kCovariance, kProny, kPcar, kPencil, kMdl, kCovSpectrum, kPcarSpectrum };
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
};

// Everything the command line sets; unset parameters take the method's default.
struct Options {
  std::optional<int32_t> order, components, pencil, modes, upper, minOrder, points;
  std::optional<double> rate;
  bool realSignal = false, json = false, csv = false;
  std::string example, plot;
  std::vector<std::string> files;
  int jobs = 1;
};

// The integer parameters, and the methods each applies to.
struct IntOption {
  const char* flag;
  const char* key;
  std::optional<int32_t> Options::*field;
  int32_t fallback;  // pencil: n/3, prony's order: 6
  const char* help;
  unsigned methods;
};
const IntOption kIntOptions[] = {
    {"--order", "order", &Options::order, 12, "model order p [12; prony 6]",
     Bit(kCovariance) | Bit(kProny) | Bit(kPcar) | kSpectra},
    {"--components", "components", &Options::components, 6, "singular components / modes k [6]",
     Bit(kPcar) | Bit(kPcarSpectrum)},
    {"--pencil", "pencil", &Options::pencil, 0, "pencil parameter L [n/3]", Bit(kPencil)},
    {"--modes", "modes", &Options::modes, 6, "number of modes M [6]", Bit(kPencil)},
    {"--upper", "upper", &Options::upper, 16, "upper order L [16]", Bit(kMdl)},
    {"--min-order", "min_order", &Options::minOrder, 1, "smallest order tried [1]", Bit(kMdl)},
    {"--points", "points", &Options::points, 512,
     "spectrum points, rounded up to a power of two [512]", kSpectra},
};

struct Signal {
  bool complex = false;
  std::vector<double> values;  // n reals, or n (re, im) pairs
  int32_t n = 0;
  double defaultRate = 1.0;
  // The samples as either twin takes them.
  operator const double*() const { return values.data(); }
  operator const qdm_complex*() const {
    return reinterpret_cast<const qdm_complex*>(values.data());
  }
};

[[noreturn]] void Bad(const std::string& message) { throw Failure{kUsage, {}, message}; }

std::string Trim(const std::string& s) {
  const size_t b = s.find_first_not_of(" \t\r\n");
  return b == std::string::npos ? "" : s.substr(b, s.find_last_not_of(" \t\r\n") - b + 1);
}

bool ToDouble(const std::string& field, double* v) {
  const char* first = field.c_str() + (field.size() > 1 && field[0] == '+');
  const char* last = field.c_str() + field.size();
  const auto r = std::from_chars(first, last, *v);
  return !field.empty() && r.ec == std::errc() && r.ptr == last;
}

// One column: real samples; two: real and imaginary parts. Blank lines and
// '#' comments are skipped; a first line with no number in it is a header.
Signal ReadCsv(std::istream& in, const std::string& name) {
  Signal s;
  size_t columns = 0;
  bool first = true;
  std::string line;
  for (size_t lineNo = 1; std::getline(in, line); ++lineNo) {
    const std::string text = Trim(line.substr(0, line.find('#')));
    if (text.empty()) continue;
    std::vector<std::string> fields;
    std::stringstream split(text);
    for (std::string f; std::getline(split, f, ',');) fields.push_back(Trim(f));
    if (text.back() == ',') fields.push_back("");
    const std::string where = name + ":" + std::to_string(lineNo) + ": ";
    double v = 0.0;
    if (std::exchange(first, false) &&
        std::none_of(fields.begin(), fields.end(), [&](auto& f) { return ToDouble(f, &v); }))
      continue;  // a header
    if (columns == 0) columns = fields.size();
    if (columns > 2) Bad(where + std::to_string(columns) + " columns; expected 1 or 2");
    if (fields.size() != columns)
      Bad(where + std::to_string(fields.size()) + " fields, expected " + std::to_string(columns));
    for (size_t c = 0; c < columns; ++c) {
      if (!ToDouble(fields[c], &v))
        Bad(where + "field " + std::to_string(c + 1) + " '" + fields[c] + "' is not a number");
      s.values.push_back(v);
    }
  }
  if (in.bad()) Bad("error reading " + name);
  if (columns == 0) Bad(name + ": no samples");
  if (s.values.size() / columns > INT32_MAX) Bad(name + ": too many samples");
  s.complex = columns == 2;
  s.n = static_cast<int32_t>(s.values.size() / columns);
  return s;
}

Signal Load(const std::string& path, const Options& o) {
  if (!o.example.empty()) {
    Signal s;
    s.complex = o.example == "complex";
    s.values = qdm_example::Make(s.complex);
    s.n = qdm_example::kLength;
    s.defaultRate = qdm_example::kRate;
    return s;
  }
  if (path == "-") return ReadCsv(std::cin, "standard input");
  std::ifstream in(path);
  if (!in) Bad("cannot read " + path + ": " + std::strerror(errno));
  return ReadCsv(in, path);
}

struct Record {
  Json json;  // input, method, signal, parameters, status, results (or error)
  int32_t status = QDM_OK;
  std::string warning;
};

void Check(int32_t status, const char* function, bool complex, Record& r) {
  r.status = status;
  if (status == QDM_WARN_RANK_DEFICIENT) r.warning = qdm_status_text(status);
  if (status == QDM_OK || status == QDM_WARN_RANK_DEFICIENT) return;
  throw Failure{kLibrary, status,
                function + std::string(complex ? "_complex" : "_real") + " returned " +
                    std::to_string(status) + ": " + qdm_status_text(status)};
}

// A caller-allocated output that passes as either twin's pointer type.
struct Array {
  std::vector<double> v;
  explicit Array(size_t doubles) : v(std::max<size_t>(doubles, 2)) {}
  operator double*() { return v.data(); }
  operator qdm_complex*() { return reinterpret_cast<qdm_complex*>(v.data()); }
};

// The twins of a plain-API function that take the same arguments after the samples.
#define QDM_TWIN(fn, ...) \
  Check(s.complex ? fn##_complex(s, __VA_ARGS__) : fn##_real(s, __VA_ARGS__), #fn, s.complex, r)

// Rows of named columns: row i of column c is values[c][i * stride]; null columns are left out.
Json Rows(std::initializer_list<const char*> names, std::vector<const double*> values, size_t n,
          size_t stride = 1) {
  Json t = Json::array();
  for (size_t i = 0; i < n; ++i) {
    Json row = Json::object();
    size_t c = 0;
    for (const char* name : names)
      if (const double* column = values[c++]) row[name] = column[i * stride];
    t.push_back(row);
  }
  return t;
}

// Complex values (pairs) with their modulus and frequency.
Json Poles(const double* z, size_t n, double rate) {
  Json t = Json::array();
  for (size_t i = 0; i < 2 * n; i += 2)
    t.push_back({{"real", z[i]},
                 {"imag", z[i + 1]},
                 {"modulus", std::hypot(z[i], z[i + 1])},
                 {"frequency_hz", std::atan2(z[i + 1], z[i]) * rate / (2.0 * kPi)}});
  return t;
}

Record Fit(Method m, const Options& o, const std::string& input, const Signal& s) {
  Record r;
  const double rate = o.rate.value_or(s.defaultRate);
  const int32_t flag = o.realSignal ? 1 : 0, n = s.n;
  int32_t resolved[std::size(kIntOptions)];
  for (size_t i = 0; i < std::size(kIntOptions); ++i)
    resolved[i] = (o.*kIntOptions[i].field).value_or(kIntOptions[i].fallback);
  if (!o.order && m == kProny) resolved[0] = 6;
  if (!o.pencil) resolved[2] = n / 3;
  const auto [p, k, L, M, upper, minOrder, points] = resolved;
  Json par = Json::object(), res = Json::object();
  for (size_t i = 0; i < std::size(kIntOptions); ++i)
    if (kIntOptions[i].methods & Bit(m)) par[kIntOptions[i].key] = resolved[i];
  if (m != kMdl) par["rate_hz"] = rate;
  if ((kModal & Bit(m)) && !s.complex) par["real_signal"] = flag;
  // Outputs are sized from parameters the library accepts (orders below n).
  const size_t room = std::clamp(std::max({p, k, M}), 1, std::max(n, 1)) + 1;
  Array a(2 * room), z(2 * room), amp(room), phase(room), damping(room), freq(room);
  Array db(std::max(qdm_spectrum_length(points), 1));
  double variance = 0.0, mse = 0.0, f0 = 0.0, df = 0.0, fitError = 0.0;
  int32_t count = 0, order = 0;
  switch (m) {
    case kCovariance: QDM_TWIN(qdm_covariance, n, p, a, z, &variance); break;
    case kPcar: QDM_TWIN(qdm_pcar, n, p, k, a, z); break;
    case kMdl: QDM_TWIN(qdm_mdl_order, n, upper, minOrder, &order); break;
    case kCovSpectrum:
      QDM_TWIN(qdm_covariance_psd, n, p, points, rate, db, &f0, &df, &variance);
      break;
    case kProny:  // the real twins of these three take the real-signal flag
      Check(s.complex ? qdm_prony_complex(s, n, p, rate, amp, phase, damping, freq, &count)
                      : qdm_prony_real(s, n, p, rate, flag, amp, phase, damping, freq, &count),
            "qdm_prony", s.complex, r);
      break;
    case kPencil:
      Check(s.complex ? qdm_matrix_pencil_complex(s, n, L, M, rate, amp, phase, damping, freq,
                                                  &count, &mse)
                      : qdm_matrix_pencil_real(s, n, L, M, rate, flag, amp, phase, damping, freq,
                                               &count, &mse),
            "qdm_matrix_pencil", s.complex, r);
      break;
    case kPcarSpectrum:
      Check(s.complex ? qdm_pcar_psd_complex(s, n, p, points, k, rate, amp, phase, freq, &count, db,
                                             &f0, &df, &fitError)
                      : qdm_pcar_psd_real(s, n, p, points, k, rate, flag, amp, phase, freq, &count,
                                          db, &f0, &df, &fitError),
            "qdm_pcar_psd", s.complex, r);
      break;
  }
  if (m == kCovariance || m == kCovSpectrum) res["noise_variance"] = variance;
  if (m == kCovariance || m == kPcar) {
    const double* c = a;
    res["coefficients"] =
        s.complex ? Rows({"real", "imag"}, {c, c + 1}, p + 1, 2) : Rows({"value"}, {c}, p + 1);
    res[m == kPcar ? "roots" : "poles"] = Poles(z, p, rate);
  }
  if (m == kMdl) res["order"] = order;
  if (m == kPcarSpectrum) res["fit_error"] = fitError;
  if (m == kPencil) res["mse"] = mse;
  if (kModal & Bit(m)) {
    res["mode_count"] = count;
    res["modes"] = Rows({"amplitude", "phase_rad", "damping", "frequency_hz"},
                        {amp, phase, m == kPcarSpectrum ? nullptr : damping.v.data(), freq}, count);
  }
  if (kSpectra & Bit(m)) {
    db.v.resize(qdm_spectrum_length(points));
    res["spectrum"] = {{"f0_hz", f0}, {"df_hz", df}, {"length", db.v.size()}, {"db", db.v}};
  }
  r.json = {{"input", input},
            {"method", kMethods[m][0]},
            {"signal", {{"type", s.complex ? "complex" : "real"}, {"samples", n}}},
            {"parameters", par},
            {"status", r.status}};
  if (!r.warning.empty()) r.json["warning"] = r.warning;
  r.json["results"] = res;
  return r;
}

// Shortest text that reads back as the same double (null, for NaN: nan).
std::string Exact(const Json& v) {
  char b[32];
  return std::string(b, std::to_chars(b, b + sizeof b, v.is_null() ? NAN : v.get<double>()).ptr);
}

std::string Brief(const Json& v) {
  char buf[32];
  std::snprintf(buf, sizeof buf, "%.8g", v.is_null() ? NAN : v.get<double>());
  return v.is_number_float() || v.is_null() ? buf : v.dump();
}

std::string Padded(const std::string& text, size_t width) {
  return std::string(width > text.size() ? width - text.size() : 1, ' ') + text;
}

std::string Table(const Json& j) {
  const std::string input = j["input"];
  std::string out = "qdm " + j["method"].get<std::string>() + ": " +
                    (input == "-" ? "standard input" : input) + ", " +
                    j["signal"]["type"].get<std::string>() + ", " + j["signal"]["samples"].dump() +
                    " samples\nparameters:";
  for (const auto& [key, v] : j["parameters"].items()) out += " " + key + " = " + Brief(v);
  out += "\n\n";
  for (const auto& [key, v] : j["results"].items())
    if (v.is_primitive()) out += key + Padded(Brief(v), 30 - key.size()) + "\n";
  for (const auto& [key, v] : j["results"].items()) {
    if (key == "spectrum") {
      out += "\nspectrum: " + v["length"].dump() + " values in dB from " + Brief(v["f0_hz"]) +
             " Hz in steps of " + Brief(v["df_hz"]) + " Hz (--csv lists them)\n";
    } else if (v.is_array()) {
      out += "\n" + key + (v.empty() ? ": none\n" : "\n   #");
      if (!v.empty())
        for (const auto& [column, _] : v[0].items()) out += Padded(column, 17);
      for (size_t i = 0; i < v.size(); ++i) {
        out += "\n" + Padded(std::to_string(i), 4);
        for (const Json& cell : v[i]) out += Padded(Brief(cell), 17);
      }
      out += v.empty() ? "" : "\n";
    }
  }
  return out;
}

// One table of the results as CSV, numbers exact: the spectrum (frequency_hz,
// power_db) or an array of records (modes, coefficients, poles).
std::string CsvTable(const Json& res, const std::string& key) {
  std::string out;
  if (key == "spectrum") {
    const Json& s = res[key];
    out = "frequency_hz,power_db\n";
    for (size_t i = 0; i < s["db"].size(); ++i)
      out += Exact(s["f0_hz"].get<double>() + static_cast<double>(i) * s["df_hz"].get<double>()) +
             "," + Exact(s["db"][i]) + "\n";
  }
  for (size_t i = 0; key != "spectrum" && i < res[key].size(); ++i) {
    std::string header, row;
    for (const auto& [column, v] : res[key][i].items()) {
      header.append(",").append(column);
      row.append(",").append(Exact(v));
    }
    out += (i == 0 ? header.substr(1) + "\n" : "") + row.substr(1) + "\n";
  }
  return out;
}

// The method's main table: the spectrum, the modes, the coefficients, or the order.
std::string Csv(const Json& res) {
  for (const char* key : {"spectrum", "modes", "coefficients"})
    if (res.contains(key)) return CsvTable(res, key);
  return "order\n" + res["order"].dump() + "\n";
}

std::string Quoted(const std::string& s) {  // a gnuplot string
  std::string out = "'";
  for (const char c : s) out += c == '\'' ? std::string("''") : std::string(1, c);
  return out + "'";
}

// Draws the spectrum (modes marked), the modes, or the poles; false: no gnuplot.
bool Plot(const std::string& png, const Json& j) {
  const Json& res = j["results"];
  std::string key;
  for (const char* k : {"spectrum", "modes", "poles", "roots"})
    if (key.empty() && res.contains(k)) key = k;
  if (key.empty()) return true;  // mdl: nothing to draw
  if (std::system("command -v gnuplot >/dev/null 2>&1") != 0) return false;
  std::string title =
      "qdm " + j["method"].get<std::string>() + ", " + j["input"].get<std::string>();
  for (const auto& [name, v] : j["parameters"].items()) title += ", " + name + " " + Brief(v);
  std::string script = "set terminal pngcairo size 1100,650 font 'DejaVu Sans,11'\nset output " +
                       Quoted(png) + "\nset title " + Quoted(title) +
                       " noenhanced\nset grid\nset key bottom right opaque box\n"
                       "set datafile separator ','\nset datafile columnheaders\n$d << EOD\n" +
                       CsvTable(res, key) + "EOD\n";
  if (key == "spectrum") {
    const bool mirror = j["parameters"].value("real_signal", 0) == 1;
    const Json modes = res.value("modes", Json::array());
    for (const Json& mode : modes) {
      const double f = mode["frequency_hz"];
      script += "set label '" + Brief(f) + " Hz' at " + Exact(f) +
                ", graph 0.96 offset 0.5,0 tc rgb '#c0392b'\n";
      for (const double x : mirror ? std::vector{f, -f} : std::vector{f})
        script += "set arrow from " + Exact(x) + ", graph 0 to " + Exact(x) +
                  ", graph 1 nohead dt 2 lw 1.5 lc rgb '#c0392b'\n";
    }
    script +=
        "set xlabel 'Frequency (Hz)'\nset ylabel 'Power (dB, peak = 0 dB)'\n"
        "set yrange [-160<*:3]\nplot $d using 1:2 with lines lw 2 lc rgb '#1f5fa8' title "
        "'AR spectrum'" +
        std::string(modes.empty() ? ""
                                  : ", NaN with lines dt 2 lw 1.5 lc rgb '#c0392b' title 'modes'");
  } else if (key == "modes") {
    script +=
        "set xlabel 'Frequency (Hz)'\nset ylabel 'Amplitude'\nset yrange [0:*]\n"
        "plot $d using 'frequency_hz':'amplitude' with impulses lw 3 lc rgb '#1f5fa8' "
        "title 'modes', '' using 'frequency_hz':'amplitude':(sprintf('%.4g Hz', "
        "column('frequency_hz'))) with labels offset 0,1 notitle";
  } else {
    script +=
        "set parametric\nset trange [0:2*pi]\nset size ratio -1\nset xlabel 'Real'\n"
        "set ylabel 'Imaginary'\nplot cos(t), sin(t) with lines lc rgb 'gray' title "
        "'unit circle', $d using 1:2 with points pt 7 ps 1.5 lc rgb '#1f5fa8' title " +
        Quoted(key);
  }
  char path[] = "/tmp/qdm-plot-XXXXXX";
  const int fd = mkstemp(path);
  script += "\n";
  const bool written = fd >= 0 && write(fd, script.data(), script.size()) == ssize_t(script.size());
  std::string reason;  // gnuplot's last line
  int rc = -1;
  FILE* gnuplot =
      written ? popen(("gnuplot " + std::string(path) + " 2>&1").c_str(), "r") : nullptr;
  for (char line[512]; gnuplot && std::fgets(line, sizeof line, gnuplot);)
    if (!Trim(line).empty()) reason = Trim(line);
  if (gnuplot) rc = pclose(gnuplot);
  if (fd >= 0) close(fd), std::remove(path);
  if (rc != 0) throw Failure{kOutput, {}, "gnuplot could not draw " + png + ": " + reason};
  return true;
}

// Fits one input; the record, or the error record, and the exit code it gives.
Record RunOne(Method m, const Options& o, const std::string& path, int* exitCode) {
  Failure f;
  try {
    *exitCode = kOk;
    return Fit(m, o, path, Load(path, o));
  } catch (const Failure& failure) {
    f = failure;
    if (f.status) f.message = path + ": " + f.message;  // read errors name the file already
  } catch (const std::exception& e) {                   // no memory for the samples, say
    f = {kUsage, {}, path + ": " + e.what()};
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

// Each file on a pool of threads; one JSON line per file, printed in input order.
int RunBatch(Method m, const Options& o) {
  const size_t n = o.files.size();
  std::vector<std::optional<Record>> records(n);
  std::vector<int> codes(n);
  std::mutex mutex;
  std::condition_variable ready;
  std::atomic<size_t> next{0};
  auto worker = [&] {
    for (size_t i; (i = next++) < n;) {
      Record r = RunOne(m, o, o.files[i], &codes[i]);
      std::lock_guard<std::mutex> lock(mutex);
      records[i] = std::move(r);
      ready.notify_all();
    }
  };
  const unsigned threads = o.jobs > 0 ? o.jobs : std::max(1u, std::thread::hardware_concurrency());
  std::vector<std::jthread> pool;
  for (unsigned t = 0; t < std::min<size_t>(threads, n); ++t) pool.emplace_back(worker);
  int exit = kOk;
  for (size_t i = 0; i < n; ++i) {
    std::unique_lock<std::mutex> lock(mutex);
    ready.wait(lock, [&] { return records[i].has_value(); });
    const Record r = std::move(*records[i]);
    records[i].reset();
    lock.unlock();
    std::fputs((r.json.dump(-1, ' ', false, Json::error_handler_t::replace) + "\n").c_str(),
               stdout);
    if (!r.warning.empty())
      std::fprintf(stderr, "qdm: %s: warning: %s\n", o.files[i].c_str(), r.warning.c_str());
    if (codes[i] != kOk) exit = kLibrary;
    if (codes[i] != kOk)
      std::fprintf(stderr, "qdm: %s\n", r.json["error"].get<std::string>().c_str());
  }
  return exit;
}

int RunSingle(Method m, const Options& o) {
  const std::string path = o.files.empty() ? "-" : o.files[0];
  int code = kOk;
  Record r = RunOne(m, o, path, &code);
  if (code != kOk) {
    if (o.json) std::printf("%s\n", r.json.dump(2).c_str());
    std::fprintf(stderr, "qdm: %s\n", r.json["error"].get<std::string>().c_str());
    return code;
  }
  if (!r.warning.empty()) std::fprintf(stderr, "qdm: warning: %s\n", r.warning.c_str());
  const std::string out = o.json ? r.json.dump(2, ' ', false, Json::error_handler_t::replace) + "\n"
                          : o.csv ? Csv(r.json["results"])
                                  : Table(r.json);
  std::fputs(out.c_str(), stdout);
  if (!o.plot.empty() && !Plot(o.plot, r.json))
    std::fprintf(stderr, "qdm: gnuplot not found on PATH, %s not drawn (install gnuplot-nox)\n",
                 o.plot.c_str());
  return kOk;
}

}  // namespace

int main(int argc, char** argv) {
  CLI::App app{
      "qdm: AR models, damped exponentials and AR spectra of a signal: a CSV file (one "
      "column: real samples;\ntwo: real and imaginary parts), standard input (FILE '-' "
      "or none), or the built-in example.",
      "qdm"};
  app.set_version_flag("--version", std::string("qdm ") + qdm_version());
  app.require_subcommand(1);
  app.footer(
      "Exit status: 0 success, 1 bad usage or input, 2 a library status (with several "
      "files: any record failed), 3 an output that cannot be written.");
  Options o;
  std::vector<std::pair<CLI::App*, Method>> subs;
  for (int m = kCovariance; m <= kPcarSpectrum; ++m) {
    CLI::App* sub = app.add_subcommand(kMethods[m][0], kMethods[m][1]);
    subs.push_back({sub, Method(m)});
    const unsigned bit = Bit(Method(m));
    for (const IntOption& io : kIntOptions)
      sub->add_option(io.flag, o.*io.field, io.help)->group(io.methods & bit ? "Parameters" : "");
    sub->add_option("--rate", o.rate, "sampling rate in Hz [1000 for the example, else 1]")
        ->group(m == kMdl ? "" : "Parameters");
    sub->add_flag("--real-signal", o.realSignal,
                  "real data: one mode per conjugate pair, at its non-negative frequency")
        ->group(kModal & bit ? "Parameters" : "");
    sub->add_option("files", o.files, "CSV files; '-' or none: standard input");
    sub->add_option("--example", o.example, "fit the built-in example signal: real or complex")
        ->expected(0, 1)
        ->default_str("real")
        ->check(CLI::IsMember({"real", "complex"}));
    CLI::Option* json = sub->add_flag("--json", o.json, "print JSON");
    sub->add_flag("--csv", o.csv, "print the main table as CSV")->excludes(json);
    sub->add_option("--plot", o.plot, "draw the results to FILE.png with gnuplot");
    sub->add_option("--jobs", o.jobs, "fit the files on N threads (0: one per core), JSON lines")
        ->check(CLI::Range(0, 1024));
    sub->footer("Options of the other methods are accepted and ignored.");
  }
  Method method = kCovariance;  // the first argument names it
  CLI::App* chosen = nullptr;
  for (const auto& [sub, m] : subs)
    if (argc > 1 && sub->get_name() == argv[1]) chosen = sub, method = m;
  if (chosen == nullptr && (argc < 2 || argv[1][0] != '-')) {
    std::fprintf(stderr,
                 "qdm: %s%s%s; methods: covariance, prony, pcar, pencil, mdl, covspectrum, "
                 "pcarspectrum (see qdm --help)\n",
                 argc < 2 ? "no method given" : "unknown method '", argc < 2 ? "" : argv[1],
                 argc < 2 ? "" : "'");
    return kUsage;
  }
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    if (e.get_exit_code() == 0) return app.exit(e);
    std::fprintf(stderr, "qdm: %s (see qdm --help)\n", e.what());
    return kUsage;
  }
  const bool batch = o.files.size() > 1 || chosen->count("--jobs") > 0;
  std::string usage;
  if (!o.example.empty() && !o.files.empty()) usage = "--example takes no FILE";
  if (batch && (o.csv || !o.plot.empty())) usage = "--csv and --plot take one FILE, not --jobs";
  if (!usage.empty()) {
    std::fprintf(stderr, "qdm: %s (see qdm %s --help)\n", usage.c_str(), kMethods[method][0]);
    return kUsage;
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
