// Estimator benchmark: times every export through the host ABI, as a host
// calls it (the library loaded with dlopen, arrays owned by the emulated host
// run-time), on generated records at two sizes, and writes one JSON document
// with the records, the outputs and the times. bench/estimators_bench.py runs
// it, times numpy's equivalents on the same records and prints the table.
//
//   estimators_bench LIBQDM [--quick] [--only EXPORT:RECORD] [--untimed] [--extra] [--threads T]
//
// --untimed writes the outputs with no times.
// --extra writes the outputs (no times) for records scaled by 1e150 and 1e-150
// and for a noise-free record, to compare one build's answers with another's.
//
// Each time is the best over several batches of calls, per call, in seconds of
// process CPU time (BLAS worker threads included, descheduled time left out).
// --threads T instead runs T host threads at once, each calling the complex
// covariance export on its own copy of the n = 16384 record, and reports the
// wall time per call.

#include <dlfcn.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cmath>
#include <complex>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "support/qdm_host.h"

namespace {

using qdmtest::HostArray;
using Cx = std::complex<double>;

double g_batch_seconds = 0.05;
int g_batches = 5;

double ProcessSeconds() {
  timespec ts;
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &ts);
  return static_cast<double>(ts.tv_sec) + 1e-9 * static_cast<double>(ts.tv_nsec);
}

// Best per-call time of `call` over g_batches batches of about g_batch_seconds.
double BestTime(const std::function<void()>& call) {
  call();  // warm-up: plan caches, page faults, lazy binding
  int reps = 1;
  for (;;) {
    const double t0 = ProcessSeconds();
    for (int r = 0; r < reps; ++r) call();
    const double t = ProcessSeconds() - t0;
    if (t >= g_batch_seconds || reps >= (1 << 20)) break;
    reps = t <= 0.0 ? reps * 10 : std::max(reps + 1, static_cast<int>(reps * g_batch_seconds / t));
  }
  double best = 1e300;
  for (int b = 0; b < g_batches; ++b) {
    const double t0 = ProcessSeconds();
    for (int r = 0; r < reps; ++r) call();
    best = std::min(best, (ProcessSeconds() - t0) / reps);
  }
  return best;
}

// ---- records ---------------------------------------------------------------------------------
// Three damped sinusoids (complex: three damped complex exponentials) in white
// noise 30 dB below, from a fixed-seed generator so every run sees the same data.
struct Rng {
  uint64_t s;
  double Uniform() {
    s = s * 6364136223846793005ULL + 1442695040888963407ULL;
    return (static_cast<double>(s >> 11) + 0.5) * (1.0 / 9007199254740992.0);
  }
  double Normal() {
    const double u = Uniform(), v = Uniform();
    return std::sqrt(-2.0 * std::log(u)) * std::cos(6.283185307179586 * v);
  }
};

const double kFreq[3] = {0.0917, 0.173, 0.3121};
const double kDamp[3] = {-2e-5, -5e-5, -1e-4};
const double kAmp[3] = {1.0, 0.7, 0.4};

std::vector<double> RealRecord(int n, uint64_t seed) {
  Rng rng{seed};
  std::vector<double> x(static_cast<size_t>(n));
  for (int t = 0; t < n; ++t) {
    double v = 0.0;
    for (int i = 0; i < 3; ++i) {
      v += kAmp[i] * std::exp(kDamp[i] * t) * std::cos(6.283185307179586 * kFreq[i] * t + i);
    }
    x[static_cast<size_t>(t)] = v + 0.03 * rng.Normal();
  }
  return x;
}

std::vector<Cx> ComplexRecord(int n, uint64_t seed) {
  Rng rng{seed};
  std::vector<Cx> x(static_cast<size_t>(n));
  for (int t = 0; t < n; ++t) {
    Cx v = 0.0;
    for (int i = 0; i < 3; ++i) {
      v += kAmp[i] * std::exp(Cx(kDamp[i] * t, 6.283185307179586 * kFreq[i] * t + i));
    }
    x[static_cast<size_t>(t)] = v + 0.03 * Cx(rng.Normal(), rng.Normal());
  }
  return x;
}

// ---- JSON ---------------------------------------------------------------------------------------
std::string Num(double v) {
  if (std::isnan(v)) return "NaN";
  if (std::isinf(v)) return v > 0 ? "Infinity" : "-Infinity";
  char buf[40];
  std::snprintf(buf, sizeof buf, "%.17g", v);
  return buf;
}
std::string List(const std::vector<double>& v) {
  std::string s = "[";
  for (size_t i = 0; i < v.size(); ++i) {
    if (i) s += ',';
    s += Num(v[i]);
  }
  return s + "]";
}
std::vector<double> Flat(const std::vector<Cx>& v) {
  std::vector<double> out;
  for (const Cx& c : v) {
    out.push_back(c.real());
    out.push_back(c.imag());
  }
  return out;
}

// One export call on fresh output arrays: its status and named outputs.
struct Result {
  int32_t status = 0;
  std::vector<std::pair<std::string, std::vector<double>>> outputs;
};

struct Case {
  std::string name;    // export name
  std::string record;  // record key
  std::string params;  // JSON object of the parameters
  std::function<Result()> run;
};

// ---- the cases
// -------------------------------------------------------------------------------------
struct Sizes {
  int n, p, k, L, M, points;
};

void AddCases(const qdmtest::QdmApi& q, std::vector<Case>& cases, const std::string& rkey,
              const std::string& ckey, const HostArray& xr, const HostArray& xc, Sizes z) {
  const double fs = 1.0;
  static const uint8_t kTrue = 1;
  const HostArray* R = &xr;
  const HostArray* C = &xc;
  auto P = [](std::initializer_list<std::pair<const char*, double>> kv) {
    std::string s = "{";
    bool first = true;
    for (auto& [k, v] : kv) {
      s += std::string(first ? "" : ",") + "\"" + k + "\":" + Num(v);
      first = false;
    }
    return s + "}";
  };
  const std::string cov = P({{"p", z.p}});
  cases.push_back(
      {"QdmReCovarianceH", rkey, cov, [&q, R, z] {
         auto a = HostArray::Empty(QDM_TYPE_DOUBLE), r = HostArray::Empty(QDM_TYPE_COMPLEX);
         double v = 0;
         Result res{q.QdmReCovarianceH(*R, z.p, a, r, &v), {}};
         res.outputs = {
             {"coefficients", a.Reals()}, {"poles", Flat(r.Complexes())}, {"variance", {v}}};
         return res;
       }});
  cases.push_back({"QdmCxCovarianceH", ckey, cov, [&q, C, z] {
                     auto a = HostArray::Empty(QDM_TYPE_COMPLEX),
                          r = HostArray::Empty(QDM_TYPE_COMPLEX);
                     double v = 0;
                     Result res{q.QdmCxCovarianceH(*C, z.p, a, r, &v), {}};
                     res.outputs = {{"coefficients", Flat(a.Complexes())},
                                    {"poles", Flat(r.Complexes())},
                                    {"variance", {v}}};
                     return res;
                   }});
  const std::string pcar = P({{"p", z.p}, {"k", z.k}});
  cases.push_back({"QdmRePCARH", rkey, pcar, [&q, R, z] {
                     auto a = HostArray::Empty(QDM_TYPE_DOUBLE),
                          r = HostArray::Empty(QDM_TYPE_COMPLEX);
                     Result res{q.QdmRePCARH(*R, z.p, z.k, a, r), {}};
                     res.outputs = {{"coefficients", a.Reals()}, {"poles", Flat(r.Complexes())}};
                     return res;
                   }});
  cases.push_back(
      {"QdmCxPCARH", ckey, pcar, [&q, C, z] {
         auto a = HostArray::Empty(QDM_TYPE_COMPLEX), r = HostArray::Empty(QDM_TYPE_COMPLEX);
         Result res{q.QdmCxPCARH(*C, z.p, z.k, a, r), {}};
         res.outputs = {{"coefficients", Flat(a.Complexes())}, {"poles", Flat(r.Complexes())}};
         return res;
       }});
  auto modes = [](Result& res, HostArray& amp, HostArray& ph, HostArray& dm, HostArray& fr) {
    res.outputs = {{"amplitude", amp.Reals()},
                   {"phase", ph.Reals()},
                   {"damping", dm.Reals()},
                   {"frequency", fr.Reals()}};
  };
  const std::string prony = P({{"p", z.p}, {"fs", fs}});
  cases.push_back({"QdmRePronyH", rkey, prony, [&q, R, z, fs, modes] {
                     auto amp = HostArray::Empty(10), ph = HostArray::Empty(10),
                          dm = HostArray::Empty(10), fr = HostArray::Empty(10);
                     Result res{q.QdmRePronyH(*R, z.p, fs, &kTrue, amp, ph, dm, fr), {}};
                     modes(res, amp, ph, dm, fr);
                     return res;
                   }});
  cases.push_back({"QdmCxPronyH", ckey, prony, [&q, C, z, fs, modes] {
                     auto amp = HostArray::Empty(10), ph = HostArray::Empty(10),
                          dm = HostArray::Empty(10), fr = HostArray::Empty(10);
                     Result res{q.QdmCxPronyH(*C, z.p, fs, amp, ph, dm, fr), {}};
                     modes(res, amp, ph, dm, fr);
                     return res;
                   }});
  const std::string pencil = P({{"L", z.L}, {"M", z.M}, {"fs", fs}});
  cases.push_back(
      {"QdmReMatrixPencilH", rkey, pencil, [&q, R, z, fs, modes] {
         auto amp = HostArray::Empty(10), ph = HostArray::Empty(10), dm = HostArray::Empty(10),
              fr = HostArray::Empty(10);
         double mse = 0;
         Result res{q.QdmReMatrixPencilH(*R, z.L, z.M, fs, &kTrue, amp, ph, dm, fr, &mse), {}};
         modes(res, amp, ph, dm, fr);
         res.outputs.push_back({"mse", {mse}});
         return res;
       }});
  cases.push_back({"QdmCxMatrixPencilH", ckey, pencil, [&q, C, z, fs, modes] {
                     auto amp = HostArray::Empty(10), ph = HostArray::Empty(10),
                          dm = HostArray::Empty(10), fr = HostArray::Empty(10);
                     double mse = 0;
                     Result res{q.QdmCxMatrixPencilH(*C, z.L, z.M, fs, amp, ph, dm, fr, &mse), {}};
                     modes(res, amp, ph, dm, fr);
                     res.outputs.push_back({"mse", {mse}});
                     return res;
                   }});
  const std::string mdl = P({{"L", z.p}, {"minOrder", 1}});
  cases.push_back({"QdmReMinDescriptLenH", rkey, mdl, [&q, R, z] {
                     int32_t order = 0;
                     Result res{q.QdmReMinDescriptLenH(*R, z.p, 1, &order), {}};
                     res.outputs = {{"order", {static_cast<double>(order)}}};
                     return res;
                   }});
  cases.push_back({"QdmCxMinDescriptLenH", ckey, mdl, [&q, C, z] {
                     int32_t order = 0;
                     Result res{q.QdmCxMinDescriptLenH(*C, z.p, 1, &order), {}};
                     res.outputs = {{"order", {static_cast<double>(order)}}};
                     return res;
                   }});
  const std::string cs = P({{"p", z.p}, {"m", z.points}, {"fs", fs}});
  cases.push_back({"QdmReCovPowerSpectrH", rkey, cs, [&q, R, z, fs] {
                     auto s = HostArray::Empty(10);
                     double f0 = 0, df = 0, v = 0;
                     Result res{q.QdmReCovPowerSpectrH(*R, z.p, z.points, fs, &f0, &df, s, &v), {}};
                     res.outputs = {{"spectrum", s.Reals()}, {"variance", {v}}};
                     return res;
                   }});
  cases.push_back({"QdmCxCovPowerSpectrH", ckey, cs, [&q, C, z, fs] {
                     auto s = HostArray::Empty(10);
                     double f0 = 0, df = 0, v = 0;
                     Result res{q.QdmCxCovPowerSpectrH(*C, z.p, z.points, fs, &f0, &df, s, &v), {}};
                     res.outputs = {{"spectrum", s.Reals()}, {"variance", {v}}};
                     return res;
                   }});
  const std::string ps = P({{"p", z.p}, {"m", z.points}, {"k", z.k}, {"fs", fs}});
  cases.push_back({"QdmRePCARPowerSpectrumH", rkey, ps, [&q, R, z, fs] {
                     auto amp = HostArray::Empty(10), ph = HostArray::Empty(10),
                          fr = HostArray::Empty(10), s = HostArray::Empty(10);
                     double f0 = 0, df = 0, e = 0;
                     Result res{q.QdmRePCARPowerSpectrumH(*R, z.p, z.points, z.k, fs, &kTrue, amp,
                                                          ph, fr, &f0, &df, s, &e),
                                {}};
                     res.outputs = {{"amplitude", amp.Reals()},
                                    {"frequency", fr.Reals()},
                                    {"spectrum", s.Reals()},
                                    {"fitError", {e}}};
                     return res;
                   }});
  cases.push_back({"QdmCxPCARPowerSpectrumH", ckey, ps, [&q, C, z, fs] {
                     auto amp = HostArray::Empty(10), ph = HostArray::Empty(10),
                          fr = HostArray::Empty(10), s = HostArray::Empty(10);
                     double f0 = 0, df = 0, e = 0;
                     Result res{q.QdmCxPCARPowerSpectrumH(*C, z.p, z.points, z.k, fs, amp, ph, fr,
                                                          &f0, &df, s, &e),
                                {}};
                     res.outputs = {{"amplitude", amp.Reals()},
                                    {"frequency", fr.Reals()},
                                    {"spectrum", s.Reals()},
                                    {"fitError", {e}}};
                     return res;
                   }});
}

// The BLAS that actually runs: the file that provides dgemm in this process,
// and OpenBLAS's own account of its kernel when it is OpenBLAS. A library
// built with its own OpenBLAS (QDM_BLAS=openblas) loads no shared BLAS, and
// its copy's names are local to it.
std::string BlasDescription() {
  std::string where = "the library's own OpenBLAS, linked in (no shared BLAS loaded)";
  void* blas = dlopen("libblas.so.3", RTLD_NOW | RTLD_NOLOAD);
  if (blas == nullptr) blas = dlopen("libopenblas.so.0", RTLD_NOW | RTLD_NOLOAD);
  if (blas != nullptr) {
    Dl_info info{};
    void* sym = dlsym(blas, "dgemm_");
    if (sym != nullptr && dladdr(sym, &info) != 0 && info.dli_fname != nullptr) {
      char real[4096];
      where = realpath(info.dli_fname, real) != nullptr ? real : info.dli_fname;
    }
    using Text = char* (*)();
    auto core = reinterpret_cast<Text>(dlsym(blas, "openblas_get_corename"));
    auto config = reinterpret_cast<Text>(dlsym(blas, "openblas_get_config"));
    if (core != nullptr) where += std::string(" [OpenBLAS ") + config() + ", core " + core() + "]";
  }
  return where;
}

int RunThreads(const qdmtest::QdmApi& q, int threads) {
  const int n = 16384, p = 64, calls = 8;
  std::vector<std::vector<Cx>> data;
  for (int t = 0; t < threads; ++t) data.push_back(ComplexRecord(n, 7 + t));
  std::atomic<int> bad{0};
  const auto t0 = std::chrono::steady_clock::now();
  std::vector<std::thread> pool;
  for (int t = 0; t < threads; ++t) {
    pool.emplace_back([&, t] {
      auto x = HostArray::Complex(data[static_cast<size_t>(t)]);
      for (int c = 0; c < calls; ++c) {
        auto a = HostArray::Empty(QDM_TYPE_COMPLEX), r = HostArray::Empty(QDM_TYPE_COMPLEX);
        double v = 0;
        if (q.QdmCxCovarianceH(x, p, a, r, &v) != 0) ++bad;
      }
    });
  }
  for (auto& th : pool) th.join();
  const double wall = std::chrono::duration<double>(std::chrono::steady_clock::now() - t0).count();
  std::printf(
      "{\"threads\":%d,\"calls\":%d,\"wall_per_call\":%s,\"failures\":%d,\"blas\":\"%s\"}\n",
      threads, threads * calls, Num(wall / (threads * calls)).c_str(), bad.load(),
      BlasDescription().c_str());
  return bad.load() == 0 ? 0 : 1;
}

}  // namespace

int main(int argc, char** argv) {
  if (argc < 2) {
    std::fprintf(stderr, "usage: %s LIBQDM [--quick] [--untimed] [--records-only] [--threads T]\n",
                 argv[0]);
    return 2;
  }
  bool records_only = false;
  bool extra = false;
  int threads = 0;
  std::string only;
  for (int i = 2; i < argc; ++i) {
    if (std::strcmp(argv[i], "--quick") == 0) {
      g_batch_seconds = 0.005;
      g_batches = 2;
    } else if (std::strcmp(argv[i], "--extra") == 0) {
      extra = true;
    } else if (std::strcmp(argv[i], "--untimed") == 0) {
      g_batches = 0;
    } else if (std::strcmp(argv[i], "--records-only") == 0) {
      records_only = true;
    } else if (std::strcmp(argv[i], "--only") == 0 && i + 1 < argc) {
      only = argv[++i];
    } else if (std::strcmp(argv[i], "--threads") == 0 && i + 1 < argc) {
      threads = std::atoi(argv[++i]);
    }
  }
  const qdmtest::QdmApi q = qdmtest::LoadQdm(argv[1]);
  if (threads > 0) return RunThreads(q, threads);

  struct Sized {
    Sizes z;
    std::string rkey, ckey;
    std::vector<double> xr;
    std::vector<Cx> xc;
  };
  std::vector<Sized> sets;
  sets.push_back({{1024, 16, 4, 256, 4, 1024},
                  "real1024",
                  "complex1024",
                  RealRecord(1024, 1),
                  ComplexRecord(1024, 2)});
  sets.push_back({{16384, 64, 4, 64, 4, 16384},
                  "real16384",
                  "complex16384",
                  RealRecord(16384, 3),
                  ComplexRecord(16384, 4)});

  if (extra) {
    // Outputs only, no times: the records scaled to the ends of the range, and
    // a noise-free record whose high-order fits are ill-conditioned.
    auto scaled = [](std::vector<double> x, double f) {
      for (double& v : x) v *= f;
      return x;
    };
    auto scaledc = [](std::vector<Cx> x, double f) {
      for (Cx& v : x) v *= f;
      return x;
    };
    const Sizes z{1024, 16, 4, 256, 4, 1024};
    const auto xr = RealRecord(1024, 1);
    const auto xc = ComplexRecord(1024, 2);
    sets = {};
    sets.push_back(
        {z, "real1024x1e150", "complex1024x1e150", scaled(xr, 1e150), scaledc(xc, 1e150)});
    sets.push_back(
        {z, "real1024x1e-150", "complex1024x1e-150", scaled(xr, 1e-150), scaledc(xc, 1e-150)});
    std::vector<double> cr(1024);
    std::vector<Cx> cc(1024);
    for (int t = 0; t < 1024; ++t) {
      cr[t] = std::cos(0.3 * t) + 0.5 * std::cos(1.1 * t);
      cc[t] = std::exp(Cx(0.0, 0.3 * t)) + 0.5 * std::exp(Cx(-0.001 * t, 1.1 * t));
    }
    sets.push_back({{1024, 24, 4, 256, 4, 1024}, "cleanreal1024", "cleancomplex1024", cr, cc});
    g_batches = 0;
  }

  std::string out = "{\"blas\":\"";
  std::vector<HostArray> arrays;
  std::vector<Case> cases;
  for (auto& s : sets) {
    arrays.push_back(HostArray::Real(s.xr));
    arrays.push_back(HostArray::Complex(s.xc));
  }
  for (size_t i = 0; i < sets.size(); ++i) {
    AddCases(q, cases, sets[i].rkey, sets[i].ckey, arrays[2 * i], arrays[2 * i + 1], sets[i].z);
  }
  if (!only.empty()) {  // --only EXPORT:RECORD, either part may be empty
    const std::string name = only.substr(0, only.find(':'));
    const std::string record =
        only.find(':') == std::string::npos ? "" : only.substr(only.find(':') + 1);
    std::erase_if(cases, [&](const Case& c) {
      return (!name.empty() && c.name != name) || (!record.empty() && c.record != record);
    });
  }
  out += BlasDescription() + "\",\n\"records\":{";
  for (size_t i = 0; i < sets.size(); ++i) {
    out += std::string(i ? ",\n" : "\n") + "\"" + sets[i].rkey + "\":" + List(sets[i].xr) +
           ",\n\"" + sets[i].ckey + "\":" + List(Flat(sets[i].xc));
  }
  out += "},\n\"cases\":[";
  if (!records_only) {
    for (size_t i = 0; i < cases.size(); ++i) {
      const Case& c = cases[i];
      const Result r = c.run();
      const double t = g_batches == 0 ? 0.0 : BestTime([&] { (void)c.run(); });
      std::fprintf(stderr, "%-26s %-13s %10.3f ms\n", c.name.c_str(), c.record.c_str(), 1e3 * t);
      out += std::string(i ? ",\n" : "\n") + "{\"name\":\"" + c.name + "\",\"record\":\"" +
             c.record + "\",\"params\":" + c.params + ",\"seconds\":" + Num(t) +
             ",\"status\":" + std::to_string(r.status) + ",\"outputs\":{";
      for (size_t j = 0; j < r.outputs.size(); ++j) {
        out += std::string(j ? "," : "") + "\"" + r.outputs[j].first +
               "\":" + List(r.outputs[j].second);
      }
      out += "}}";
    }
  }
  out += "]}\n";
  std::fwrite(out.data(), 1, out.size(), stdout);
  return 0;
}
