"""Loading libqdm_api and declaring its functions for ctypes."""
import ctypes
import ctypes.util
import os

try:  # written by the wheel builder: where the library was found at install
    from qdm._where import LIBRARY as _INSTALLED  # type: ignore[import]
except ImportError:
    _INSTALLED = None

_HERE = os.path.dirname(os.path.abspath(__file__))
SONAME = "libqdm_api.so.1"


def _candidates():
    """The libraries to try, first found wins: $QDM_LIBRARY, the copy bundled
    into the package, the one recorded at install, then the loader's own
    search (ldconfig's cache, the standard directories)."""
    if os.environ.get("QDM_LIBRARY"):
        yield os.environ["QDM_LIBRARY"]
        return
    bundled = os.path.join(_HERE, SONAME)
    if os.path.exists(bundled):
        yield bundled
    if _INSTALLED:
        yield _INSTALLED
    yield SONAME
    found = ctypes.util.find_library("qdm_api")
    if found:
        yield found


def _load():
    tried = []
    for path in _candidates():
        try:
            return ctypes.CDLL(path)
        except OSError as e:
            tried.append(f"{path}: {e}")
    raise ImportError("qdm: cannot load libqdm_api (set QDM_LIBRARY to its path, or build it "
                      "and reinstall the package):\n  " + "\n  ".join(tried))


lib = _load()

_P = ctypes.c_void_p
_I = ctypes.c_int32
_D = ctypes.c_double

# name: argument types after the leading (x, n) pair, for the real twin; the
# complex twin is the same without real_signal (marked R).
_SIGNATURES: dict = {
    "covariance": [_I, _P, _P, _P],
    "pcar": [_I, _I, _P, _P],
    "pcar_solver": [_I, _I, _I, _P, _P],
    "prony": [_I, _D, "R", _P, _P, _P, _P, _P],
    "matrix_pencil": [_I, _I, _D, "R", _P, _P, _P, _P, _P, _P],
    "matrix_pencil_solver": [_I, _I, _D, "R", _I, _P, _P, _P, _P, _P, _P],
    "mdl_order": [_I, _I, _P],
    "covariance_psd": [_I, _I, _D, _P, _P, _P, _P],
    "pcar_psd": [_I, _I, _I, _D, "R", _P, _P, _P, _P, _P, _P, _P, _P],
    "mode_errors": [_D, "R", _I, _P, _P, _P, _P, _P, _P, _P, _P, _P],
    # (coefficients, order) in place of (x, n); both twins take the one-sided flag
    "ar_psd": [_D, _I, _D, _I, _P, _P, _P, _P],
    # (pencil, min_order, max_order, fs, R, freq_tol, damping_tol, room, the five
    # columns, rows, mdl_order)
    "stabilization": [_I, _I, _I, _D, "R", _D, _D, ctypes.c_int64, _P, _P, _P, _P, _P, _P, _P],
}

functions = {}
for _name, _args in _SIGNATURES.items():
    for _kind in ("real", "complex"):
        _f = getattr(lib, f"qdm_{_name}_{_kind}")
        _f.restype = _I
        _f.argtypes = [_P, _I] + [_I if a == "R" else a for a in _args
                                  if not (a == "R" and _kind == "complex")]
        functions[_name, _kind] = _f

# Batch twins: (count, distance) after n, (status, threads) at the end; the
# pencil and PCAR batches take the *_solver functions' arguments, and the mode
# errors' count of modes becomes (room, per-record counts).
_L = ctypes.c_int64
_BATCHES = {"covariance": "covariance", "pcar": "pcar_solver", "prony": "prony",
            "matrix_pencil": "matrix_pencil_solver", "mdl_order": "mdl_order",
            "pcar_psd": "pcar_psd"}
for _name, _single in _BATCHES.items():
    for _kind in ("real", "complex"):
        _f = getattr(lib, f"qdm_{_name}_batch_{_kind}")
        _f.restype = _I
        _f.argtypes = [_P, _I, _L, _L] + [_I if a == "R" else a for a in _SIGNATURES[_single]
                                          if not (a == "R" and _kind == "complex")] + [_P, _I]
        functions[_name + "_batch", _kind] = _f
for _kind in ("real", "complex"):
    _f = getattr(lib, f"qdm_mode_errors_batch_{_kind}")
    _f.restype = _I
    _f.argtypes = ([_P, _I, _L, _L, _D] + ([_I] if _kind == "real" else [])
                   + [_I] + [_P] * 10 + [_P, _I])
    functions["mode_errors_batch", _kind] = _f

lib.qdm_status_text.restype = ctypes.c_char_p
lib.qdm_status_text.argtypes = [_I]
lib.qdm_spectrum_length.restype = _I
lib.qdm_spectrum_length.argtypes = [_I]
lib.qdm_output_room.restype = _I
lib.qdm_output_room.argtypes = [_I, _I]
lib.qdm_stabilization_rows.restype = ctypes.c_int64
lib.qdm_stabilization_rows.argtypes = [_I, _I]
lib.qdm_default_pencil.restype = _I
lib.qdm_default_pencil.argtypes = [_I]
lib.qdm_spectrum_layout.restype = _I
lib.qdm_spectrum_layout.argtypes = [_P, _P, _I, _D, _I, _P, _P]
lib.qdm_last_error_message.restype = _I
lib.qdm_last_error_message.argtypes = [ctypes.c_char_p, _I]
lib.qdm_default_mdl_upper.restype = _I
lib.qdm_default_mdl_upper.argtypes = [_I]
lib.qdm_version.restype = ctypes.c_char_p
lib.qdm_version.argtypes = []
