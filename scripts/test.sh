#!/usr/bin/env bash
# Builds and runs every test suite: the plain -O3 build (on the library's own
# copy of OpenBLAS, the default); the same build against the shared reference
# BLAS and LAPACK (a second tree, -DQDM_BLAS=reference); the concurrency tests
# under ThreadSanitizer; the fuzzer (clang, libFuzzer) replaying its corpus and
# regressions and then fuzzing for a minute; the AddressSanitizer +
# UndefinedBehaviorSanitizer build, on OpenBLAS; then the Windows DLL under
# wine (scripts/windows.sh). Installs what is missing on a fresh Debian 12
# machine (run as root). It checks the sources' layout (.clang-format) and runs
# clang-tidy's bug-finding checks (.clang-tidy) first.
# The last lines printed are ctest's own summary; the
# exit status is non-zero if any suite failed. The Python package (python/) is
# tested in both plain builds as ctest tests: python.pytest, and
# python.install (pip, offline, into a virtual environment).
set -uo pipefail
cd "$(dirname "$0")/.."
scripts/deps.sh cmake make g++ python3 liblapack-dev libblas-dev liblapacke-dev \
  libopenblas0-pthread libopenblas-pthread-dev libgtest-dev libgmock-dev libfftw3-dev libbenchmark-dev \
  python3-numpy python3-pytest python3-matplotlib python3-venv python3-pip \
  python3-dask python3-distributed python3-xarray \
  pkg-config doxygen dpkg-dev libcli11-dev nlohmann-json3-dev gnuplot-nox \
  clang-14 libclang-rt-14-dev clang-format-14 clang-tidy-14 valgrind || exit 1


jobs=$(nproc)
failed=0
# Formatting: every C and C++ source as .clang-format lays it out.
git ls-files '*.c' '*.cpp' '*.h' '*.h.in' | xargs clang-format-14 --dry-run --Werror ||
  { echo "format: run clang-format-14 -i on the files above"; failed=1; }
# ccache, where installed, shares compile results between the trees.
launcher=()
command -v ccache >/dev/null &&
  launcher=(-DCMAKE_C_COMPILER_LAUNCHER=ccache -DCMAKE_CXX_COMPILER_LAUNCHER=ccache)
# Every tree is built with warnings as errors (GCC, clang, mingw-w64 alike).
configure() {  # name, cmake options...
  local dir=build/$1; shift
  cmake -S . -B "$dir" -DQDM_BUILD_BENCH=ON -DQDM_WERROR=ON "${launcher[@]}" "$@" >/dev/null
}
suite() {  # name, cmake options...
  local dir=build/$1
  configure "$@" || return 1
  cmake --build "$dir" -j"$jobs" >/dev/null || { cmake --build "$dir" -j1 2>&1 | tail -40; return 1; }
}
release=(-DCMAKE_BUILD_TYPE=Release -DCMAKE_EXPORT_COMPILE_COMMANDS=ON)
# Static analysis: clang-tidy's bug-finding checks (.clang-tidy) over the
# library and the tool, with the release tree's compile commands (configured
# here, the generated kernels' header made); any finding fails the run.
tidy() {
  configure release "${release[@]}" || return 1
  cmake --build build/release --target qdm_generated_kernels >/dev/null || return 1
  git ls-files 'core/*.cpp' 'numeric/*.cpp' 'fft/*.cpp' 'estimation/*.cpp' 'host/*.cpp' \
    'api/*.cpp' 'cli/*.cpp' |
    xargs -P"$jobs" -n1 clang-tidy-14 -p build/release --quiet --warnings-as-errors='*' \
      2> >(grep -v ' warnings\? generated\.$' >&2)
}
tidy || { echo "tidy: the findings above (.clang-tidy lists the checks)"; failed=1; }
run() {  # name
  ctest --test-dir "build/$1" -j"$jobs" --output-on-failure --schedule-random --timeout 600
}

suite release "${release[@]}" || failed=1
# The install test also builds the Debian package and installs it with apt-get
# (then removes it): CI runs as root on a machine of its own.
[ $failed -eq 0 ] && { QDM_TEST_DEB=1 run release | tail -n 25 || failed=1; }
# The same suite on the reference BLAS and LAPACK: the release build carries
# its own OpenBLAS, so this is a second tree, linked to the shared reference
# libraries.
[ $failed -eq 0 ] && { suite reference -DCMAKE_BUILD_TYPE=Release -DQDM_BLAS=reference || failed=1; }
[ $failed -eq 0 ] && { run reference | tail -n 25 || failed=1; }
# ThreadSanitizer: only the end-to-end concurrency test is built and run. (A
# unit test linking the kernels statically cannot run under it: their
# target_clones resolvers run before the sanitizer's run-time is set up.) On
# the reference BLAS: the sanitizer sees nothing inside a BLAS, which is not
# instrumented, and the library's private OpenBLAS would have to be told apart
# from the library's own frames by function name.
tsan() {
  cmake -S . -B build/tsan -DCMAKE_BUILD_TYPE=RelWithDebInfo -DQDM_TSAN=ON -DQDM_BLAS=reference \
    -DQDM_BUILD_EXAMPLE=OFF -DQDM_WERROR=ON "${launcher[@]}" >/dev/null || return 1
  cmake --build build/tsan -j"$jobs" --target e2e_concurrency api_plain_threads api_plain_batch >/dev/null || return 1
  TSAN_OPTIONS="halt_on_error=1 suppressions=$PWD/tests/tsan.supp" ctest --test-dir build/tsan \
    -R '^(e2e\.Concurrency|api\.PlainThreads|api\.PlainBatch)' \
    --output-on-failure --timeout 900 | tail -n 3
}
# The fuzzer: every corpus and regression input once, then a minute of fuzzing
# from the seed corpus (new inputs go to build/fuzz/corpus, never into the tree).
fuzz() {
  cmake -S . -B build/fuzz -DCMAKE_C_COMPILER=clang-14 -DCMAKE_CXX_COMPILER=clang++-14 \
    -DCMAKE_BUILD_TYPE=RelWithDebInfo -DQDM_FUZZ=ON -DQDM_BLAS=reference \
    -DQDM_BUILD_EXAMPLE=OFF -DQDM_WERROR=ON >/dev/null || return 1
  cmake --build build/fuzz -j"$jobs" --target fuzz_exports >/dev/null || return 1
  # On the reference BLAS (QDM_BLAS=reference above), as it has always run,
  # so that its corpus and speed stay comparable.
  ctest --test-dir build/fuzz -R '^fuzz\.' --output-on-failure | tail -n 3 || return 1
  mkdir -p build/fuzz/corpus
  build/fuzz/tests/fuzz_exports -max_total_time=60 -timeout=30 -rss_limit_mb=3072 \
    -print_final_stats=1 -artifact_prefix=build/fuzz/ build/fuzz/corpus tests/fuzz/corpus \
    >build/fuzz/fuzz.log 2>&1 || { tail -n 60 build/fuzz/fuzz.log; return 1; }
  grep -E '^stat::number_of_executed_units' build/fuzz/fuzz.log
}
[ $failed -eq 0 ] && { tsan || failed=1; }
[ $failed -eq 0 ] && { fuzz || failed=1; }
suite sanitize -DCMAKE_BUILD_TYPE=RelWithDebInfo -DQDM_SANITIZE=ON || failed=1
if [ $failed -eq 0 ]; then
  # On the library's OpenBLAS, the default: work blocks are guarded against
  # the reads its kernels make outside their operands (numeric/work.cpp), so
  # whatever they read stays inside memory the library owns.
  ASAN_OPTIONS=detect_leaks=1:abort_on_error=0 UBSAN_OPTIONS=print_stacktrace=1 \
    run sanitize || failed=1
fi
# The Windows DLL, cross-built with mingw-w64 and tested under wine
# (QDM_WINDOWS=0 skips it).
if [ "${QDM_WINDOWS:-1}" != 0 ]; then
  scripts/windows.sh || failed=1
fi
exit $failed
