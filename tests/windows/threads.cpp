// The DLL under Windows threads, as a host creates them (CreateThread), and
// across unload and reload: the plan-list mutex is created when the DLL is
// attached and closed when it is detached, so a reloaded DLL must serve
// concurrent callers again. Every concurrent result must equal, bit for bit,
// the same call made alone.
//
// Each test loads and frees the DLL itself, so that FreeLibrary really
// unloads it.
#include <gtest/gtest.h>
#include <windows.h>

#include <cmath>
#include <complex>
#include <cstdint>
#include <cstring>
#include <vector>

#include "support/qdm_host.h"

namespace {

using qdmtest::HostArray;
using qdmtest::QdmApi;

constexpr int kThreads = 6;

std::vector<double> RealSignal(int n) {
  std::vector<double> x(static_cast<size_t>(n));
  for (int t = 0; t < n; ++t)
    x[static_cast<size_t>(t)] = std::cos(0.61 * t) + 0.4 * std::sin(1.9 * t + 0.3) +
                                0.05 * std::cos(0.37 * t * t);
  return x;
}

std::vector<std::complex<double>> ComplexSignal(int n) {
  std::vector<std::complex<double>> x(static_cast<size_t>(n));
  for (int t = 0; t < n; ++t)
    x[static_cast<size_t>(t)] = std::polar(std::pow(0.99, t), 0.8 * t) +
                                0.6 * std::polar(1.0, -2.2 * t) +
                                0.05 * std::complex<double>(std::cos(0.3 * t * t), 0.0);
  return x;
}

// Everything one call leaves behind, doubles as bit patterns.
struct Outcome {
  int32_t status = 0;
  std::vector<uint64_t> bits;
  bool operator==(const Outcome&) const = default;
};

void Add(Outcome& o, double v) {
  uint64_t b;
  std::memcpy(&b, &v, sizeof b);
  o.bits.push_back(b);
}
void Add(Outcome& o, const std::vector<double>& values) {
  o.bits.push_back(values.size());
  for (double v : values) Add(o, v);
}

// Call `kind` of a fixed set: spectra of several lengths, real and complex (the
// plan list under the mutex), and a model fit.
constexpr int kKinds = 6;
Outcome CallKind(const QdmApi& qdm, int kind) {
  Outcome o;
  double f0 = 0, df = 0, extra = 0;
  HostArray spectrum = HostArray::Empty(QDM_TYPE_DOUBLE);
  switch (kind) {
    case 0:
    case 1: {
      HostArray x = HostArray::Real(RealSignal(200));
      o.status = qdm.QdmReCovPowerSpectrH(x, 8, kind == 0 ? 300 : 1000, 1000.0, &f0, &df,
                                          spectrum, &extra);
      break;
    }
    case 2:
    case 3: {
      HostArray x = HostArray::Complex(ComplexSignal(160));
      o.status = qdm.QdmCxCovPowerSpectrH(x, 6, kind == 2 ? 100 : 2000, 50.0, &f0, &df,
                                          spectrum, &extra);
      break;
    }
    case 4: {
      HostArray x = HostArray::Complex(ComplexSignal(120));
      HostArray a = HostArray::Empty(QDM_TYPE_DOUBLE), p = HostArray::Empty(QDM_TYPE_DOUBLE),
                f = HostArray::Empty(QDM_TYPE_DOUBLE);
      o.status = qdm.QdmCxPCARPowerSpectrumH(x, 10, 700, 2, 1.0, a, p, f, &f0, &df, spectrum,
                                             &extra);
      Add(o, a.Reals());
      Add(o, p.Reals());
      Add(o, f.Reals());
      break;
    }
    default: {
      HostArray x = HostArray::Real(RealSignal(90));
      HostArray a = HostArray::Empty(QDM_TYPE_DOUBLE), r = HostArray::Empty(QDM_TYPE_COMPLEX);
      o.status = qdm.QdmReCovarianceH(x, 7, a, r, &extra);
      Add(o, a.Reals());
      for (const std::complex<double>& z : r.Complexes()) {
        Add(o, z.real());
        Add(o, z.imag());
      }
      break;
    }
  }
  Add(o, spectrum.Reals());
  Add(o, f0);
  Add(o, df);
  Add(o, extra);
  return o;
}

struct Worker {
  const QdmApi* qdm;
  HANDLE start;  // manual-reset event: all workers begin together
  int index;
  std::vector<Outcome> outcomes;
};

DWORD WINAPI WorkerMain(LPVOID argument) {
  Worker& w = *static_cast<Worker*>(argument);
  WaitForSingleObject(w.start, INFINITE);
  for (int round = 0; round < 3; ++round)
    for (int i = 0; i < kKinds; ++i) w.outcomes.push_back(CallKind(*w.qdm, (i + w.index) % kKinds));
  return 0;
}

// Runs kThreads Windows threads over every call kind and checks each result
// against `alone`.
void RunConcurrently(const QdmApi& qdm, const std::vector<Outcome>& alone) {
  HANDLE start = CreateEventA(nullptr, TRUE, FALSE, nullptr);
  ASSERT_NE(start, nullptr);
  std::vector<Worker> workers(kThreads);
  std::vector<HANDLE> threads;
  for (int t = 0; t < kThreads; ++t) {
    workers[static_cast<size_t>(t)] = Worker{&qdm, start, t, {}};
    HANDLE h = CreateThread(nullptr, 0, WorkerMain, &workers[static_cast<size_t>(t)], 0, nullptr);
    ASSERT_NE(h, nullptr);
    threads.push_back(h);
  }
  SetEvent(start);
  EXPECT_EQ(WaitForMultipleObjects(static_cast<DWORD>(threads.size()), threads.data(), TRUE,
                                   INFINITE),
            WAIT_OBJECT_0);
  for (HANDLE h : threads) CloseHandle(h);
  CloseHandle(start);
  for (const Worker& w : workers) {
    ASSERT_EQ(w.outcomes.size(), static_cast<size_t>(3 * kKinds));
    for (size_t k = 0; k < w.outcomes.size(); ++k) {
      const int kind = (static_cast<int>(k % kKinds) + w.index) % kKinds;
      EXPECT_EQ(w.outcomes[k], alone[static_cast<size_t>(kind)])
          << "call kind " << kind << ", thread " << w.index << ", call " << k;
    }
  }
}

std::vector<Outcome> CallsAlone(const QdmApi& qdm) {
  std::vector<Outcome> alone;
  for (int kind = 0; kind < kKinds; ++kind) alone.push_back(CallKind(qdm, kind));
  return alone;
}

TEST(WindowsThreads, ConcurrentCallsMatchCallsMadeAlone) {
  const QdmApi qdm = qdmtest::LoadQdm(QDM_LIBRARY_PATH);
  const std::vector<Outcome> alone = CallsAlone(qdm);
  for (const Outcome& o : alone) EXPECT_EQ(o.status, 0);
  RunConcurrently(qdm, alone);
  EXPECT_TRUE(FreeLibrary(static_cast<HMODULE>(qdm.module)));
}

TEST(WindowsThreads, ReloadedLibraryServesConcurrentCallersAgain) {
  std::vector<Outcome> first;
  for (int cycle = 0; cycle < 3; ++cycle) {
    const QdmApi qdm = qdmtest::LoadQdm(QDM_LIBRARY_PATH);
    // The first calls after each load go through a fresh attach: new mutex,
    // unresolved host function, empty plan list.
    RunConcurrently(qdm, cycle == 0 ? (first = CallsAlone(qdm)) : first);
    ASSERT_TRUE(FreeLibrary(static_cast<HMODULE>(qdm.module)));
    EXPECT_EQ(GetModuleHandleA("qdm.dll"), nullptr) << "the DLL stayed loaded, cycle " << cycle;
  }
}

}  // namespace
