#!/usr/bin/env bash
# Builds qdm.dll, the emulated host run-time, the tests and the example host
# for 64-bit Windows with mingw-w64, and runs the tests under headless wine.
#
# Run as root on Debian 12, from anywhere. Installs what is missing with
# apt-get. The static LAPACK/CBLAS and GoogleTest builds are cached outside the
# repository, in $QDM_WIN_CACHE (default /var/cache/qdm-win), keyed by the
# versions of the packages they come from, so a warm run costs seconds.
# The last lines printed are ctest's summary; the exit status is non-zero if
# anything failed.
set -uo pipefail
cd "$(dirname "$0")/.."
root=$PWD
build=$root/build/windows
toolchain=$root/cmake/mingw-w64-x86_64.cmake
cache_root=${QDM_WIN_CACHE:-/var/cache/qdm-win}
jobs=$(nproc)
recipe=1  # raise when the dependency build below changes
t0=$SECONDS

say() { echo "== windows [$((SECONDS - t0))s]: $*"; }
die() { echo "== windows: FAILED: $*" >&2; exit 1; }
quiet() {  # runs a command, showing its output only when it fails
  local log
  log=$(mktemp)
  if ! "$@" >"$log" 2>&1; then tail -n 40 "$log"; rm -f "$log"; return 1; fi
  rm -f "$log"
}

# ---- 1. packages ----------------------------------------------------------------------
scripts/deps.sh cmake make g++ python3 liblapack-dev libblas-dev liblapacke-dev \
  g++-mingw-w64-x86-64 gfortran-mingw-w64-x86-64 wine64 googletest dpkg-dev xz-utils ||
  die "package installation"

# `apt-get source lapack` needs a deb-src entry: the binary sources, retyped.
lapack_version() {
  apt-cache showsrc --only-source lapack 2>/dev/null | sed -n 's/^Version: //p' | sort -V | tail -n 1
}
lapack_ver=$(lapack_version)
if [ -z "$lapack_ver" ]; then
  say "adding a deb-src entry"
  if [ -f /etc/apt/sources.list.d/debian.sources ]; then
    sed 's/^Types: deb$/Types: deb-src/' /etc/apt/sources.list.d/debian.sources \
      >/etc/apt/sources.list.d/qdm-deb-src.sources || die "deb-src entry"
  else  # one-line style
    sed -n 's/^deb /deb-src /p' /etc/apt/sources.list >/etc/apt/sources.list.d/qdm-deb-src.list ||
      die "deb-src entry"
  fi
  quiet apt-get update || die "apt-get update"
  lapack_ver=$(lapack_version)
  [ -n "$lapack_ver" ] || die "no lapack source package"
fi

pkgver() { dpkg-query -W -f='${Version}' "$1" 2>/dev/null; }
# g++ and gfortran come from one source package, with one version.
key="lapack-${lapack_ver}_gtest-$(pkgver googletest)_gcc-$(pkgver gcc-mingw-w64-x86-64-posix)"
key="${key}_crt-$(pkgver mingw-w64-x86-64-dev)_r${recipe}"
key=$(echo "$key" | tr -c 'A-Za-z0-9._\n-' '_')
deps=$cache_root/$key

# ---- 2. static LAPACK + CBLAS and GoogleTest, cached -----------------------------------
if [ ! -f "$deps/.complete" ]; then
  say "building LAPACK $lapack_ver and GoogleTest for Windows (cache: $deps)"
  work=$(mktemp -d /tmp/qdm-win-deps.XXXXXX)
  chmod 755 "$work"  # apt-get source drops privileges to _apt while downloading
  stage=$deps.partial
  rm -rf "$stage"
  (
    set -e
    cd "$work"
    quiet apt-get source -qq "lapack=$lapack_ver"
    src=$(find "$work" -maxdepth 1 -type d -name 'lapack-*' | head -n 1)
    quiet cmake -S "$src" -B lapack-build -DCMAKE_TOOLCHAIN_FILE="$toolchain" \
      -DCMAKE_BUILD_TYPE=Release -DCMAKE_INSTALL_PREFIX="$stage" -DBUILD_SHARED_LIBS=OFF \
      -DBUILD_TESTING=OFF -DTEST_FORTRAN_COMPILER=OFF -DBUILD_SINGLE=OFF -DBUILD_COMPLEX=OFF \
      -DBUILD_DOUBLE=ON -DBUILD_COMPLEX16=ON -DCBLAS=ON -DLAPACKE=OFF -DBUILD_DEPRECATED=OFF
    quiet cmake --build lapack-build -j"$jobs"
    quiet cmake --install lapack-build
    # lapack.h is installed with LAPACKE only; it stands complete in the build tree.
    cp lapack-build/include/lapack.h lapack-build/include/lapacke_mangling.h \
       "$src/LAPACKE/include/lapacke_config.h" "$stage/include/"
    say "LAPACK done"
    quiet cmake -S /usr/src/googletest -B gtest-build -DCMAKE_TOOLCHAIN_FILE="$toolchain" \
      -DCMAKE_BUILD_TYPE=Release -DCMAKE_INSTALL_PREFIX="$stage" -DBUILD_GMOCK=ON \
      -DBUILD_SHARED_LIBS=OFF
    quiet cmake --build gtest-build -j"$jobs"
    quiet cmake --install gtest-build
  ) || { rm -rf "$work" "$stage"; die "dependency build"; }
  touch "$stage/.complete"
  rm -rf "$deps" && mv "$stage" "$deps"
  rm -rf "$work"
  say "dependencies cached"
fi

# ---- 3. headless wine ---------------------------------------------------------------
# No DISPLAY: a message box then returns at once instead of waiting, invisible,
# for a click. A persistent wineserver keeps wine's helper processes from
# holding ctest's pipes open after each test.
wine=/usr/lib/wine/wine64
wineserver=/usr/lib/wine/wineserver
unset DISPLAY WAYLAND_DISPLAY
export WINEPREFIX=$build/wineprefix WINEDEBUG=-all WINEDLLOVERRIDES="mscoree,mshtml="
wine_env="env;-u;DISPLAY;WINEPREFIX=$WINEPREFIX;WINEDEBUG=-all;WINEDLLOVERRIDES=mscoree,mshtml="
emulator="$wine_env;timeout;--kill-after=10;${QDM_WIN_TIMEOUT:-600};$wine"
mkdir -p "$build"
if [ ! -f "$WINEPREFIX/system.reg" ]; then
  say "creating the wine prefix"
  rm -rf "$WINEPREFIX"
  timeout 300 "$wine" wineboot --init >/dev/null 2>&1
  timeout 120 "$wineserver" -w
  [ -f "$WINEPREFIX/system.reg" ] || die "wineboot"
fi
"$wineserver" -p
trap '"$wineserver" -k 2>/dev/null' EXIT
# Warm-up, with output going nowhere: the first program starts wine's
# services, the first one touching user32 its desktop process.
timeout 120 "$wine" cmd /c exit 0 >/dev/null 2>&1 || die "wine does not start"
timeout 120 "$wine" rundll32 user32.dll,MessageBeep >/dev/null 2>&1

# ---- 4. cross-build -------------------------------------------------------------------
# The Linux example host is the reference the Windows results are compared
# with; scripts/test.sh has built it already in build/release.
linux=$root/build/release
if [ ! -x "$linux/examples/qdm_example" ]; then
  say "building the Linux example host for the comparison (build/release)"
  quiet cmake -S "$root" -B "$linux" -DCMAKE_BUILD_TYPE=Release || die "Linux configure"
  quiet cmake --build "$linux" --target qdm_example -j"$jobs" || die "Linux example host"
fi
say "configuring and building (build/windows)"
quiet cmake -S "$root" -B "$build" -DCMAKE_TOOLCHAIN_FILE="$toolchain" -DQDM_WIN_DEPS="$deps" \
  -DCMAKE_BUILD_TYPE=Release -DQDM_WERROR=ON "-DCMAKE_CROSSCOMPILING_EMULATOR=$emulator" \
  -DQDM_LINUX_EXAMPLE="$linux/examples/qdm_example" || die "configure"
if ! cmake --build "$build" -j"$jobs" >/dev/null 2>&1; then
  cmake --build "$build" -j1 2>&1 | grep -v '^\[' | tail -n 40
  die "build"
fi

# ---- 5. tests under wine ----------------------------------------------------------------
say "running the tests under wine"
# The full log stays in build/windows/ctest.log; shown here are the failures
# with their output, and ctest's summary.
ctest --test-dir "$build" -j"$jobs" --output-on-failure --timeout 600 >"$build/ctest.log" 2>&1
rc=$?
say "tests finished (full log: build/windows/ctest.log)"
grep -v -E '^ *Start +[0-9]+:|Test +#[0-9]+: .* Passed' "$build/ctest.log"
# The README's command for the example host under wine, as written, from here.
say "the README's wine command"
/usr/bin/python3 tests/readme/readme_blocks.py run-for scripts/windows.sh README.md >"$build/readme.log" 2>&1 ||
  { cat "$build/readme.log"; rc=1; }
exit $rc
