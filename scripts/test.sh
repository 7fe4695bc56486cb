#!/usr/bin/env bash
# Builds and runs every test suite: the plain -O3 build (on OpenBLAS, the
# default), the same build once more against the reference BLAS and LAPACK (a
# library path switch, no rebuild), then the AddressSanitizer +
# UndefinedBehaviorSanitizer build, then the Windows DLL under wine
# (scripts/windows.sh). Installs what is missing on a fresh Debian
# 12 machine (run as root). The last lines printed are ctest's own summary; the
# exit status is non-zero if any suite failed. The Python package (python/) is
# tested in both builds as ctest tests: python.pytest, and python.install (pip,
# offline, into a virtual environment).
set -uo pipefail
cd "$(dirname "$0")/.."
scripts/deps.sh cmake make g++ python3 liblapack-dev libblas-dev liblapacke-dev \
  libopenblas0-serial libgtest-dev libgmock-dev libfftw3-dev libbenchmark-dev \
  python3-numpy python3-pytest python3-matplotlib python3-venv python3-pip \
  pkg-config doxygen dpkg-dev libcli11-dev nlohmann-json3-dev gnuplot-nox || exit 1

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
suite sanitize -DCMAKE_BUILD_TYPE=RelWithDebInfo -DQDM_SANITIZE=ON || failed=1
if [ $failed -eq 0 ]; then
  export ASAN_OPTIONS=detect_leaks=1:abort_on_error=0 UBSAN_OPTIONS=print_stacktrace=1
  run sanitize || failed=1
fi
# The Windows DLL, cross-built with mingw-w64 and tested under wine
# (QDM_WINDOWS=0 skips it).
if [ "${QDM_WINDOWS:-1}" != 0 ]; then
  scripts/windows.sh || failed=1
fi
exit $failed
