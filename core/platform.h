// Every call into the operating system lives behind this header: module
// lookup, the fatal message, process exit, the one process-wide mutex that
// guards the FFT plan list, and the threads of a batch. platform.cpp has a
// Windows and a POSIX branch.
#pragma once

#include "core/types.h"

namespace platform {

using Module = void*;

// The names of the host run-time modules, in lookup order.
extern const char* const kRuntimeModuleNames[2];

// The main executable of the process.
Module MainExecutable();
// A module already loaded into the process, or null; never loads anything.
Module LoadedModule(const char* name);
// Address of an exported symbol, or null.
void* Symbol(Module module, const char* name);
// Shows "Fatal Error" with `text` (message box / stderr) and ends the process
// with exit code 1.
[[noreturn]] void Fatal(const char* text);

// The plan-list mutex: created when the library is attached, closed when it is
// detached. Waits are unbounded.
StatusCode PlanMutexCreate();
void PlanMutexClose();
void PlanMutexLock();
void PlanMutexUnlock();

// The most threads one batch runs on.
constexpr int kMaxThreads = 256;

// Processors the process may run on (at least 1, at most kMaxThreads).
int Processors();

// Runs body(context) on `threads` threads at once, the calling thread one of
// them, and returns when every one has returned. A thread the system refuses
// is simply not started: the bodies share their work, so fewer threads finish
// it too. Returns the number of threads that ran the body.
int RunOnThreads(int threads, void (*body)(void*), void* context);

}  // namespace platform
