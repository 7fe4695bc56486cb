// qdm_example: the host protocol, shown on every method of libqdm.
//
// A host loads the library at run time (dlopen, or LoadLibrary on Windows),
// finds the fifteen exports by name, names its run-time module with
// SetGFRTModule, and passes every array as a handle its run-time owns. Here
// the run-time is the emulated one (libgfrtemu, linked into this program): it
// supplies NumericArrayResize, through which the library sizes each output
// handle before filling it.
//
//   qdm_example METHOD [FILE.csv] [--order N] [--components K] [--pencil L]
//               [--modes M] [--upper U] [--min-order m] [--points P]
//               [--rate FS] [--real-signal] [--example real|complex]
//               [--library PATH] [--json]
//
// METHOD is covariance, prony, pcar, pencil, mdl, covspectrum or pcarspectrum.
// FILE.csv holds one sample per line, one column (real) or two (real and
// imaginary parts); without it the built-in example is used. The results are
// printed as JSON, the one output form (--json is accepted). The library is
// --library, else $QDM_LIBRARY, else the one built with this program.
// Exit status: 0 success, 1 bad input, 2 a non-zero library status.
//
// For everyday fits use the qdm tool (cli/), which calls the plain C API.
#include <charconv>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <map>
#include <string>
#include <vector>

#include "example_signal.h"
#include "host_loader.h"
#include "qdm_status.h"

namespace {

[[noreturn]] void Fail(int code, const std::string& message) {
  std::fprintf(stderr, "qdm_example: %s\n", message.c_str());
  std::exit(code);
}

const char* StatusText(int32_t status) {
#define QDM_STATUS_CASE(name, code, text) \
  case code:                              \
    return text;
  switch (status) { QDM_STATUS_TABLE(QDM_STATUS_CASE) }
#undef QDM_STATUS_CASE
  return status <= -42400 && status > -42500 ? "host array resize failed" : "unknown status";
}

using qdmhost::HostArray;

// ---- input and output --------------------------------------------------------------

struct Signal {
  bool complex = false;
  std::vector<double> values;  // n reals, or n (re, im) pairs
  int32_t n = 0;
};

bool ParseNumber(const std::string& text, double* v) {
  char* end = nullptr;
  *v = std::strtod(text.c_str(), &end);
  return !text.empty() && end == text.c_str() + text.size();
}

Signal ReadCsv(const std::string& path) {
  std::ifstream in(path);
  if (!in) Fail(1, "cannot open data file " + path);
  Signal s;
  size_t columns = 0;
  std::string line;
  for (int lineNo = 1; std::getline(in, line); ++lineNo) {
    if (line.find_first_not_of(" \t\r") == std::string::npos || line[0] == '#') continue;
    std::vector<std::string> fields(1);
    for (const char c : line)
      if (c == ',')
        fields.emplace_back();
      else if (c != ' ' && c != '\t' && c != '\r')
        fields.back() += c;
    if (columns == 0) columns = fields.size();
    if (columns > 2 || fields.size() != columns)
      Fail(1,
           path + ":" + std::to_string(lineNo) + ": expected 1 or 2 columns, as on the first line");
    for (const std::string& f : fields) {
      double v = 0.0;
      if (!ParseNumber(f, &v))
        Fail(1, path + ":" + std::to_string(lineNo) + ": '" + f + "' is not a number");
      s.values.push_back(v);
    }
  }
  s.complex = columns == 2;
  s.n = columns == 0 ? 0 : static_cast<int32_t>(s.values.size() / columns);
  return s;
}

// JSON members, "key": value, numbers in the shortest form that reads back
// exactly (JSON has no NaN or infinity: those are null).
std::string Number(double v) {
  if (!(v - v == 0.0)) return "null";
  char buf[32];
  return std::string(buf, std::to_chars(buf, buf + sizeof buf, v).ptr);
}
void Member(std::string& to, const char* key, const std::string& value) {
  to += std::string(to.empty() ? "" : ", ") + "\"" + key + "\": " + value;
}
void Member(std::string& to, const char* key, double value) { Member(to, key, Number(value)); }
void Member(std::string& to, const char* key, const HostArray& h) {
  std::string list;
  for (const double v : h.Doubles()) list += (list.empty() ? "" : ", ") + Number(v);
  Member(to, key, "[" + list + "]");
}

}  // namespace

int main(int argc, char** argv) {
  // The command line: METHOD [FILE], then --name value (--real-signal, --json: no value).
  if (argc < 2 || argv[1][0] == '-')
    Fail(1, "no method given (covariance, prony, pcar, pencil, mdl, covspectrum, pcarspectrum)");
  const std::string method = argv[1];
  std::map<std::string, std::string> options = {
      {"--order", ""},       {"--components", ""}, {"--pencil", ""},      {"--modes", ""},
      {"--upper", ""},       {"--min-order", ""},  {"--points", ""},      {"--rate", ""},
      {"--example", "real"}, {"--library", ""},    {"--real-signal", ""}, {"--json", ""}};
  std::string file;
  for (int i = 2; i < argc; ++i) {
    const std::string arg = argv[i];
    if (arg.rfind("--", 0) != 0) {
      if (!file.empty()) Fail(1, "unexpected argument '" + arg + "'");
      file = arg;
    } else if (options.count(arg) == 0) {
      Fail(1, "unknown option '" + arg + "'");
    } else if (arg == "--real-signal" || arg == "--json") {
      options[arg] = "1";
    } else if (i + 1 < argc) {
      options[arg] = argv[++i];
    } else {
      Fail(1, arg + " needs a value");
    }
  }
  auto number = [&](const char* option, double fallback) {
    double v = fallback;
    if (!options[option].empty() && !ParseNumber(options[option], &v))
      Fail(1, std::string(option) + ": '" + options[option] + "' is not a number");
    return v;
  };
  auto integer = [&](const char* option, int32_t fallback) {
    const double v = number(option, fallback);
    if (!(v >= INT32_MIN && v <= INT32_MAX) || v != static_cast<int32_t>(v))
      Fail(1, std::string(option) + ": '" + options[option] + "' is not a 32-bit integer");
    return static_cast<int32_t>(v);
  };

  Signal s;
  if (!file.empty()) {
    s = ReadCsv(file);
  } else {
    s.complex = options["--example"] == "complex";
    s.values = qdm_example::Make(s.complex);
    s.n = qdm_example::kLength;
  }
  const char* env = std::getenv("QDM_LIBRARY");
  const std::string library = !options["--library"].empty() ? options["--library"]
                              : env != nullptr && *env      ? env
                                                            : QDM_DEFAULT_LIBRARY;
  // The exports found by name, and the run-time named, as a host embedding the
  // library does.
  qdmhost::QdmApi e;
  try {
    e = qdmhost::LoadQdm(library, qdmhost::RuntimeModule());
  } catch (const std::exception& error) {
    Fail(1, error.what());
  }

  // The data handle, output handles, and one call of the real or complex export.
  const bool cx = s.complex;
  const int32_t R = QDM_TYPE_DOUBLE, C = QDM_TYPE_COMPLEX;
  const HostArray data = HostArray::FromDoubles(cx ? C : R, s.values);
  const HostArray coefficients = HostArray::Empty(cx ? C : R), poles = HostArray::Empty(C),
                  amplitude = HostArray::Empty(R), phase = HostArray::Empty(R),
                  damping = HostArray::Empty(R), frequency = HostArray::Empty(R),
                  spectrum = HostArray::Empty(R);
  const double rate = number("--rate", file.empty() ? qdm_example::kRate : 1.0);
  const uint8_t realSignal = options["--real-signal"].empty() ? 0 : 1;
  const int32_t p = integer("--order", method == "prony" ? 6 : 12);
  const int32_t k = integer("--components", 6), points = integer("--points", 512);
  const int32_t L = integer("--pencil", s.n / 3), M = integer("--modes", 6);
  const int32_t upper = integer("--upper", 16), minOrder = integer("--min-order", 1);
  double variance = 0.0, mse = 0.0, f0 = 0.0, df = 0.0, fitError = 0.0;
  int32_t order = 0, status = 0;
  std::string parameters, results;
  if (method == "covariance") {
    status = cx ? e.QdmCxCovarianceH(data, p, coefficients, poles, &variance)
                : e.QdmReCovarianceH(data, p, coefficients, poles, &variance);
    Member(parameters, "order", p);
    Member(results, "noise_variance", variance);
    Member(results, "coefficients", coefficients);
    Member(results, "poles", poles);
  } else if (method == "pcar") {
    status = cx ? e.QdmCxPCARH(data, p, k, coefficients, poles)
                : e.QdmRePCARH(data, p, k, coefficients, poles);
    Member(parameters, "order", p);
    Member(parameters, "components", k);
    Member(results, "coefficients", coefficients);
    Member(results, "roots", poles);
  } else if (method == "prony" || method == "pencil") {
    if (method == "prony")
      status = cx ? e.QdmCxPronyH(data, p, rate, amplitude, phase, damping, frequency)
                  : e.QdmRePronyH(data, p, rate, &realSignal, amplitude, phase, damping, frequency);
    else
      status =
          cx ? e.QdmCxMatrixPencilH(data, L, M, rate, amplitude, phase, damping, frequency, &mse)
             : e.QdmReMatrixPencilH(data, L, M, rate, &realSignal, amplitude, phase, damping,
                                    frequency, &mse);
    if (method == "prony") {
      Member(parameters, "order", p);
    } else {
      Member(parameters, "pencil", L);
      Member(parameters, "modes", M);
      Member(results, "mse", mse);
    }
    Member(results, "amplitude", amplitude);
    Member(results, "phase_rad", phase);
    Member(results, "damping", damping);
    Member(results, "frequency_hz", frequency);
  } else if (method == "mdl") {
    status = cx ? e.QdmCxMinDescriptLenH(data, upper, minOrder, &order)
                : e.QdmReMinDescriptLenH(data, upper, minOrder, &order);
    Member(parameters, "upper", upper);
    Member(parameters, "min_order", minOrder);
    Member(results, "order", order);
  } else if (method == "covspectrum") {
    status = cx ? e.QdmCxCovPowerSpectrH(data, p, points, rate, &f0, &df, spectrum, &variance)
                : e.QdmReCovPowerSpectrH(data, p, points, rate, &f0, &df, spectrum, &variance);
    Member(parameters, "order", p);
    Member(parameters, "points", points);
    Member(results, "noise_variance", variance);
  } else if (method == "pcarspectrum") {
    status = cx ? e.QdmCxPCARPowerSpectrumH(data, p, points, k, rate, amplitude, phase, frequency,
                                            &f0, &df, spectrum, &fitError)
                : e.QdmRePCARPowerSpectrumH(data, p, points, k, rate, &realSignal, amplitude, phase,
                                            frequency, &f0, &df, spectrum, &fitError);
    Member(parameters, "order", p);
    Member(parameters, "components", k);
    Member(parameters, "points", points);
    Member(results, "fit_error", fitError);
    Member(results, "amplitude", amplitude);
    Member(results, "phase_rad", phase);
    Member(results, "frequency_hz", frequency);
  } else {
    Fail(1, "unknown method '" + method + "'");
  }
  if (status != 0)
    Fail(2, method + " returned " + std::to_string(status) + ": " + StatusText(status));
  if (method != "mdl" && method != "pcar" && method != "covariance")
    Member(parameters, "rate_hz", rate);
  if (method.find("spectrum") != std::string::npos) {
    Member(results, "f0_hz", f0);
    Member(results, "df_hz", df);
    Member(results, "spectrum_db", spectrum);
  }
  std::printf(
      "{\"method\": \"%s\", \"signal\": {\"type\": \"%s\", \"samples\": %d},\n"
      " \"parameters\": {%s},\n \"status\": 0,\n \"results\": {%s}}\n",
      method.c_str(), cx ? "complex" : "real", s.n, parameters.c_str(), results.c_str());
  return 0;
}
