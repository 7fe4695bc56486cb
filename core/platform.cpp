#include "core/platform.h"

#include <cstdlib>

#if defined(_WIN32)
#include <windows.h>
#else
#include <dlfcn.h>
#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#endif

namespace platform {

#if defined(_WIN32)
// ============================== Windows ==============================

const char* const kRuntimeModuleNames[2] = {"gfrt.dll", "gfffrt.dll"};

Module MainExecutable() { return reinterpret_cast<Module>(GetModuleHandleA(nullptr)); }

Module LoadedModule(const char* name) { return reinterpret_cast<Module>(GetModuleHandleA(name)); }

void* Symbol(Module module, const char* name) {
  if (module == nullptr) return nullptr;
  return reinterpret_cast<void*>(GetProcAddress(static_cast<HMODULE>(module), name));
}

void Fatal(const char* text) {
  // MB_TASKMODAL | MB_ICONERROR | MB_OK
  MessageBoxA(nullptr, text, "Fatal Error", 0x2010);
  ExitProcess(1);
}

namespace {
HANDLE g_plan_mutex = nullptr;
}

StatusCode PlanMutexCreate() {
  g_plan_mutex = CreateMutexA(nullptr, FALSE, nullptr);
  return g_plan_mutex == nullptr ? status::kIllegalArgument : status::kOk;
}

void PlanMutexClose() {
  if (g_plan_mutex != nullptr) CloseHandle(g_plan_mutex);
  g_plan_mutex = nullptr;
}

void PlanMutexLock() { WaitForSingleObject(g_plan_mutex, INFINITE); }
void PlanMutexUnlock() { ReleaseMutex(g_plan_mutex); }

int Processors() {
  SYSTEM_INFO info;
  GetSystemInfo(&info);
  const DWORD count = info.dwNumberOfProcessors;
  return count < 1 ? 1 : count > DWORD{kMaxThreads} ? kMaxThreads : static_cast<int>(count);
}

namespace {
struct ThreadStart {
  void (*body)(void*);
  void* context;
};

DWORD WINAPI ThreadMain(LPVOID start) {
  const auto* s = static_cast<const ThreadStart*>(start);
  s->body(s->context);
  return 0;
}
}  // namespace

int RunOnThreads(int threads, void (*body)(void*), void* context) {
  ThreadStart start{body, context};
  HANDLE handles[kMaxThreads];
  int started = 0;
  for (int t = 1; t < threads && started < kMaxThreads; ++t) {
    HANDLE h = CreateThread(nullptr, 0, ThreadMain, &start, 0, nullptr);
    if (h == nullptr) break;
    handles[started++] = h;
  }
  body(context);
  for (int t = 0; t < started; ++t) {
    WaitForSingleObject(handles[t], INFINITE);
    CloseHandle(handles[t]);
  }
  return started + 1;
}

#else
// =============================== POSIX ===============================
// The Windows calls map onto the dynamic loader: a module is a dlopen handle,
// the main executable is dlopen(NULL), and run-time modules are only probed
// with RTLD_NOLOAD, so nothing is ever loaded.

const char* const kRuntimeModuleNames[2] = {"libgfrt.so", "libgfffrt.so"};

Module MainExecutable() { return dlopen(nullptr, RTLD_LAZY); }

Module LoadedModule(const char* name) { return dlopen(name, RTLD_LAZY | RTLD_NOLOAD); }

void* Symbol(Module module, const char* name) {
  if (module == nullptr) return nullptr;
  return dlsym(module, name);
}

void Fatal(const char* text) {
  std::fprintf(stderr, "Fatal Error: %s\n", text);
  std::fflush(stderr);
  std::exit(1);
}

namespace {
pthread_mutex_t g_plan_mutex;
}

StatusCode PlanMutexCreate() {
  return pthread_mutex_init(&g_plan_mutex, nullptr) == 0 ? status::kOk : status::kIllegalArgument;
}

void PlanMutexClose() { pthread_mutex_destroy(&g_plan_mutex); }
void PlanMutexLock() { pthread_mutex_lock(&g_plan_mutex); }
void PlanMutexUnlock() { pthread_mutex_unlock(&g_plan_mutex); }

int Processors() {
  const long online = sysconf(_SC_NPROCESSORS_ONLN);
  return online > 0 ? static_cast<int>(std::min<long>(online, kMaxThreads)) : 1;
}

namespace {
struct ThreadStart {
  void (*body)(void*);
  void* context;
};

void* ThreadMain(void* start) {
  const auto* s = static_cast<const ThreadStart*>(start);
  s->body(s->context);
  return nullptr;
}
}  // namespace

int RunOnThreads(int threads, void (*body)(void*), void* context) {
  ThreadStart start{body, context};
  pthread_t handles[kMaxThreads];
  int started = 0;
  for (int t = 1; t < threads && started < kMaxThreads; ++t) {
    if (pthread_create(&handles[started], nullptr, ThreadMain, &start) != 0) break;
    ++started;
  }
  body(context);
  for (int t = 0; t < started; ++t) pthread_join(handles[t], nullptr);
  return started + 1;
}

#endif

}  // namespace platform

// ------------------------- library attach / detach -------------------------
// The plan-list mutex lives exactly as long as the library is attached to the
// process; the exit handler registered at attach closes it.
namespace {
StatusCode g_attach_status = status::kOk;

void CloseAtExit() { platform::PlanMutexClose(); }

void Attach() {
  g_attach_status = platform::PlanMutexCreate();  // a failure does not fail the attach
  std::atexit(CloseAtExit);
}
}  // namespace

#if defined(_WIN32)
extern "C" BOOL WINAPI DllMain(HINSTANCE, DWORD reason, LPVOID) {
  if (reason == DLL_PROCESS_ATTACH) Attach();
  return TRUE;
}

// Linked into a program rather than a DLL (the unit tests), the code gets no
// DllMain call: there the program's start-up attaches it instead.
__attribute__((constructor)) static void QdmAttachInProgram() {
  HMODULE self = nullptr;
  if (GetModuleHandleExA(
          GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS | GET_MODULE_HANDLE_EX_FLAG_UNCHANGED_REFCOUNT,
          reinterpret_cast<LPCSTR>(&QdmAttachInProgram), &self) &&
      self == GetModuleHandleA(nullptr))
    Attach();
}
#else
__attribute__((constructor)) static void QdmAttach() { Attach(); }
#endif
