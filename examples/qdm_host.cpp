// qdm_example: a command-line host for libqdm.
//
// It loads the library the way the Graffel host does, with dlopen and dlsym of
// the exported names, owns every array through the emulated host run-time
// (libgfrtemu.so, linked into this program: it supplies NumericArrayResize and
// the probe symbol the library looks for), reads a signal from a CSV file or
// makes the built-in example, runs one method and prints the results as a
// table or as JSON. The spectrum methods also write the spectrum as CSV and
// draw it to a PNG with gnuplot.
//
// Exit status: 0 success, 1 bad input (usage, parameters, data file), 2 the
// library returned a non-zero status, 3 an output file or the plot failed.
// Every failure is reported as one line on stderr.
#if defined(_WIN32)
#include <windows.h>
#undef LoadLibrary  // the name of this program's own loader below
#else
#include <dlfcn.h>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>
#endif
#include <sys/stat.h>

#include <algorithm>
#include <charconv>
#include <cctype>
#include <cerrno>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <string>
#include <utility>
#include <vector>

#include "emuhost.h"
#include "qdm.h"

#if !defined(_WIN32)
extern char** environ;
#endif

namespace {

constexpr const char* kProgram = "qdm_example";
constexpr double kPi = 3.14159265358979323846;

enum ExitCode { kExitOk = 0, kExitInput = 1, kExitLibrary = 2, kExitOutput = 3 };

// Ends the program with one line on stderr.
[[noreturn]] void Fail(ExitCode code, const std::string& message) {
  std::string line = message;
  std::replace(line.begin(), line.end(), '\n', ' ');
  std::fprintf(stderr, "%s: %s\n", kProgram, line.c_str());
  std::exit(code);
}

// ---------------------------------------------------------------------------
// Host statuses and their meaning
// ---------------------------------------------------------------------------

struct StatusMeaning {
  int32_t code;
  const char* meaning;
};

constexpr StatusMeaning kStatusTable[] = {
    {0, "success"},
    {-42401, "empty input: the data array has no elements"},
    {-42411, "order or pencil parameter negative or above floor(2n/3)"},
    {-42412, "order zero, negative or above floor(2n/3), or components/k/modes not positive"},
    {-42413, "components, k or modes greater than the order or pencil parameter"},
    {-42414, "MDL minimum order below 1"},
    {-42415, "MDL upper order not above the minimum order, or above floor(2n/3)"},
    {-42416, "amplitude fit asked for no modes"},
    {-42417, "spectrum size below 2"},
    {-42418, "sampling rate not positive"},
    {-20001, "out of memory"},
    {-20003, "a size argument below 1 in the numeric library"},
    {-20004, "negative matrix dimension in the numeric library"},
    {-20061, "option argument out of range"},
    {-20062, "no convergence (eigen/singular value solver or root finder)"},
    {-20063, "polynomial with a NaN coefficient or of degree below 1"},
    {-20068, "data or intermediate matrix holds NaN or infinite values"},
    {-20116, "root finder produced NaN"},
    {-20999, "illegal argument inside the numeric library, or a routine not built yet"},
    {-1, "FFT length mismatch"},
};

std::string StatusText(int32_t code) {
  for (const StatusMeaning& s : kStatusTable)
    if (s.code == code) return s.meaning;
  if (code <= -42400 && code > -42500)
    return "host array resize failed with host error " + std::to_string(-42400 - code);
  return "unknown status";
}

// ---------------------------------------------------------------------------
// The library's exports, found with dlsym
// ---------------------------------------------------------------------------

struct Exports {
  decltype(&SetGFRTModule) setModule;
  decltype(&QdmReCovarianceH) reCovariance;
  decltype(&QdmCxCovarianceH) cxCovariance;
  decltype(&QdmRePCARH) rePcar;
  decltype(&QdmCxPCARH) cxPcar;
  decltype(&QdmRePronyH) reProny;
  decltype(&QdmCxPronyH) cxProny;
  decltype(&QdmReMatrixPencilH) rePencil;
  decltype(&QdmCxMatrixPencilH) cxPencil;
  decltype(&QdmReMinDescriptLenH) reMdl;
  decltype(&QdmCxMinDescriptLenH) cxMdl;
  decltype(&QdmReCovPowerSpectrH) reCovSpectrum;
  decltype(&QdmCxCovPowerSpectrH) cxCovSpectrum;
  decltype(&QdmRePCARPowerSpectrumH) rePcarSpectrum;
  decltype(&QdmCxPCARPowerSpectrumH) cxPcarSpectrum;
};

// The platform's module loader: dlopen/dlsym, or LoadLibraryA/GetProcAddress.
void* OpenModule(const std::string& path, std::string* why) {
#if defined(_WIN32)
  void* module = reinterpret_cast<void*>(LoadLibraryA(path.c_str()));
  if (module == nullptr) *why = path + ": error " + std::to_string(GetLastError());
#else
  void* module = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (module == nullptr) {
    const char* message = dlerror();
    *why = message ? message : path;
  }
#endif
  return module;
}

void* ModuleSymbol(void* module, const char* name) {
#if defined(_WIN32)
  return reinterpret_cast<void*>(GetProcAddress(static_cast<HMODULE>(module), name));
#else
  return dlsym(module, name);
#endif
}

// The already loaded module that holds `address`, or null.
void* ModuleOf(void* address) {
#if defined(_WIN32)
  HMODULE module = nullptr;
  if (!GetModuleHandleExA(GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS |
                              GET_MODULE_HANDLE_EX_FLAG_UNCHANGED_REFCOUNT,
                          static_cast<LPCSTR>(address), &module))
    return nullptr;
  return reinterpret_cast<void*>(module);
#else
  Dl_info info{};
  if (dladdr(address, &info) == 0 || info.dli_fname == nullptr) return nullptr;
  return dlopen(info.dli_fname, RTLD_LAZY | RTLD_NOLOAD);
#endif
}

template <typename F>
void Bind(void* library, const std::string& path, const char* name, F* slot) {
  void* address = ModuleSymbol(library, name);
  if (address == nullptr) Fail(kExitInput, path + " does not export " + name);
  *slot = reinterpret_cast<F>(address);
}

Exports LoadLibrary(const std::string& path) {
  std::string why;
  void* library = OpenModule(path, &why);
  if (library == nullptr) Fail(kExitInput, "cannot load the library: " + why);
  Exports e{};
  Bind(library, path, "SetGFRTModule", &e.setModule);
  Bind(library, path, "QdmReCovarianceH", &e.reCovariance);
  Bind(library, path, "QdmCxCovarianceH", &e.cxCovariance);
  Bind(library, path, "QdmRePCARH", &e.rePcar);
  Bind(library, path, "QdmCxPCARH", &e.cxPcar);
  Bind(library, path, "QdmRePronyH", &e.reProny);
  Bind(library, path, "QdmCxPronyH", &e.cxProny);
  Bind(library, path, "QdmReMatrixPencilH", &e.rePencil);
  Bind(library, path, "QdmCxMatrixPencilH", &e.cxPencil);
  Bind(library, path, "QdmReMinDescriptLenH", &e.reMdl);
  Bind(library, path, "QdmCxMinDescriptLenH", &e.cxMdl);
  Bind(library, path, "QdmReCovPowerSpectrH", &e.reCovSpectrum);
  Bind(library, path, "QdmCxCovPowerSpectrH", &e.cxCovSpectrum);
  Bind(library, path, "QdmRePCARPowerSpectrumH", &e.rePcarSpectrum);
  Bind(library, path, "QdmCxPCARPowerSpectrumH", &e.cxPcarSpectrum);

  // Name the run-time module explicitly, as a host embedding the library
  // would: the module that holds our NumericArrayResize.
  if (void* runtime = ModuleOf(reinterpret_cast<void*>(&NumericArrayResize)))
    e.setModule(runtime);
  return e;
}

// A host array owned by the emulated run-time.
class HostArray {
 public:
  HostArray(int32_t typeCode, const std::vector<double>& values, int32_t count)
      : handle_(EmuMakeHandle(typeCode, count, values.empty() ? nullptr : values.data())) {
    if (handle_ == nullptr) Fail(kExitInput, "out of memory making a host array");
  }
  explicit HostArray(int32_t typeCode) : HostArray(typeCode, {}, 0) {}
  ~HostArray() { EmuFreeHandle(handle_); }
  HostArray(const HostArray&) = delete;
  HostArray& operator=(const HostArray&) = delete;

  QdmArrayHandle get() const { return handle_; }
  int32_t count() const { return EmuCount(handle_); }
  std::vector<double> Reals() const {
    std::vector<double> v(static_cast<size_t>(std::max(count(), 0)));
    if (!v.empty()) EmuRead(handle_, v.data(), v.size());
    return v;
  }
  // Complex elements as (re, im) pairs.
  std::vector<double> Pairs() const {
    std::vector<double> v(2 * static_cast<size_t>(std::max(count(), 0)));
    if (!v.empty()) EmuRead(handle_, v.data(), v.size());
    return v;
  }

 private:
  QdmArrayHandle handle_;
};

// ---------------------------------------------------------------------------
// The signal: a CSV file or the built-in example
// ---------------------------------------------------------------------------

struct Signal {
  std::string source;         // file name or description
  bool complex = false;
  std::vector<double> values;  // n reals, or n (re, im) pairs
  int32_t n = 0;
  double defaultRate = 1.0;
};

std::string Trim(const std::string& s) {
  size_t b = 0, e = s.size();
  while (b < e && std::isspace(static_cast<unsigned char>(s[b]))) ++b;
  while (e > b && std::isspace(static_cast<unsigned char>(s[e - 1]))) --e;
  return s.substr(b, e - b);
}

std::vector<std::string> SplitFields(const std::string& line) {
  std::vector<std::string> fields;
  size_t start = 0;
  for (;;) {
    const size_t comma = line.find(',', start);
    fields.push_back(Trim(line.substr(start, comma - start)));
    if (comma == std::string::npos) break;
    start = comma + 1;
  }
  return fields;
}

bool ParseDouble(const std::string& text, double* value) {
  if (text.empty()) return false;
  errno = 0;
  char* end = nullptr;
  const double v = std::strtod(text.c_str(), &end);
  if (end != text.c_str() + text.size()) return false;
  if (errno == ERANGE && std::isinf(v)) return false;
  *value = v;
  return true;
}

// One column: real samples; two columns: real and imaginary parts. Blank
// lines and lines starting with '#' are skipped; a first line of which no
// field is a number is taken as a header.
Signal ReadCsv(const std::string& path) {
  std::ifstream in(path);
  struct stat st {};
  if (stat(path.c_str(), &st) != 0)
    Fail(kExitInput, "cannot open data file " + path + ": " + std::strerror(errno));
  if (S_ISDIR(st.st_mode)) Fail(kExitInput, "data file " + path + " is a directory");
  if (!in) Fail(kExitInput, "cannot open data file " + path + ": " + std::strerror(errno));

  Signal s;
  s.source = path;
  size_t columns = 0;
  size_t firstDataLine = 0;
  bool sawLine = false;
  std::string line;
  for (size_t lineNo = 1; std::getline(in, line); ++lineNo) {
    const std::string text = Trim(line);
    if (text.empty() || text[0] == '#') continue;
    const std::vector<std::string> fields = SplitFields(text);
    const std::string where = path + ":" + std::to_string(lineNo) + ": ";
    if (!sawLine) {
      sawLine = true;
      bool anyNumber = false;
      for (const std::string& f : fields) {
        double v;
        anyNumber = anyNumber || ParseDouble(f, &v);
      }
      if (!anyNumber) continue;  // header
    }
    if (columns == 0) {
      columns = fields.size();
      firstDataLine = lineNo;
      if (columns > 2)
        Fail(kExitInput, where + std::to_string(columns) +
                             " columns; expected 1 (real) or 2 (real, imaginary)");
      s.complex = columns == 2;
    } else if (fields.size() != columns) {
      Fail(kExitInput, where + std::to_string(fields.size()) + " field" +
                           (fields.size() == 1 ? "" : "s") + ", expected " +
                           std::to_string(columns) + " as on line " +
                           std::to_string(firstDataLine));
    }
    for (size_t c = 0; c < fields.size(); ++c) {
      double v = 0.0;
      if (fields[c].empty())
        Fail(kExitInput, where + "field " + std::to_string(c + 1) + " is empty");
      if (!ParseDouble(fields[c], &v))
        Fail(kExitInput, where + "field " + std::to_string(c + 1) + " '" + fields[c] +
                             "' is not a number");
      s.values.push_back(v);
    }
    if (s.values.size() / columns > static_cast<size_t>(INT32_MAX))
      Fail(kExitInput, path + ": too many samples for a host array");
  }
  if (in.bad()) Fail(kExitInput, "error reading data file " + path);
  s.n = columns == 0 ? 0 : static_cast<int32_t>(s.values.size() / columns);
  return s;
}

// splitmix64: a small generator whose output is fixed by its definition.
struct SplitMix64 {
  uint64_t state;
  uint64_t Next() {
    uint64_t z = (state += 0x9e3779b97f4a7c15ull);
    z = (z ^ (z >> 30)) * 0xbf58476d1ce4e5b9ull;
    z = (z ^ (z >> 27)) * 0x94d049bb133111ebull;
    return z ^ (z >> 31);
  }
  double Uniform() { return static_cast<double>(Next() >> 11) * 0x1.0p-53; }
  // Approximately standard normal: the sum of twelve uniforms less six (mean
  // 0, variance 1), arithmetic only.
  double Normal() {
    double sum = 0.0;
    for (int i = 0; i < 12; ++i) sum += Uniform();
    return sum - 6.0;
  }
};

constexpr int32_t kExampleLength = 128;
constexpr double kExampleRate = 1000.0;
constexpr double kExampleNoise = 0.05;
constexpr uint64_t kExampleSeed = 20240601;

// Each mode is A z^t with the complex amplitude A = a e^{i phase} and the pole
// z = e^{-damping + 2 pi i f / fs}, written out as literals so that no libm
// call enters the signal.
struct ExampleMode {
  double ampRe, ampIm, poleRe, poleIm;
  double frequency, damping, amplitude, phase;
};
constexpr ExampleMode kExampleModes[] = {
    {0.955336489125606, 0.29552020666133955, 0.7217152683869278, 0.6777357484181723,
     120.0, 0.010, 1.0, 0.3},
    {0.3175172849979041, 0.6238451520430047, 0.24376549746379728, 0.9494039295255473,
     210.0, 0.020, 0.7, 1.1},
    {0.3510330247561491, -0.1917702154416812, -0.5331543476899203, 0.8401168224053746,
     340.0, 0.005, 0.4, -0.5},
};

// Three damped sinusoids (real example: the real parts, six poles) or three
// damped complex exponentials (complex example), in white noise.
Signal BuiltInExample(bool complexExample) {
  Signal s;
  s.complex = complexExample;
  s.n = kExampleLength;
  s.defaultRate = kExampleRate;
  s.source = complexExample ? "built-in example (complex: 3 damped exponentials in noise)"
                            : "built-in example (real: 3 damped sinusoids in noise)";
  SplitMix64 rng{kExampleSeed};
  double re[3], im[3];
  for (int k = 0; k < 3; ++k) {
    re[k] = kExampleModes[k].ampRe;
    im[k] = kExampleModes[k].ampIm;
  }
  for (int32_t t = 0; t < s.n; ++t) {
    double sumRe = 0.0, sumIm = 0.0;
    for (int k = 0; k < 3; ++k) {
      sumRe += re[k];
      sumIm += im[k];
      const ExampleMode& m = kExampleModes[k];
      const double nr = re[k] * m.poleRe - im[k] * m.poleIm;
      const double ni = re[k] * m.poleIm + im[k] * m.poleRe;
      re[k] = nr;
      im[k] = ni;
    }
    if (complexExample) {
      // Circular noise of the same total power as the real example's.
      s.values.push_back(sumRe + kExampleNoise * rng.Normal() * 0.7071067811865476);
      s.values.push_back(sumIm + kExampleNoise * rng.Normal() * 0.7071067811865476);
    } else {
      s.values.push_back(sumRe + kExampleNoise * rng.Normal());
    }
  }
  return s;
}

// ---------------------------------------------------------------------------
// Command line
// ---------------------------------------------------------------------------

enum class Method { kCovariance, kProny, kPcar, kPencil, kMdl, kCovSpectrum, kPcarSpectrum };

struct MethodName {
  const char* name;
  Method method;
  const char* title;
};
constexpr MethodName kMethods[] = {
    {"covariance", Method::kCovariance, "covariance-method AR"},
    {"prony", Method::kProny, "Prony damped exponentials"},
    {"pcar", Method::kPcar, "principal-component AR"},
    {"pencil", Method::kPencil, "matrix pencil damped exponentials"},
    {"mdl", Method::kMdl, "minimum description length order"},
    {"covspectrum", Method::kCovSpectrum, "covariance-method AR power spectrum"},
    {"pcarspectrum", Method::kPcarSpectrum, "principal-component AR power spectrum"},
};

// Options that take a value, and the methods they apply to (bit per Method).
constexpr unsigned Bit(Method m) { return 1u << static_cast<unsigned>(m); }
constexpr unsigned kAllMethods = 0x7f;
constexpr unsigned kSpectra = Bit(Method::kCovSpectrum) | Bit(Method::kPcarSpectrum);

enum class Opt {
  kOrder, kComponents, kPencil, kModes, kUpper, kMinOrder, kPoints, kRate, kExample,
  kCsv, kPng, kLibrary, kRealSignal, kJson, kNoPlot, kHelp
};
struct OptionSpec {
  const char* name;
  Opt opt;
  bool takesValue;
  unsigned methods;
};
constexpr OptionSpec kOptions[] = {
    {"--order", Opt::kOrder, true,
     Bit(Method::kCovariance) | Bit(Method::kProny) | Bit(Method::kPcar) | kSpectra},
    {"--components", Opt::kComponents, true, Bit(Method::kPcar) | Bit(Method::kPcarSpectrum)},
    {"--pencil", Opt::kPencil, true, Bit(Method::kPencil)},
    {"--modes", Opt::kModes, true, Bit(Method::kPencil)},
    {"--upper", Opt::kUpper, true, Bit(Method::kMdl)},
    {"--min-order", Opt::kMinOrder, true, Bit(Method::kMdl)},
    {"--points", Opt::kPoints, true, kSpectra},
    {"--rate", Opt::kRate, true, kAllMethods & ~Bit(Method::kMdl)},
    {"--example", Opt::kExample, true, kAllMethods},
    {"--csv", Opt::kCsv, true, kSpectra},
    {"--png", Opt::kPng, true, kSpectra},
    {"--library", Opt::kLibrary, true, kAllMethods},
    {"--real-signal", Opt::kRealSignal, false,
     Bit(Method::kProny) | Bit(Method::kPencil) | Bit(Method::kPcarSpectrum)},
    {"--json", Opt::kJson, false, kAllMethods},
    {"--no-plot", Opt::kNoPlot, false, kSpectra},
    {"--help", Opt::kHelp, false, kAllMethods},
};

struct Options {
  Method method = Method::kCovariance;
  const char* methodName = nullptr;
  const char* methodTitle = nullptr;
  std::string file;
  bool haveFile = false;
  // Values as given; unset ones take the method's default once the data are known.
  bool have[16] = {};
  int32_t order = 0, components = 0, pencil = 0, modes = 0, upper = 0, minOrder = 0,
          points = 0;
  double rate = 0.0;
  bool complexExample = false;
  bool realSignal = false, json = false, noPlot = false;
  std::string csv = "spectrum.csv", png = "spectrum.png";
  std::string library;
  bool has(Opt o) const { return have[static_cast<int>(o)]; }
};

void PrintUsage() {
  std::printf(
      "usage: %s METHOD [FILE.csv] [options]\n"
      "\n"
      "Runs one libqdm method on a signal read from FILE.csv (one column: real\n"
      "samples; two columns: real and imaginary parts) or, without a file, on the\n"
      "built-in example: 128 samples at 1000 Hz of damped sinusoids at 120, 210\n"
      "and 340 Hz in white noise (fixed seed, the same on every machine).\n"
      "\n"
      "methods (defaults in brackets):\n"
      "  covariance    covariance-method AR       --order [12]\n"
      "  prony         Prony modes                --order [6]\n"
      "  pcar          principal-component AR     --order [12] --components [6]\n"
      "  pencil        matrix pencil modes        --pencil [n/3] --modes [6]\n"
      "  mdl           MDL model order            --upper [16] --min-order [1]\n"
      "  covspectrum   covariance AR spectrum     --order [12] --points [512]\n"
      "  pcarspectrum  principal-component AR spectrum and its modes\n"
      "                                           --order [12] --components [6] --points [512]\n"
      "\n"
      "options:\n"
      "  --rate FS          sampling rate in Hz [1000 for the built-in example, 1 for a file]\n"
      "  --real-signal      real data: report one frequency per conjugate pair\n"
      "                     (prony, pencil, pcarspectrum)\n"
      "  --example real|complex  which built-in example to use without a file [real]\n"
      "  --json             print the results as JSON instead of tables\n"
      "  --csv FILE         spectrum CSV (frequency Hz, dB) [spectrum.csv]\n"
      "  --png FILE         spectrum plot made with gnuplot [spectrum.png]\n"
      "  --no-plot          write the CSV only\n"
      "  --library PATH     libqdm.so to load [$QDM_LIBRARY, else the one built with this program]\n"
      "  --help             this text\n"
      "\n"
      "Exit status: 0 success, 1 bad input, 2 the library returned an error status\n"
      "(printed with its meaning), 3 an output file or the plot could not be written.\n",
      kProgram);
}

int32_t ParseInt(const std::string& option, const std::string& text) {
  errno = 0;
  char* end = nullptr;
  const long long v = std::strtoll(text.c_str(), &end, 10);
  if (text.empty() || end != text.c_str() + text.size())
    Fail(kExitInput, option + ": '" + text + "' is not an integer");
  if (errno == ERANGE || v < INT32_MIN || v > INT32_MAX)
    Fail(kExitInput, option + ": '" + text + "' is out of the 32-bit integer range");
  return static_cast<int32_t>(v);
}

Options ParseCommandLine(int argc, char** argv) {
  Options o;
  std::vector<std::string> positional;
  std::vector<const OptionSpec*> given;
  for (int i = 1; i < argc; ++i) {
    const std::string arg = argv[i];
    if (arg.size() < 2 || arg[0] != '-' || arg[1] != '-') {
      if (arg.size() > 1 && arg[0] == '-' && !std::isdigit(static_cast<unsigned char>(arg[1])))
        Fail(kExitInput, "unknown option '" + arg + "' (see --help)");
      positional.push_back(arg);
      continue;
    }
    std::string name = arg, value;
    bool inlineValue = false;
    const size_t eq = arg.find('=');
    if (eq != std::string::npos) {
      name = arg.substr(0, eq);
      value = arg.substr(eq + 1);
      inlineValue = true;
    }
    const OptionSpec* def = nullptr;
    for (const OptionSpec& s : kOptions)
      if (name == s.name) def = &s;
    if (def == nullptr) Fail(kExitInput, "unknown option '" + name + "' (see --help)");
    if (def->opt == Opt::kHelp) {
      PrintUsage();
      std::exit(kExitOk);
    }
    if (def->takesValue && !inlineValue) {
      if (i + 1 >= argc) Fail(kExitInput, name + " needs a value");
      value = argv[++i];
    } else if (!def->takesValue && inlineValue) {
      Fail(kExitInput, name + " takes no value");
    }
    given.push_back(def);
    o.have[static_cast<int>(def->opt)] = true;
    switch (def->opt) {
      case Opt::kOrder: o.order = ParseInt(name, value); break;
      case Opt::kComponents: o.components = ParseInt(name, value); break;
      case Opt::kPencil: o.pencil = ParseInt(name, value); break;
      case Opt::kModes: o.modes = ParseInt(name, value); break;
      case Opt::kUpper: o.upper = ParseInt(name, value); break;
      case Opt::kMinOrder: o.minOrder = ParseInt(name, value); break;
      case Opt::kPoints: o.points = ParseInt(name, value); break;
      case Opt::kRate:
        if (!ParseDouble(value, &o.rate))
          Fail(kExitInput, name + ": '" + value + "' is not a number");
        break;
      case Opt::kExample:
        if (value == "real") o.complexExample = false;
        else if (value == "complex") o.complexExample = true;
        else Fail(kExitInput, name + ": '" + value + "' is not 'real' or 'complex'");
        break;
      case Opt::kCsv: o.csv = value; break;
      case Opt::kPng: o.png = value; break;
      case Opt::kLibrary: o.library = value; break;
      case Opt::kRealSignal: o.realSignal = true; break;
      case Opt::kJson: o.json = true; break;
      case Opt::kNoPlot: o.noPlot = true; break;
      case Opt::kHelp: break;
    }
    if ((def->opt == Opt::kCsv || def->opt == Opt::kPng || def->opt == Opt::kLibrary) &&
        value.empty())
      Fail(kExitInput, name + " needs a non-empty value");
  }
  if (positional.empty())
    Fail(kExitInput,
         "no method given (covariance, prony, pcar, pencil, mdl, covspectrum, "
         "pcarspectrum; see --help)");
  if (positional.size() > 2)
    Fail(kExitInput, "unexpected argument '" + positional[2] + "' (one method and one file)");
  const MethodName* m = nullptr;
  for (const MethodName& mn : kMethods)
    if (positional[0] == mn.name) m = &mn;
  if (m == nullptr)
    Fail(kExitInput, "unknown method '" + positional[0] +
                         "' (expected covariance, prony, pcar, pencil, mdl, covspectrum or "
                         "pcarspectrum)");
  o.method = m->method;
  o.methodName = m->name;
  o.methodTitle = m->title;
  if (positional.size() == 2) {
    o.file = positional[1];
    o.haveFile = true;
  }
  for (const OptionSpec* s : given)
    if ((s->methods & Bit(o.method)) == 0)
      Fail(kExitInput, std::string(s->name) + " does not apply to method " + o.methodName);
  if (o.haveFile && o.has(Opt::kExample))
    Fail(kExitInput, "--example applies only without a data file");
  return o;
}

// ---------------------------------------------------------------------------
// Results: scalars and tables, printed as text or JSON
// ---------------------------------------------------------------------------

struct Scalar {
  std::string key, label;
  double value;
  bool integer;
};
struct Table {
  std::string key, label;
  std::vector<std::string> columns;  // JSON keys; also the printed headings
  std::vector<std::vector<double>> rows;
};
struct SpectrumOut {
  bool present = false;
  double f0 = 0.0, df = 0.0;
  std::vector<double> db;
  std::string csv, png;
};
struct Report {
  std::vector<std::string> notes;  // printed under the tables (text output only)
  std::vector<Scalar> scalars;
  std::vector<Table> tables;
  SpectrumOut spectrum;
};

std::string FormatNumber(double v, bool integer) {
  char buf[64];
  if (std::isnan(v)) return "nan";
  if (std::isinf(v)) return v > 0 ? "inf" : "-inf";
  if (integer) std::snprintf(buf, sizeof buf, "%.0f", v);
  else std::snprintf(buf, sizeof buf, "%.8g", v);
  return buf;
}

std::string JsonNumber(double v, bool integer = false) {
  if (!std::isfinite(v)) return "null";  // JSON has no NaN or infinity
  char buf[64];
  if (integer) {
    std::snprintf(buf, sizeof buf, "%.0f", v);
    return buf;
  }
  // The shortest text that reads back as the same double.
  const std::to_chars_result r = std::to_chars(buf, buf + sizeof buf, v);
  return std::string(buf, r.ptr);
}

std::string JsonString(const std::string& s) {
  std::string out = "\"";
  for (const char c : s) {
    switch (c) {
      case '"': out += "\\\""; break;
      case '\\': out += "\\\\"; break;
      case '\n': out += "\\n"; break;
      case '\t': out += "\\t"; break;
      default:
        if (static_cast<unsigned char>(c) < 0x20) {
          char buf[8];
          std::snprintf(buf, sizeof buf, "\\u%04x", c);
          out += buf;
        } else {
          out += c;
        }
    }
  }
  return out + "\"";
}

// Full precision; non-finite values as nan, inf, -inf.
std::string CsvNumber(double v) { return std::isfinite(v) ? JsonNumber(v) : FormatNumber(v, false); }

struct RunInfo {
  const Options* options;
  const Signal* signal;
  double rate;
  std::vector<std::pair<std::string, double>> parameters;  // as passed to the library
};

void PrintText(const RunInfo& run, const Report& r) {
  const Options& o = *run.options;
  std::printf("%s: %s\n", kProgram, o.methodTitle);
  std::printf("signal: %s, %s, %d samples\n", run.signal->source.c_str(),
              run.signal->complex ? "complex" : "real", run.signal->n);
  std::string params;
  for (const auto& p : run.parameters)
    params += (params.empty() ? "" : ", ") + p.first + " = " + FormatNumber(p.second, false);
  std::printf("parameters: %s\n", params.c_str());
  if (!r.scalars.empty()) std::printf("\n");
  size_t width = 0;
  for (const Scalar& s : r.scalars) width = std::max(width, s.label.size());
  for (const Scalar& s : r.scalars)
    std::printf("%-*s  %s\n", static_cast<int>(width), s.label.c_str(),
                FormatNumber(s.value, s.integer).c_str());
  for (const Table& t : r.tables) {
    std::printf("\n%s\n", t.label.c_str());
    if (t.rows.empty()) {
      std::printf("  (none)\n");
      continue;
    }
    std::printf("%4s", "#");
    for (const std::string& c : t.columns) std::printf("  %15s", c.c_str());
    std::printf("\n");
    for (size_t i = 0; i < t.rows.size(); ++i) {
      std::printf("%4zu", i);
      for (const double v : t.rows[i]) std::printf("  %15s", FormatNumber(v, false).c_str());
      std::printf("\n");
    }
  }
  for (const std::string& note : r.notes) std::printf("\nnote: %s\n", note.c_str());
  if (r.spectrum.present) {
    std::printf("\nspectrum written to %s", r.spectrum.csv.c_str());
    if (!r.spectrum.png.empty()) std::printf(", plot to %s", r.spectrum.png.c_str());
    std::printf("\n");
  }
}

void PrintJson(const RunInfo& run, const Report& r) {
  const Options& o = *run.options;
  std::string s = "{\n";
  s += "  \"method\": " + JsonString(o.methodName) + ",\n";
  s += "  \"signal\": {\"source\": " + JsonString(run.signal->source) +
       ", \"type\": " + JsonString(run.signal->complex ? "complex" : "real") +
       ", \"samples\": " + std::to_string(run.signal->n) + "},\n";
  s += "  \"parameters\": {";
  for (size_t i = 0; i < run.parameters.size(); ++i)
    s += (i ? ", " : "") + JsonString(run.parameters[i].first) + ": " +
         JsonNumber(run.parameters[i].second);
  s += "},\n  \"status\": 0,\n  \"results\": {";
  bool first = true;
  for (const Scalar& sc : r.scalars) {
    s += std::string(first ? "\n" : ",\n") + "    " + JsonString(sc.key) + ": " +
         JsonNumber(sc.value, sc.integer);
    first = false;
  }
  for (const Table& t : r.tables) {
    s += std::string(first ? "\n" : ",\n") + "    " + JsonString(t.key) + ": [";
    first = false;
    for (size_t i = 0; i < t.rows.size(); ++i) {
      s += std::string(i ? ",\n" : "\n") + "      {";
      for (size_t c = 0; c < t.columns.size(); ++c)
        s += (c ? ", " : "") + JsonString(t.columns[c]) + ": " + JsonNumber(t.rows[i][c]);
      s += "}";
    }
    s += t.rows.empty() ? "]" : "\n    ]";
  }
  if (r.spectrum.present) {
    s += std::string(first ? "\n" : ",\n") + "    \"spectrum\": {\"f0_hz\": " +
         JsonNumber(r.spectrum.f0) + ", \"df_hz\": " + JsonNumber(r.spectrum.df) +
         ", \"length\": " + std::to_string(r.spectrum.db.size()) +
         ", \"csv\": " + JsonString(r.spectrum.csv) +
         ", \"png\": " + (r.spectrum.png.empty() ? "null" : JsonString(r.spectrum.png)) +
         ",\n      \"db\": [";
    for (size_t i = 0; i < r.spectrum.db.size(); ++i)
      s += (i ? (i % 8 == 0 ? ",\n        " : ", ") : "") + JsonNumber(r.spectrum.db[i]);
    s += "]}";
  }
  s += "\n  }\n}\n";
  std::fputs(s.c_str(), stdout);
}

// ---------------------------------------------------------------------------
// Running the methods
// ---------------------------------------------------------------------------

// Poles or roots with their modulus and frequency in Hz.
Table PoleTable(const std::string& key, const std::string& label, const HostArray& h,
                double rate) {
  Table t{key, label, {"real", "imag", "modulus", "frequency_hz"}, {}};
  const std::vector<double> z = h.Pairs();
  for (size_t i = 0; i + 1 < z.size(); i += 2)
    t.rows.push_back({z[i], z[i + 1], std::hypot(z[i], z[i + 1]),
                      std::atan2(z[i + 1], z[i]) * rate / (2.0 * kPi)});
  return t;
}

Table CoefficientTable(const HostArray& h, bool complex) {
  Table t{"coefficients", "AR coefficients (a[0] = 1)", {}, {}};
  if (complex) {
    t.columns = {"real", "imag"};
    const std::vector<double> a = h.Pairs();
    for (size_t i = 0; i + 1 < a.size(); i += 2) t.rows.push_back({a[i], a[i + 1]});
  } else {
    t.columns = {"value"};
    for (const double v : h.Reals()) t.rows.push_back({v});
  }
  return t;
}

// Mode parameters; the columns present are those the method returns.
Table ModeTable(const HostArray& amp, const HostArray& phase, const HostArray* damping,
                const HostArray& freq) {
  Table t{"modes", "modes", {"amplitude", "phase_rad"}, {}};
  if (damping) t.columns.push_back("damping");
  t.columns.push_back("frequency_hz");
  const std::vector<double> a = amp.Reals(), p = phase.Reals(), f = freq.Reals();
  const std::vector<double> d = damping ? damping->Reals() : std::vector<double>();
  const size_t count = std::min({a.size(), p.size(), f.size()});
  for (size_t i = 0; i < count; ++i) {
    std::vector<double> row = {a[i], p[i]};
    if (damping) row.push_back(i < d.size() ? d[i] : NAN);
    row.push_back(f[i]);
    t.rows.push_back(row);
  }
  return t;
}

// The highest local maxima of a periodic spectrum, by value; for real data
// only the non-negative half.
Table PeakTable(const SpectrumOut& s, bool realData, size_t count) {
  Table t{"peaks", realData ? "spectral peaks (non-negative frequencies)" : "spectral peaks",
          {"frequency_hz", "db"}, {}};
  const size_t L = s.db.size();
  std::vector<std::pair<double, size_t>> peaks;
  for (size_t j = realData ? L / 2 : 0; j < L; ++j) {
    const double v = s.db[j], left = s.db[(j + L - 1) % L], right = s.db[(j + 1) % L];
    if (!std::isfinite(v) || L < 3) continue;
    if (v >= left && v > right) peaks.push_back({v, j});
  }
  std::stable_sort(peaks.begin(), peaks.end(),
                   [](const auto& a, const auto& b) { return a.first > b.first; });
  for (size_t i = 0; i < peaks.size() && i < count; ++i)
    t.rows.push_back({s.f0 + static_cast<double>(peaks[i].second) * s.df, peaks[i].first});
  return t;
}

void CheckStatus(int32_t status, const char* exportName, const RunInfo& run) {
  if (status == 0) return;
  const std::string message = std::string(exportName) + " returned " + std::to_string(status) +
                              ": " + StatusText(status);
  if (run.options->json)
    std::printf("{\"method\": %s, \"status\": %d, \"error\": %s}\n",
                JsonString(run.options->methodName).c_str(), status,
                JsonString(StatusText(status)).c_str());
  Fail(kExitLibrary, message);
}

void WriteSpectrumCsv(const SpectrumOut& s) {
  FILE* f = std::fopen(s.csv.c_str(), "w");
  if (f == nullptr)
    Fail(kExitOutput, "cannot write " + s.csv + ": " + std::strerror(errno));
  std::fprintf(f, "frequency_hz,power_db\n");
  for (size_t j = 0; j < s.db.size(); ++j)
    std::fprintf(f, "%s,%s\n", JsonNumber(s.f0 + static_cast<double>(j) * s.df).c_str(),
                 CsvNumber(s.db[j]).c_str());
  if (std::fclose(f) != 0) Fail(kExitOutput, "cannot write " + s.csv + ": " + std::strerror(errno));
}

std::string FindOnPath(const char* program) {
#if defined(_WIN32)
  constexpr char kSeparator = ';';
  const std::string file = std::string("\\") + program + ".exe";
#else
  constexpr char kSeparator = ':';
  const std::string file = std::string("/") + program;
#endif
  const char* path = std::getenv("PATH");
  std::string dirs = path ? path : "/usr/bin:/bin";
  size_t start = 0;
  for (;;) {
    const size_t colon = dirs.find(kSeparator, start);
    std::string dir = dirs.substr(start, colon - start);
    if (dir.empty()) dir = ".";
    const std::string candidate = dir + file;
#if defined(_WIN32)
    const DWORD attributes = GetFileAttributesA(candidate.c_str());
    if (attributes != INVALID_FILE_ATTRIBUTES && !(attributes & FILE_ATTRIBUTE_DIRECTORY))
      return candidate;
#else
    if (access(candidate.c_str(), X_OK) == 0) return candidate;
#endif
    if (colon == std::string::npos) return "";
    start = colon + 1;
  }
}

// gnuplot's single-quoted strings double an embedded quote.
std::string GnuplotQuote(const std::string& s) {
  std::string out = "'";
  for (const char c : s) out += c == '\'' ? std::string("''") : std::string(1, c);
  return out + "'";
}

// Draws the spectrum from its CSV; modes (frequencies in Hz) are marked with
// dashed lines and labelled.
void PlotSpectrum(const SpectrumOut& s, const std::string& title,
                  const std::vector<double>& modeFrequencies, bool mirrorModes) {
  const std::string gnuplot = FindOnPath("gnuplot");
  if (gnuplot.empty())
    Fail(kExitOutput, "gnuplot not found (install gnuplot-nox, or use --no-plot); spectrum CSV is " +
                          s.csv);
  double lowest = 0.0;
  for (const double v : s.db)
    if (std::isfinite(v)) lowest = std::min(lowest, v);
  const double bottom = std::max(std::floor(lowest / 10.0) * 10.0 - 5.0, -160.0);
  const double left = s.f0, right = s.f0 + static_cast<double>(s.db.size()) * s.df;

  std::string script;
  script += "set terminal pngcairo size 1100,650 enhanced font 'DejaVu Sans,11'\n";
  script += "set output " + GnuplotQuote(s.png) + "\n";
  script += "set title " + GnuplotQuote(title) + " noenhanced\n";
  script += "set xlabel 'Frequency (Hz)'\nset ylabel 'Power (dB, peak = 0 dB)'\n";
  script += "set grid\nset key bottom right opaque box\nset datafile separator ','\n";
  char range[160];
  std::snprintf(range, sizeof range, "set xrange [%.17g:%.17g]\nset yrange [%.17g:3]\n", left,
                right, bottom);
  script += range;
  int index = 0;
  for (const double f : modeFrequencies) {
    if (!std::isfinite(f)) continue;
    for (int side = 0; side < (mirrorModes && f != 0.0 ? 2 : 1); ++side) {
      const double x = side == 0 ? f : -f;
      char line[320];
      std::snprintf(line, sizeof line,
                    "set arrow %d from %.17g, graph 0 to %.17g, graph 1 nohead dt 2 lw 1.5 "
                    "lc rgb '#c0392b'\n",
                    ++index, x, x);
      script += line;
      if (side == 0) {
        std::snprintf(line, sizeof line,
                      "set label %d '%.4g Hz' at %.17g, graph 0.96 offset 0.5,0 tc rgb "
                      "'#c0392b'\n",
                      index, f, x);
        script += line;
      }
    }
  }
  script += "plot " + GnuplotQuote(s.csv) +
            " skip 1 using 1:2 with lines lw 2 lc rgb '#1f5fa8' title 'AR spectrum'";
  if (index > 0)
    script += ", NaN with lines dt 2 lw 1.5 lc rgb '#c0392b' title 'PCAR modes'";
  script += "\n";

#if defined(_WIN32)
  // gnuplot runs through the command interpreter, its output going to a log.
  char tempDir[MAX_PATH + 1], scriptPath[MAX_PATH + 1], logPath[MAX_PATH + 1];
  const DWORD dirLength = GetTempPathA(sizeof tempDir, tempDir);
  if (dirLength == 0 || dirLength > MAX_PATH ||
      GetTempFileNameA(tempDir, "qdp", 0, scriptPath) == 0 ||
      GetTempFileNameA(tempDir, "qdl", 0, logPath) == 0)
    Fail(kExitOutput, "cannot create a temporary file for gnuplot");
  bool written = false;
  {
    std::ofstream out(scriptPath, std::ios::binary);
    written =
        static_cast<bool>(out.write(script.data(), static_cast<std::streamsize>(script.size())));
  }
  const std::string command =
      "\"\"" + gnuplot + "\" \"" + scriptPath + "\" >\"" + logPath + "\" 2>&1\"";
  const int exitCode = written ? std::system(command.c_str()) : -1;
  const bool spawned = exitCode != -1;
  const bool succeeded = exitCode == 0;
#else
  char scriptPath[] = "/tmp/qdm_example_plot_XXXXXX";
  const int scriptFd = mkstemp(scriptPath);
  char logPath[] = "/tmp/qdm_example_log_XXXXXX";
  const int logFd = mkstemp(logPath);
  if (scriptFd < 0 || logFd < 0) Fail(kExitOutput, "cannot create a temporary file for gnuplot");
  const bool written =
      write(scriptFd, script.data(), script.size()) == static_cast<ssize_t>(script.size());
  close(scriptFd);

  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_adddup2(&actions, logFd, 1);
  posix_spawn_file_actions_adddup2(&actions, logFd, 2);
  char* args[] = {const_cast<char*>("gnuplot"), scriptPath, nullptr};
  pid_t pid = 0;
  const int spawned =
      written ? posix_spawn(&pid, gnuplot.c_str(), &actions, nullptr, args, environ) : -1;
  posix_spawn_file_actions_destroy(&actions);
  int wstatus = 0;
  if (spawned == 0) waitpid(pid, &wstatus, 0);
  close(logFd);
  const bool succeeded = spawned == 0 && WIFEXITED(wstatus) && WEXITSTATUS(wstatus) == 0;
#endif

  std::string firstLine;
  std::ifstream log(logPath);
  for (std::string line; std::getline(log, line);)
    if (!Trim(line).empty()) {
      firstLine = Trim(line);
      break;
    }
  log.close();
  std::remove(scriptPath);
  std::remove(logPath);
#if defined(_WIN32)
  if (!spawned) Fail(kExitOutput, "cannot run gnuplot");
#else
  if (spawned != 0) Fail(kExitOutput, "cannot run gnuplot");
#endif
  if (!succeeded)
    Fail(kExitOutput, "gnuplot failed drawing " + s.png +
                          (firstLine.empty() ? std::string() : ": " + firstLine));
}

// Runs the chosen method; every parameter not given takes its default.
Report Run(const Exports& e, RunInfo& run) {
  const Options& o = *run.options;
  const Signal& sig = *run.signal;
  const int32_t type = sig.complex ? QDM_TYPE_COMPLEX : QDM_TYPE_DOUBLE;
  HostArray data(type, sig.values, sig.n);
  const double rate = run.rate;
  const uint8_t flag = o.realSignal ? 1 : 0;
  auto param = [&](const char* name, double v) { run.parameters.push_back({name, v}); };
  Report r;

  if (o.realSignal && (o.method == Method::kProny || o.method == Method::kPencil ||
                       o.method == Method::kPcarSpectrum))
    r.notes.push_back(
        "with --real-signal each conjugate pair is reported once, at its non-negative "
        "frequency, with the amplitude of that one exponential (half the sinusoid's)");

  switch (o.method) {
    case Method::kCovariance: {
      const int32_t p = o.has(Opt::kOrder) ? o.order : 12;
      param("order", p);
      param("rate_hz", rate);
      HostArray coef(type), poles(QDM_TYPE_COMPLEX);
      double variance = 0.0;
      const int32_t st =
          sig.complex ? e.cxCovariance(data.get(), p, coef.get(), poles.get(), &variance)
                      : e.reCovariance(data.get(), p, coef.get(), poles.get(), &variance);
      CheckStatus(st, sig.complex ? "QdmCxCovarianceH" : "QdmReCovarianceH", run);
      r.scalars.push_back({"noise_variance", "noise variance", variance, false});
      r.tables.push_back(CoefficientTable(coef, sig.complex));
      r.tables.push_back(PoleTable("poles", "poles", poles, rate));
      break;
    }
    case Method::kPcar: {
      const int32_t p = o.has(Opt::kOrder) ? o.order : 12;
      const int32_t c = o.has(Opt::kComponents) ? o.components : 6;
      param("order", p);
      param("components", c);
      param("rate_hz", rate);
      HostArray coef(type), roots(QDM_TYPE_COMPLEX);
      const int32_t st = sig.complex ? e.cxPcar(data.get(), p, c, coef.get(), roots.get())
                                     : e.rePcar(data.get(), p, c, coef.get(), roots.get());
      CheckStatus(st, sig.complex ? "QdmCxPCARH" : "QdmRePCARH", run);
      r.tables.push_back(CoefficientTable(coef, sig.complex));
      r.tables.push_back(PoleTable("roots", "roots", roots, rate));
      break;
    }
    case Method::kProny: {
      const int32_t p = o.has(Opt::kOrder) ? o.order : 6;
      param("order", p);
      param("rate_hz", rate);
      if (!sig.complex) param("real_signal", flag);
      HostArray amp(QDM_TYPE_DOUBLE), ph(QDM_TYPE_DOUBLE), damp(QDM_TYPE_DOUBLE),
          freq(QDM_TYPE_DOUBLE);
      const int32_t st =
          sig.complex ? e.cxProny(data.get(), p, rate, amp.get(), ph.get(), damp.get(), freq.get())
                      : e.reProny(data.get(), p, rate, &flag, amp.get(), ph.get(), damp.get(),
                                  freq.get());
      CheckStatus(st, sig.complex ? "QdmCxPronyH" : "QdmRePronyH", run);
      r.scalars.push_back({"mode_count", "modes reported", double(amp.count()), true});
      r.tables.push_back(ModeTable(amp, ph, &damp, freq));
      break;
    }
    case Method::kPencil: {
      const int32_t L = o.has(Opt::kPencil) ? o.pencil : sig.n / 3;
      const int32_t M = o.has(Opt::kModes) ? o.modes : 6;
      param("pencil", L);
      param("modes", M);
      param("rate_hz", rate);
      if (!sig.complex) param("real_signal", flag);
      HostArray amp(QDM_TYPE_DOUBLE), ph(QDM_TYPE_DOUBLE), damp(QDM_TYPE_DOUBLE),
          freq(QDM_TYPE_DOUBLE);
      double mse = 0.0;
      const int32_t st =
          sig.complex ? e.cxPencil(data.get(), L, M, rate, amp.get(), ph.get(), damp.get(),
                                   freq.get(), &mse)
                      : e.rePencil(data.get(), L, M, rate, &flag, amp.get(), ph.get(),
                                   damp.get(), freq.get(), &mse);
      CheckStatus(st, sig.complex ? "QdmCxMatrixPencilH" : "QdmReMatrixPencilH", run);
      r.scalars.push_back({"mode_count", "modes reported", double(amp.count()), true});
      r.scalars.push_back({"mse", "mean squared fit error", mse, false});
      r.tables.push_back(ModeTable(amp, ph, &damp, freq));
      break;
    }
    case Method::kMdl: {
      const int32_t L = o.has(Opt::kUpper) ? o.upper : 16;
      const int32_t minOrder = o.has(Opt::kMinOrder) ? o.minOrder : 1;
      param("upper", L);
      param("min_order", minOrder);
      int32_t order = 0;
      const int32_t st = sig.complex ? e.cxMdl(data.get(), L, minOrder, &order)
                                     : e.reMdl(data.get(), L, minOrder, &order);
      CheckStatus(st, sig.complex ? "QdmCxMinDescriptLenH" : "QdmReMinDescriptLenH", run);
      r.scalars.push_back({"order", "chosen order", double(order), true});
      break;
    }
    case Method::kCovSpectrum:
    case Method::kPcarSpectrum: {
      const bool pcar = o.method == Method::kPcarSpectrum;
      const int32_t p = o.has(Opt::kOrder) ? o.order : 12;
      const int32_t k = o.has(Opt::kComponents) ? o.components : 6;
      const int32_t m = o.has(Opt::kPoints) ? o.points : 512;
      param("order", p);
      if (pcar) param("components", k);
      param("points", m);
      param("rate_hz", rate);
      if (pcar && !sig.complex) param("real_signal", flag);
      HostArray spectrum(QDM_TYPE_DOUBLE), amp(QDM_TYPE_DOUBLE), ph(QDM_TYPE_DOUBLE),
          freq(QDM_TYPE_DOUBLE);
      double f0 = 0.0, df = 0.0, variance = 0.0, fitError = 0.0;
      int32_t st = 0;
      const char* name = nullptr;
      if (!pcar) {
        name = sig.complex ? "QdmCxCovPowerSpectrH" : "QdmReCovPowerSpectrH";
        st = sig.complex
                 ? e.cxCovSpectrum(data.get(), p, m, rate, &f0, &df, spectrum.get(), &variance)
                 : e.reCovSpectrum(data.get(), p, m, rate, &f0, &df, spectrum.get(), &variance);
      } else {
        name = sig.complex ? "QdmCxPCARPowerSpectrumH" : "QdmRePCARPowerSpectrumH";
        st = sig.complex ? e.cxPcarSpectrum(data.get(), p, m, k, rate, amp.get(), ph.get(),
                                            freq.get(), &f0, &df, spectrum.get(), &fitError)
                         : e.rePcarSpectrum(data.get(), p, m, k, rate, &flag, amp.get(),
                                            ph.get(), freq.get(), &f0, &df, spectrum.get(),
                                            &fitError);
      }
      CheckStatus(st, name, run);
      SpectrumOut& s = r.spectrum;
      s.present = true;
      s.f0 = f0;
      s.df = df;
      s.db = spectrum.Reals();
      s.csv = o.csv;
      r.scalars.push_back({"f0_hz", "first frequency f0 (Hz)", f0, false});
      r.scalars.push_back({"df_hz", "frequency step df (Hz)", df, false});
      r.scalars.push_back({"length", "spectrum length", double(s.db.size()), true});
      if (!pcar) r.scalars.push_back({"noise_variance", "noise variance", variance, false});
      std::vector<double> modeFrequencies;
      if (pcar) {
        r.scalars.push_back({"fit_error", "amplitude fit error", fitError, false});
        r.scalars.push_back({"mode_count", "modes reported", double(amp.count()), true});
        r.tables.push_back(ModeTable(amp, ph, nullptr, freq));
        modeFrequencies = freq.Reals();
      }
      // As many peaks as the model can hold modes; half of them for real data,
      // whose spectrum is listed for non-negative frequencies only.
      const size_t peaks = pcar ? static_cast<size_t>(std::max(k, 1)) : 6;
      r.tables.push_back(PeakTable(s, !sig.complex, sig.complex ? peaks : (peaks + 1) / 2));
      WriteSpectrumCsv(s);
      if (!o.noPlot && !(std::isfinite(f0) && std::isfinite(df)))
        Fail(kExitOutput, "cannot plot a spectrum whose frequency grid is not finite (sampling "
                          "rate " + FormatNumber(rate, false) + "); spectrum CSV is " + s.csv);
      if (!o.noPlot) {
        s.png = o.png;
        char title[512];
        std::snprintf(title, sizeof title, "%s, order %d%s, %s (%d samples)", o.methodTitle, p,
                      pcar ? (", " + std::to_string(k) + " components").c_str() : "",
                      sig.source.c_str(), sig.n);
        // Real data without the real-signal flag report both members of each
        // pair; with the flag only the positive one, so mirror it on the plot.
        PlotSpectrum(s, title, modeFrequencies, !sig.complex && o.realSignal);
      }
      break;
    }
  }
  return r;
}

}  // namespace

int main(int argc, char** argv) {
  const Options options = ParseCommandLine(argc, argv);

  Signal signal = options.haveFile ? ReadCsv(options.file) : BuiltInExample(options.complexExample);
  if (options.realSignal && signal.complex)
    Fail(kExitInput, "--real-signal applies to real data only; " + signal.source + " is complex");

  std::string library = options.library;
  if (library.empty()) {
    const char* env = std::getenv("QDM_LIBRARY");
    library = (env != nullptr && *env != '\0') ? env : QDM_DEFAULT_LIBRARY;
  }
  const Exports exports = LoadLibrary(library);

  RunInfo run{&options, &signal, options.has(Opt::kRate) ? options.rate : signal.defaultRate, {}};
  const Report report = Run(exports, run);
  if (options.json) PrintJson(run, report);
  else PrintText(run, report);
  return kExitOk;
}
