// The DLL under Windows threads, as a host creates them (CreateThread), and
// across unload and reload: the plan-list mutex is created when the DLL is
// attached and closed when it is detached, so a reloaded DLL must serve
// concurrent callers again. Every concurrent result must equal, bit for bit,
// the same call made alone. Each load is the test's own, so that FreeLibrary
// really unloads the DLL.
#include <gtest/gtest.h>
#include <windows.h>

#include <vector>

#include "support/export_table.h"

namespace {

using namespace qdmtest;

constexpr int kThreads = 6;

struct MixedCall {
  const Export* x;
  Scalars s;
};

// Every export with every argument set of its family: FFT lengths 2 to 4096.
std::vector<MixedCall> Mix() {
  std::vector<MixedCall> mix;
  for (const Export& x : Exports())
    for (const Scalars& s : ArgumentSets(x.family)) mix.push_back({&x, s});
  return mix;
}

std::vector<uint64_t> CallOnce(const QdmApi& qdm, const MixedCall& m) {
  Call c = MakeCall(*m.x, m.s);
  std::vector<uint64_t> bits = {static_cast<uint64_t>(m.x->invoke(qdm, c, m.s))};
  for (uint64_t b : Leftovers(*m.x, c, m.s)) bits.push_back(b);
  return bits;
}

struct Worker {
  const QdmApi* qdm;
  const std::vector<MixedCall>* mix;
  HANDLE start;  // manual-reset event: all workers begin together
  int index;
  std::vector<std::vector<uint64_t>> outcomes;
};

DWORD WINAPI WorkerMain(LPVOID argument) {
  Worker& w = *static_cast<Worker*>(argument);
  WaitForSingleObject(w.start, INFINITE);
  for (size_t i = 0; i < w.mix->size(); ++i)
    w.outcomes.push_back(CallOnce(*w.qdm, (*w.mix)[(i + w.index) % w.mix->size()]));
  return 0;
}

// kThreads Windows threads over the whole mix, each from its own starting call.
void RunConcurrently(const QdmApi& qdm) {
  const std::vector<MixedCall> mix = Mix();
  HANDLE start = CreateEventA(nullptr, TRUE, FALSE, nullptr);
  ASSERT_NE(start, nullptr);
  std::vector<Worker> workers(kThreads);
  std::vector<HANDLE> threads;
  for (int t = 0; t < kThreads; ++t) {
    workers[t] = Worker{&qdm, &mix, start, t, {}};
    HANDLE h = CreateThread(nullptr, 0, WorkerMain, &workers[t], 0, nullptr);
    ASSERT_NE(h, nullptr);
    threads.push_back(h);
  }
  SetEvent(start);
  EXPECT_EQ(
      WaitForMultipleObjects(static_cast<DWORD>(threads.size()), threads.data(), TRUE, INFINITE),
      WAIT_OBJECT_0);
  for (HANDLE h : threads) CloseHandle(h);
  CloseHandle(start);
  for (const Worker& w : workers) {
    ASSERT_EQ(w.outcomes.size(), mix.size());
    for (size_t i = 0; i < mix.size(); ++i) {
      const MixedCall& m = mix[(i + w.index) % mix.size()];
      EXPECT_EQ(w.outcomes[i], CallOnce(qdm, m))
          << m.x->name << " n=" << m.s.n << " thread " << w.index;
    }
  }
}

TEST(WindowsThreads, ReloadedLibraryServesConcurrentCallersAgain) {
  for (int cycle = 0; cycle < 3; ++cycle) {
    // The first calls after each load go through a fresh attach: new mutex,
    // unresolved host function, empty plan list.
    const QdmApi qdm = LoadQdm(QDM_LIBRARY_PATH);
    RunConcurrently(qdm);
    ASSERT_TRUE(FreeLibrary(static_cast<HMODULE>(qdm.module)));
    EXPECT_EQ(GetModuleHandleA("qdm.dll"), nullptr) << "the DLL stayed loaded, cycle " << cycle;
  }
}

}  // namespace
