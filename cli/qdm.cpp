// qdm: the command-line tool over the plain C API (libqdm_api).
//
// One method per run, on a signal read from a CSV file, standard input or the
// built-in example; results as a table, JSON or CSV on standard output, and a
// plot drawn with gnuplot. With several files (or --jobs) each file is fitted
// on a pool of threads and printed as one JSON line, in input order.
//
// Exit status: 0 success, 1 bad usage or input, 2 a library status (in batch
// mode: any record failed), 3 an output that cannot be written.
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

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include "example_signal.h"
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

struct MethodInfo {
  const char* name;
  const char* title;
};
constexpr MethodInfo kMethods[] = {
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
  std::optional<int32_t> Options::*field;
  const char* help;
  unsigned methods;
};
const IntOption kIntOptions[] = {
    {"--order", &Options::order, "model order p [12; prony 6]",
     Bit(kCovariance) | Bit(kProny) | Bit(kPcar) | kSpectra},
    {"--components", &Options::components, "singular components / modes k [6]",
     Bit(kPcar) | Bit(kPcarSpectrum)},
    {"--pencil", &Options::pencil, "pencil parameter L [n/3]", Bit(kPencil)},
    {"--modes", &Options::modes, "number of modes M [6]", Bit(kPencil)},
    {"--upper", &Options::upper, "upper order L [16]", Bit(kMdl)},
    {"--min-order", &Options::minOrder, "smallest order tried [1]", Bit(kMdl)},
    {"--points", &Options::points, "spectrum points, rounded up to a power of two [512]",
     kSpectra},
};

// ---- the signal -------------------------------------------------------------------

struct Signal {
  bool complex = false;
  std::vector<double> values;  // n reals, or n (re, im) pairs
  int32_t n = 0;
  double defaultRate = 1.0;
};

std::string Trim(const std::string& s) {
  const size_t b = s.find_first_not_of(" \t\r");
  return b == std::string::npos ? "" : s.substr(b, s.find_last_not_of(" \t\r") - b + 1);
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
    if (columns > 2)
      throw Failure{kUsage, {}, where + std::to_string(columns) + " columns; expected 1 or 2"};
    if (fields.size() != columns)
      throw Failure{kUsage, {}, where + std::to_string(fields.size()) + " fields, expected " +
                                    std::to_string(columns)};
    for (size_t c = 0; c < columns; ++c) {
      if (!ToDouble(fields[c], &v))
        throw Failure{kUsage, {},
                      where + "field " + std::to_string(c + 1) + " '" + fields[c] +
                          "' is not a number"};
      s.values.push_back(v);
    }
  }
  if (in.bad()) throw Failure{kUsage, {}, "error reading " + name};
  if (columns == 0) throw Failure{kUsage, {}, name + ": no samples"};
  if (s.values.size() / columns > INT32_MAX) throw Failure{kUsage, {}, name + ": too many samples"};
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
  if (!in) throw Failure{kUsage, {}, "cannot read " + path + ": " + std::strerror(errno)};
  return ReadCsv(in, path);
}

// ---- running a method ------------------------------------------------------------

struct Record {
  Json json;  // input, method, signal, parameters, status, results (or error)
  int32_t status = QDM_OK;
  std::string warning;
};

void Check(int32_t status, const char* function, Record& r) {
  r.status = status;
  if (status == QDM_WARN_RANK_DEFICIENT) r.warning = qdm_status_text(status);
  else if (status != QDM_OK)
    throw Failure{kLibrary, status,
                  std::string(function) + " returned " + std::to_string(status) + ": " +
                      qdm_status_text(status)};
}

// Complex values (pairs) with their modulus and frequency.
Json Poles(const std::vector<double>& z, double rate) {
  Json t = Json::array();
  for (size_t i = 0; i + 1 < z.size(); i += 2)
    t.push_back({{"real", z[i]}, {"imag", z[i + 1]}, {"modulus", std::hypot(z[i], z[i + 1])},
                 {"frequency_hz", std::atan2(z[i + 1], z[i]) * rate / (2.0 * kPi)}});
  return t;
}

Json Coefficients(const std::vector<double>& a, bool complex) {
  Json t = Json::array();
  for (size_t i = 0; i < a.size(); i += complex ? 2 : 1)
    t.push_back(complex ? Json{{"real", a[i]}, {"imag", a[i + 1]}} : Json{{"value", a[i]}});
  return t;
}

struct Modes {
  std::vector<double> amplitude, phase, damping, frequency;
  int32_t count = 0;
  explicit Modes(int32_t room)
      : amplitude(std::max(room, 1)), phase(amplitude), damping(amplitude), frequency(amplitude) {}
  Json Table(bool withDamping) const {
    Json t = Json::array();
    for (int32_t i = 0; i < count; ++i) {
      Json row = {{"amplitude", amplitude[i]}, {"phase_rad", phase[i]}};
      if (withDamping) row["damping"] = damping[i];
      row["frequency_hz"] = frequency[i];
      t.push_back(row);
    }
    return t;
  }
};

// The highest local maxima of the periodic spectrum; non-negative half for real data.
Json Peaks(const std::vector<double>& db, double f0, double df, bool realData, size_t count) {
  const size_t L = db.size();
  std::vector<std::pair<double, size_t>> peaks;
  for (size_t j = realData ? L / 2 : 0; j < L && L >= 3; ++j)
    if (db[j] >= db[(j + L - 1) % L] && db[j] > db[(j + 1) % L]) peaks.push_back({db[j], j});
  std::stable_sort(peaks.begin(), peaks.end(), [](auto& a, auto& b) { return a.first > b.first; });
  Json t = Json::array();
  for (size_t i = 0; i < peaks.size() && i < count; ++i)
    t.push_back({{"frequency_hz", f0 + static_cast<double>(peaks[i].second) * df},
                 {"db", peaks[i].first}});
  return t;
}

Record Fit(Method m, const Options& o, const std::string& input, const Signal& s) {
  Record r;
  const double* x = s.values.data();
  const auto* cx = reinterpret_cast<const qdm_complex*>(s.values.data());
  const double rate = o.rate.value_or(s.defaultRate);
  const int32_t flag = o.realSignal ? 1 : 0;
  const int32_t p = o.order.value_or(m == kProny ? 6 : 12), k = o.components.value_or(6);
  Json par = Json::object(), res = Json::object();
  switch (m) {
    case kCovariance:
    case kPcar: {
      par["order"] = p;
      if (m == kPcar) par["components"] = k;
      par["rate_hz"] = rate;
      std::vector<double> a((s.complex ? 2 : 1) * (std::max(p, 0) + 1)), z(2 * std::max(p, 1));
      auto* za = reinterpret_cast<qdm_complex*>(a.data());
      auto* zz = reinterpret_cast<qdm_complex*>(z.data());
      double variance = 0.0;
      if (m == kCovariance) {
        const int32_t st = s.complex ? qdm_covariance_complex(cx, s.n, p, za, zz, &variance)
                                     : qdm_covariance_real(x, s.n, p, a.data(), zz, &variance);
        Check(st, s.complex ? "qdm_covariance_complex" : "qdm_covariance_real", r);
        res["noise_variance"] = variance;
      } else {
        const int32_t st = s.complex ? qdm_pcar_complex(cx, s.n, p, k, za, zz)
                                     : qdm_pcar_real(x, s.n, p, k, a.data(), zz);
        Check(st, s.complex ? "qdm_pcar_complex" : "qdm_pcar_real", r);
      }
      z.resize(2 * std::max(p, 0));
      res["coefficients"] = Coefficients(a, s.complex);
      res[m == kCovariance ? "poles" : "roots"] = Poles(z, rate);
      break;
    }
    case kProny:
    case kPencil: {
      const int32_t L = o.pencil.value_or(s.n / 3), M = o.modes.value_or(6);
      if (m == kPencil) {
        par["pencil"] = L;
        par["modes"] = M;
      } else {
        par["order"] = p;
      }
      par["rate_hz"] = rate;
      if (!s.complex) par["real_signal"] = flag;
      Modes md(m == kProny ? p : M);
      double mse = 0.0;
      int32_t st;
      if (m == kProny)
        st = s.complex ? qdm_prony_complex(cx, s.n, p, rate, md.amplitude.data(), md.phase.data(),
                                           md.damping.data(), md.frequency.data(), &md.count)
                       : qdm_prony_real(x, s.n, p, rate, flag, md.amplitude.data(),
                                        md.phase.data(), md.damping.data(), md.frequency.data(),
                                        &md.count);
      else
        st = s.complex
                 ? qdm_matrix_pencil_complex(cx, s.n, L, M, rate, md.amplitude.data(),
                                             md.phase.data(), md.damping.data(),
                                             md.frequency.data(), &md.count, &mse)
                 : qdm_matrix_pencil_real(x, s.n, L, M, rate, flag, md.amplitude.data(),
                                          md.phase.data(), md.damping.data(),
                                          md.frequency.data(), &md.count, &mse);
      Check(st, m == kProny ? (s.complex ? "qdm_prony_complex" : "qdm_prony_real")
                            : (s.complex ? "qdm_matrix_pencil_complex" : "qdm_matrix_pencil_real"),
            r);
      res["mode_count"] = md.count;
      if (m == kPencil) res["mse"] = mse;
      res["modes"] = md.Table(true);
      break;
    }
    case kMdl: {
      const int32_t upper = o.upper.value_or(16), minOrder = o.minOrder.value_or(1);
      par["upper"] = upper;
      par["min_order"] = minOrder;
      int32_t order = 0;
      const int32_t st = s.complex ? qdm_mdl_order_complex(cx, s.n, upper, minOrder, &order)
                                   : qdm_mdl_order_real(x, s.n, upper, minOrder, &order);
      Check(st, s.complex ? "qdm_mdl_order_complex" : "qdm_mdl_order_real", r);
      res["order"] = order;
      break;
    }
    case kCovSpectrum:
    case kPcarSpectrum: {
      const bool pcar = m == kPcarSpectrum;
      const int32_t points = o.points.value_or(512);
      par["order"] = p;
      if (pcar) par["components"] = k;
      par["points"] = points;
      par["rate_hz"] = rate;
      if (pcar && !s.complex) par["real_signal"] = flag;
      std::vector<double> db(std::max(qdm_spectrum_length(points), 1));
      Modes md(k);
      double f0 = 0.0, df = 0.0, variance = 0.0, fitError = 0.0;
      int32_t st;
      if (!pcar)
        st = s.complex ? qdm_covariance_psd_complex(cx, s.n, p, points, rate, db.data(), &f0, &df,
                                                    &variance)
                       : qdm_covariance_psd_real(x, s.n, p, points, rate, db.data(), &f0, &df,
                                                 &variance);
      else
        st = s.complex ? qdm_pcar_psd_complex(cx, s.n, p, points, k, rate, md.amplitude.data(),
                                              md.phase.data(), md.frequency.data(), &md.count,
                                              db.data(), &f0, &df, &fitError)
                       : qdm_pcar_psd_real(x, s.n, p, points, k, rate, flag, md.amplitude.data(),
                                           md.phase.data(), md.frequency.data(), &md.count,
                                           db.data(), &f0, &df, &fitError);
      Check(st, pcar ? (s.complex ? "qdm_pcar_psd_complex" : "qdm_pcar_psd_real")
                     : (s.complex ? "qdm_covariance_psd_complex" : "qdm_covariance_psd_real"),
            r);
      if (pcar) {
        res["fit_error"] = fitError;
        res["mode_count"] = md.count;
        res["modes"] = md.Table(false);
      } else {
        res["noise_variance"] = variance;
      }
      // As many peaks as the model holds modes: half of them for real data.
      const size_t peaks = pcar ? std::max(k, 1) : 6;
      res["peaks"] = Peaks(db, f0, df, !s.complex, s.complex ? peaks : (peaks + 1) / 2);
      res["spectrum"] = {{"f0_hz", f0}, {"df_hz", df}, {"length", db.size()}, {"db", db}};
      break;
    }
  }
  r.json = {{"input", input},
            {"method", kMethods[m].name},
            {"signal", {{"type", s.complex ? "complex" : "real"}, {"samples", s.n}}},
            {"parameters", par},
            {"status", r.status}};
  if (!r.warning.empty()) r.json["warning"] = r.warning;
  r.json["results"] = res;
  return r;
}

// ---- output -----------------------------------------------------------------------

// Shortest text that reads back as the same double; nan, inf, -inf otherwise.
std::string Exact(double v) {
  char buf[32];
  return std::string(buf, std::to_chars(buf, buf + sizeof buf, v).ptr);
}

std::string Brief(const Json& v) {
  if (!v.is_number_float()) return v.dump();
  char buf[32];
  std::snprintf(buf, sizeof buf, "%.8g", v.get<double>());
  return buf;
}

std::string Table(const Json& j) {
  const std::string input = j["input"];
  std::string out = "qdm " + j["method"].get<std::string>() + ": " +
                    (input == "-" ? "standard input" : input) + ", " +
                    j["signal"]["type"].get<std::string>() + ", " +
                    std::to_string(j["signal"]["samples"].get<int>()) + " samples\nparameters:";
  for (const auto& [key, v] : j["parameters"].items()) out += " " + key + " = " + Brief(v);
  out += "\n\n";
  for (const auto& [key, v] : j["results"].items())
    if (v.is_primitive()) out += key + std::string(16 - std::min<size_t>(key.size(), 15), ' ') + Brief(v) + "\n";
  for (const auto& [key, v] : j["results"].items()) {
    if (key == "spectrum") {
      out += "\nspectrum: " + std::to_string(v["length"].get<int>()) + " values in dB from " +
             Brief(v["f0_hz"]) + " Hz in steps of " + Brief(v["df_hz"]) + " Hz (--csv lists them)\n";
    } else if (v.is_array()) {
      out += "\n" + key + (v.empty() ? ": none\n" : "\n   #");
      if (!v.empty())
        for (const auto& [column, _] : v[0].items()) out += std::string(17 - std::min<size_t>(column.size(), 16), ' ') + column;
      for (size_t i = 0; i < v.size(); ++i) {
        char index[32];
        std::snprintf(index, sizeof index, "\n%4zu", i);
        out += index;
        for (const auto& cell : v[i]) {
          const std::string text = Brief(cell);
          out += std::string(17 - std::min<size_t>(text.size(), 16), ' ') + text;
        }
      }
      if (!v.empty()) out += "\n";
    }
  }
  return out;
}

// The method's main table: spectrum, modes, coefficients, or the chosen order.
std::string Csv(const Json& results) {
  std::string out;
  if (results.contains("spectrum")) {
    const Json& s = results["spectrum"];
    out = "frequency_hz,power_db\n";
    const double f0 = s["f0_hz"], df = s["df_hz"];
    for (size_t i = 0; i < s["db"].size(); ++i)
      out += Exact(f0 + static_cast<double>(i) * df) + "," +
             Exact(s["db"][i].is_null() ? NAN : s["db"][i].get<double>()) + "\n";
    return out;
  }
  for (const char* key : {"modes", "coefficients"})
    if (results.contains(key)) {
      const Json& t = results[key];
      for (size_t i = 0; i < t.size(); ++i) {
        std::string header, row;
        for (const auto& [column, v] : t[i].items()) {
          header += (header.empty() ? "" : ",") + column;
          row += (row.empty() ? "" : ",") + Exact(v.is_null() ? NAN : v.get<double>());
        }
        out += (i == 0 ? header + "\n" : "") + row + "\n";
      }
      return out;
    }
  return "order\n" + results["order"].dump() + "\n";
}

std::string FindOnPath(const char* program) {
  const char* path = std::getenv("PATH");
  std::stringstream dirs(path ? path : "");
  for (std::string dir; std::getline(dirs, dir, ':');) {
    const std::string candidate = (dir.empty() ? "." : dir) + "/" + program;
    if (access(candidate.c_str(), X_OK) == 0) return candidate;
  }
  return "";
}

std::string Quoted(const std::string& s, char quote, const std::string& escaped) {
  std::string out(1, quote);
  for (const char c : s) out += c == quote ? escaped : std::string(1, c);
  return out + quote;
}

// Draws the spectrum (modes marked), the modes, or the poles; false: no gnuplot.
bool Plot(const std::string& png, const Json& j) {
  const Json& res = j["results"];
  if (!res.contains("spectrum") && !res.contains("modes") && !res.contains("coefficients"))
    return true;  // mdl: nothing to draw
  const std::string gnuplot = FindOnPath("gnuplot");
  if (gnuplot.empty()) return false;
  std::string title = "qdm " + j["method"].get<std::string>() + ", " +
                      j["input"].get<std::string>() + ", parameters:";
  for (const auto& [key, v] : j["parameters"].items()) title += " " + key + " " + Brief(v);
  std::string script = "set terminal pngcairo size 1100,650 font 'DejaVu Sans,11'\nset output " +
                       Quoted(png, '\'', "''") + "\nset title " + Quoted(title, '\'', "''") +
                       " noenhanced\nset grid\nset key bottom right opaque box\n$d << EOD\n";
  if (res.contains("spectrum")) {
    const Json& s = res["spectrum"];
    const double f0 = s["f0_hz"], df = s["df_hz"];
    double low = 0.0;
    for (size_t i = 0; i < s["db"].size(); ++i) {
      const double v = s["db"][i].is_null() ? NAN : s["db"][i].get<double>();
      low = std::isfinite(v) ? std::min(low, v) : low;
      script += Exact(f0 + static_cast<double>(i) * df) + " " + Exact(v) + "\n";
    }
    script += "EOD\nset xlabel 'Frequency (Hz)'\nset ylabel 'Power (dB, peak = 0 dB)'\n";
    script += "set yrange [" + Exact(std::max(std::floor(low / 10.0) * 10.0 - 5.0, -160.0)) + ":3]\n";
    const bool mirror = j["parameters"].value("real_signal", 0) == 1;
    int arrow = 0;
    for (const Json& mode : res.value("modes", Json::array()))
      for (int side = 0; side < (mirror ? 2 : 1); ++side) {
        const std::string f = Exact(side ? -mode["frequency_hz"].get<double>() : mode["frequency_hz"].get<double>());
        script += "set arrow " + std::to_string(++arrow) + " from " + f + ", graph 0 to " + f +
                  ", graph 1 nohead dt 2 lw 1.5 lc rgb '#c0392b'\n";
        if (!side) script += "set label '" + Brief(mode["frequency_hz"]) + " Hz' at " + f + ", graph 0.96 offset 0.5,0 tc rgb '#c0392b'\n";
      }
    script += "plot $d using 1:2 with lines lw 2 lc rgb '#1f5fa8' title 'AR spectrum'";
    if (arrow) script += ", NaN with lines dt 2 lw 1.5 lc rgb '#c0392b' title 'modes'";
  } else if (res.contains("modes")) {
    for (const Json& mode : res["modes"])
      script += Exact(mode["frequency_hz"]) + " " + Exact(mode["amplitude"]) + "\n";
    script += "EOD\nset xlabel 'Frequency (Hz)'\nset ylabel 'Amplitude'\nset yrange [0:*]\n"
              "plot $d using 1:2 with impulses lw 3 lc rgb '#1f5fa8' title 'modes', "
              "$d using 1:2:(sprintf('%.4g Hz', $1)) with labels offset 0,1 notitle";
  } else {
    for (const Json& z : res.contains("poles") ? res["poles"] : res["roots"])
      script += Exact(z["real"]) + " " + Exact(z["imag"]) + "\n";
    script += "EOD\nset parametric\nset trange [0:2*pi]\nset size ratio -1\nset xlabel 'Real'\n"
              "set ylabel 'Imaginary'\nplot cos(t), sin(t) with lines lc rgb 'gray' title "
              "'unit circle', $d using 1:2 with points pt 7 ps 1.5 lc rgb '#1f5fa8' title 'poles'";
  }
  script += "\n";
  char scriptPath[] = "/tmp/qdm-plot-XXXXXX";
  const int fd = mkstemp(scriptPath);
  const bool written = fd >= 0 && write(fd, script.data(), script.size()) == ssize_t(script.size());
  if (fd >= 0) close(fd);
  std::string lastLine;
  int rc = -1;
  if (written)
    if (FILE* p = popen((Quoted(gnuplot, '\'', "'\\''") + " " + scriptPath + " 2>&1").c_str(), "r")) {
      char buf[512];
      while (std::fgets(buf, sizeof buf, p))  // gnuplot's own reason is its last line
        if (const std::string line = Trim(std::string(buf, std::strcspn(buf, "\n"))); !line.empty())
          lastLine = line;
      rc = pclose(p);
    }
  if (fd >= 0) std::remove(scriptPath);
  if (rc != 0)
    throw Failure{kOutput, {}, "gnuplot could not draw " + png + (lastLine.empty() ? "" : ": " + lastLine)};
  return true;
}

// ---- one record, many records -------------------------------------------------------

// Fits one input; the record, or the error record, and the exit code it gives.
Record RunOne(Method m, const Options& o, const std::string& path, int* exitCode) {
  *exitCode = kOk;
  try {
    return Fit(m, o, path, Load(path, o));
  } catch (const Failure& f) {
    *exitCode = f.exit;
    Record r;
    r.json = {{"input", path}, {"method", kMethods[m].name}, {"status", nullptr}, {"exit", f.exit},
              {"error", f.message}};
    if (f.status) r.json["status"] = *f.status;
    return r;
  } catch (const std::exception& e) {
    *exitCode = kUsage;
    Record r;
    r.json = {{"input", path}, {"method", kMethods[m].name}, {"status", nullptr}, {"exit", kUsage},
              {"error", e.what()}};
    return r;
  }
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
    std::fputs((r.json.dump(-1, ' ', false, Json::error_handler_t::replace) + "\n").c_str(), stdout);
    if (!r.warning.empty()) std::fprintf(stderr, "qdm: %s: warning: %s\n", o.files[i].c_str(), r.warning.c_str());
    if (codes[i] != kOk) exit = kLibrary;
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
  CLI::App app{"qdm: parametric fits of sampled signals (AR models, damped exponentials, AR "
               "spectra) over the qdm library.\nThe signal is a CSV file (one column: real "
               "samples; two: real and imaginary parts), standard input\n(FILE '-' or none), or "
               "the built-in example (--example).",
               "qdm"};
  app.set_version_flag("--version", std::string("qdm ") + qdm_version());
  app.require_subcommand(1);
  app.footer("Exit status: 0 success, 1 bad usage or input, 2 a library status (with several "
             "files: any record failed), 3 an output that cannot be written.");
  Options o;
  std::vector<std::pair<CLI::App*, Method>> subs;
  for (int m = kCovariance; m <= kPcarSpectrum; ++m) {
    CLI::App* sub = app.add_subcommand(kMethods[m].name, kMethods[m].title);
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
        ->expected(0, 1)->default_str("real")->check(CLI::IsMember({"real", "complex"}));
    CLI::Option* json = sub->add_flag("--json", o.json, "print JSON");
    sub->add_flag("--csv", o.csv, "print the main table as CSV")->excludes(json);
    sub->add_option("--plot", o.plot, "draw the results to FILE.png with gnuplot");
    sub->add_option("--jobs", o.jobs, "fit the files on N threads (0: one per core), one JSON "
                                      "line each")->check(CLI::Range(0, 1024));
    sub->footer("Options of the other methods are accepted and ignored.");
  }
  const auto named = [&](const char* a) {
    return std::any_of(std::begin(kMethods), std::end(kMethods),
                       [&](const MethodInfo& mi) { return std::strcmp(a, mi.name) == 0; });
  };
  if (argc < 2 || (argv[1][0] != '-' && !named(argv[1]))) {
    std::fprintf(stderr, "qdm: %s%s%s (methods: covariance, prony, pcar, pencil, mdl, covspectrum, "
                 "pcarspectrum; see qdm --help)\n", argc < 2 ? "no method given" : "unknown method '",
                 argc < 2 ? "" : argv[1], argc < 2 ? "" : "'");
    return kUsage;
  }
  try {
    app.parse(argc, argv);
  } catch (const CLI::ParseError& e) {
    if (e.get_exit_code() == 0) return app.exit(e);
    std::fprintf(stderr, "qdm: %s (see qdm --help)\n", e.what());
    return kUsage;
  }
  Method method = kCovariance;
  bool jobsGiven = false;
  for (const auto& [sub, m] : subs)
    if (sub->parsed()) method = m, jobsGiven = sub->count("--jobs") > 0;
  const bool batch = o.files.size() > 1 || jobsGiven;
  std::string usage;
  if (!o.example.empty() && !o.files.empty()) usage = "--example takes no FILE";
  if (batch && (o.csv || !o.plot.empty())) usage = "--csv and --plot take one FILE, not --jobs";
  if (!usage.empty()) {
    std::fprintf(stderr, "qdm: %s (see qdm %s --help)\n", usage.c_str(), kMethods[method].name);
    return kUsage;
  }
  if (o.files.empty()) o.files.push_back(o.example.empty() ? "-" : "built-in example (" + o.example + ")");
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
