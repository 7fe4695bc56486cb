"""A minimal PEP 517 backend (standard library only) for the qdm package.

The wheel holds the qdm package (its modules and the py.typed marker that
tells type checkers its hints are complete) and the libqdm_api it will load,
found at build time in this order:
1. $QDM_LIBRARY, a path to libqdm_api.so.1: copied into the wheel;
2. the repository's fresh build, ../build/release/libqdm_api.so.1: copied;
3. an installed library, by pkg-config (`qdm`) or the loader's cache: its
   path is recorded and loaded from there.
With none of them the build stops with a message that says how to get one:
a wheel that cannot load its library would install cleanly and fail only at
`import qdm`.
"""
import base64
import hashlib
import os
import shutil
import subprocess
import sysconfig
import zipfile

SONAME = "libqdm_api.so.1"
HERE = os.path.dirname(os.path.abspath(__file__))


def _version():
    """The version is stated once, in the project() line of the repository's
    CMakeLists.txt; an sdist carries it in its PKG-INFO."""
    import re
    for path, pattern in ((os.path.join(HERE, "..", "CMakeLists.txt"),
                           r"project\(qdm VERSION ([0-9.]+)"),
                          (os.path.join(HERE, "PKG-INFO"), r"(?m)^Version: (\S+)")):
        try:
            with open(path) as f:
                m = re.search(pattern, f.read())
            if m:
                return m.group(1)
        except OSError:
            pass
    raise RuntimeError("qdm's version: no ../CMakeLists.txt or PKG-INFO beside qdm_build.py")


NAME, VERSION = "qdm", _version()

METADATA = f"""Metadata-Version: 2.1
Name: {NAME}
Version: {VERSION}
Summary: Parametric time-series estimators (covariance and principal-component AR, Prony, matrix pencil, MDL, AR spectra) on numpy arrays
Requires-Python: >=3.8
Requires-Dist: numpy>=1.21
"""


def _installed_library():
    try:
        libdir = subprocess.run(["pkg-config", "--variable=libdir", "qdm"], capture_output=True,
                                text=True, check=True).stdout.strip()
        if os.path.exists(os.path.join(libdir, SONAME)):
            return os.path.normpath(os.path.join(libdir, SONAME))
    except (OSError, subprocess.CalledProcessError):
        pass
    for d in ("/usr/local/lib", "/usr/lib", "/usr/lib/x86_64-linux-gnu"):
        if os.path.exists(os.path.join(d, SONAME)):
            return os.path.join(d, SONAME)
    return None


def _find_library():
    """(path to bundle, path to record): at most one of them set."""
    env = os.environ.get("QDM_LIBRARY")
    if env:
        if not os.path.exists(env):
            raise RuntimeError(f"QDM_LIBRARY={env}: no such file")
        return env, None
    fresh = os.path.join(HERE, "..", "build", "release", SONAME)
    if os.path.exists(fresh):
        return os.path.realpath(fresh), None
    return None, _installed_library()


def _tag():
    return "py3-none-" + sysconfig.get_platform().replace("-", "_").replace(".", "_")


def _record_line(arcname, data):
    digest = base64.urlsafe_b64encode(hashlib.sha256(data).digest()).rstrip(b"=").decode()
    return f"{arcname},sha256={digest},{len(data)}"


def get_requires_for_build_wheel(config_settings=None):
    return []


NO_LIBRARY = f"""qdm: no {SONAME} to build the wheel with. Either
  build it in this repository first:
    cmake -S . -B build/release -DCMAKE_BUILD_TYPE=Release && cmake --build build/release --target qdm_api
  or install qdm (cmake --install build/release, or the Debian package) so that
  `pkg-config qdm` finds it, or name the library: QDM_LIBRARY=/path/to/{SONAME}"""


def build_wheel(wheel_directory, config_settings=None, metadata_directory=None):
    bundle, record = _find_library()
    if bundle is None and record is None:
        raise RuntimeError(NO_LIBRARY)
    files = {}
    pkg = os.path.join(HERE, "qdm")
    for name in sorted(os.listdir(pkg)):
        if (name.endswith(".py") or name == "py.typed") and name != "_where.py":
            with open(os.path.join(pkg, name), "rb") as f:
                files[f"qdm/{name}"] = f.read()
    files["qdm/_where.py"] = f"LIBRARY = {record!r}\n".encode()
    if bundle:
        with open(bundle, "rb") as f:
            files[f"qdm/{SONAME}"] = f.read()
    dist = f"{NAME}-{VERSION}.dist-info"
    files[f"{dist}/METADATA"] = METADATA.encode()
    files[f"{dist}/WHEEL"] = (f"Wheel-Version: 1.0\nGenerator: qdm_build\nRoot-Is-Purelib: false\n"
                              f"Tag: {_tag()}\n").encode()
    files[f"{dist}/top_level.txt"] = b"qdm\n"
    lines = [_record_line(k, v) for k, v in files.items()] + [f"{dist}/RECORD,,"]
    files[f"{dist}/RECORD"] = ("\n".join(lines) + "\n").encode()
    wheel = f"{NAME}-{VERSION}-{_tag()}.whl"
    with zipfile.ZipFile(os.path.join(wheel_directory, wheel), "w", zipfile.ZIP_DEFLATED) as z:
        for arcname, data in files.items():
            info = zipfile.ZipInfo(arcname, date_time=(2020, 1, 1, 0, 0, 0))
            info.external_attr = (0o755 if arcname.endswith(SONAME) else 0o644) << 16
            info.compress_type = zipfile.ZIP_DEFLATED
            z.writestr(info, data)
    return wheel


def build_sdist(sdist_directory, config_settings=None):
    import tarfile
    base = f"{NAME}-{VERSION}"
    path = os.path.join(sdist_directory, base + ".tar.gz")
    with tarfile.open(path, "w:gz") as t:
        for rel in ("pyproject.toml", "qdm_build.py", "qdm"):
            t.add(os.path.join(HERE, rel), arcname=f"{base}/{rel}",
                  filter=lambda i: None if "__pycache__" in i.name or i.name.endswith(
                      ("_where.py", ".so.1")) else i)
        info = tarfile.TarInfo(f"{base}/PKG-INFO")
        data = METADATA.encode()
        info.size = len(data)
        import io
        t.addfile(info, io.BytesIO(data))
    return os.path.basename(path)
