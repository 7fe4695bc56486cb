#!/usr/bin/env bash
# Builds and runs every test suite: the plain -O3 build (on OpenBLAS, the
# default), the same build once more against the reference BLAS and LAPACK (a
# library path switch, no rebuild); the concurrency tests under
# ThreadSanitizer; the fuzzer (clang, libFuzzer) replaying its corpus and
# regressions and then fuzzing for a minute; the AddressSanitizer +
# UndefinedBehaviorSanitizer build; then the Windows DLL under wine
# (scripts/windows.sh). Installs what is missing on a fresh Debian
# 12 machine (run as root). The last lines printed are ctest's own summary; the
# exit status is non-zero if any suite failed. The Python package (python/) is
# tested in both builds as ctest tests: python.pytest, and python.install (pip,
# offline, into a virtual environment).
set -uo pipefail
cd "$(dirname "$0")/.."
scripts/deps.sh cmake make g++ python3 liblapack-dev libblas-dev liblapacke-dev \
  libopenblas0-pthread libgtest-dev libgmock-dev libfftw3-dev libbenchmark-dev \
  python3-numpy python3-pytest python3-matplotlib python3-venv python3-pip \
  pkg-config doxygen dpkg-dev libcli11-dev nlohmann-json3-dev gnuplot-nox \
  clang-14 libclang-rt-14-dev || exit 1

jobs=$(nproc)
failed=0
suite() {  # name, cmake options...
  local dir=build/$1; shift
  cmake -S . -B "$dir" -DQDM_BUILD_BENCH=ON "$@" >/dev/null || return 1
  cmake --build "$dir" -j"$jobs" >/dev/null || { cmake --build "$dir" -j1 2>&1 | tail -40; return 1; }
}
run() {  # name
  ctest --test-dir "build/$1" -j"$jobs" --output-on-failure --schedule-random --timeout 600
}

suite release -DCMAKE_BUILD_TYPE=Release || failed=1
# The install test also builds the Debian package and installs it with apt-get
# (then removes it): CI runs as root on a machine of its own.
[ $failed -eq 0 ] && { QDM_TEST_DEB=1 run release | tail -n 25 || failed=1; }
# The same binaries on the reference BLAS and LAPACK: LD_LIBRARY_PATH is
# searched before the library's RUNPATH.
reference=/usr/lib/x86_64-linux-gnu/blas:/usr/lib/x86_64-linux-gnu/lapack
[ $failed -eq 0 ] && { LD_LIBRARY_PATH=$reference run release | tail -n 25 || failed=1; }
# ThreadSanitizer: only the end-to-end concurrency test is built and run. (A
# unit test linking the kernels statically cannot run under it: their
# target_clones resolvers run before the sanitizer's run-time is set up.)
tsan() {
  cmake -S . -B build/tsan -DCMAKE_BUILD_TYPE=RelWithDebInfo -DQDM_TSAN=ON \
    -DQDM_BUILD_EXAMPLE=OFF >/dev/null || return 1
  cmake --build build/tsan -j"$jobs" --target e2e_concurrency >/dev/null || return 1
  TSAN_OPTIONS="halt_on_error=1 suppressions=$PWD/tests/tsan.supp" ctest --test-dir build/tsan -R '^e2e\.Concurrency' \
    --output-on-failure --timeout 900 | tail -n 3
}
# The fuzzer: every corpus and regression input once, then a minute of fuzzing
# from the seed corpus (new inputs go to build/fuzz/corpus, never into the tree).
fuzz() {
  cmake -S . -B build/fuzz -DCMAKE_C_COMPILER=clang-14 -DCMAKE_CXX_COMPILER=clang++-14 \
    -DCMAKE_BUILD_TYPE=RelWithDebInfo -DQDM_FUZZ=ON -DQDM_BUILD_EXAMPLE=OFF >/dev/null || return 1
  cmake --build build/fuzz -j"$jobs" --target fuzz_exports >/dev/null || return 1
  # On the reference BLAS, as the sanitizer suite below: see there.
  LD_LIBRARY_PATH=$reference ctest --test-dir build/fuzz -R '^fuzz\.' --output-on-failure | tail -n 3 || return 1
  mkdir -p build/fuzz/corpus
  LD_LIBRARY_PATH=$reference build/fuzz/tests/fuzz_exports -max_total_time=60 -timeout=30 -rss_limit_mb=3072 \
    -print_final_stats=1 -artifact_prefix=build/fuzz/ build/fuzz/corpus tests/fuzz/corpus \
    >build/fuzz/fuzz.log 2>&1 || { tail -n 60 build/fuzz/fuzz.log; return 1; }
  grep -E '^stat::number_of_executed_units' build/fuzz/fuzz.log
}
[ $failed -eq 0 ] && { tsan || failed=1; }
[ $failed -eq 0 ] && { fuzz || failed=1; }
suite sanitize -DCMAKE_BUILD_TYPE=RelWithDebInfo -DQDM_SANITIZE=ON || failed=1
if [ $failed -eq 0 ]; then
  export ASAN_OPTIONS=detect_leaks=1:abort_on_error=0 UBSAN_OPTIONS=print_stacktrace=1
  # On the reference BLAS and LAPACK. OpenBLAS's AVX-512 complex gemv reads
  # past the end of its own buffers, and under AddressSanitizer's allocator
  # layout that read can fault inside OpenBLAS; the sanitizers are here for
  # the library's own code, which the release suite runs on OpenBLAS.
  LD_LIBRARY_PATH=$reference run sanitize || failed=1
fi
# The Windows DLL, cross-built with mingw-w64 and tested under wine
# (QDM_WINDOWS=0 skips it).
if [ "${QDM_WINDOWS:-1}" != 0 ]; then
  scripts/windows.sh || failed=1
fi
exit $failed
