"""The package documents itself: every docstring example runs and prints what
it shows, every public function documents each of its arguments and carries
type hints, and the wheel and the sdist ship the py.typed marker."""
import doctest
import importlib.util
import inspect
import os
import tarfile
import zipfile

import pytest

import qdm

FUNCTIONS = [qdm.covariance, qdm.pcar, qdm.prony, qdm.matrix_pencil, qdm.mdl_order,
             qdm.covariance_psd, qdm.pcar_psd, qdm.mode_errors, qdm.stabilization,
             qdm.status_text]
RESULTS = [qdm.CovarianceFit, qdm.PcarFit, qdm.PronyFit, qdm.PencilFit,
           qdm.CovarianceSpectrum, qdm.PcarSpectrum, qdm.ModeErrors, qdm.MdlOrder,
           qdm.Stabilization]
SECTIONS = ["Parameters", "Returns", "Raises", "Examples"]


def test_every_docstring_example_gives_the_output_it_shows():
    result = doctest.testmod(qdm, optionflags=doctest.NORMALIZE_WHITESPACE)
    assert result.failed == 0
    assert result.attempted >= 60  # the examples of every function and of the errors


def _section(doc, name):
    """The text of a numpydoc section: from its underlined title to the next one."""
    lines = inspect.cleandoc(doc).splitlines()
    start = next(i for i in range(len(lines) - 1)
                 if lines[i] == name and set(lines[i + 1]) == {"-"}) + 2
    end = next((i for i in range(start, len(lines) - 1)
                if lines[i] and set(lines[i + 1]) == {"-"} and len(lines[i + 1]) == len(lines[i])),
               len(lines))
    return lines[start:end]


@pytest.mark.parametrize("f", FUNCTIONS, ids=lambda f: f.__name__)
def test_every_function_documents_and_hints_each_argument(f):
    doc = f.__doc__ or ""
    assert doc.strip().splitlines()[0].endswith(".")  # a one-line summary
    for name in SECTIONS:
        assert _section(doc, name), f"{f.__name__}: no {name} section"
    documented = {line.split(" : ")[0] for line in _section(doc, "Parameters")
                  if " : " in line and not line.startswith(" ")}
    sig = inspect.signature(f)
    assert documented == set(sig.parameters), f.__name__
    assert sig.return_annotation is not inspect.Signature.empty
    assert all(p.annotation is not inspect.Parameter.empty for p in sig.parameters.values())


@pytest.mark.parametrize("cls", RESULTS, ids=lambda c: c.__name__)
def test_every_result_documents_each_field(cls):
    documented = {line.split(" : ")[0] for line in _section(cls.__doc__, "Attributes")
                  if " : " in line and not line.startswith(" ")}
    assert documented == set(cls._fields)


def _backend():
    path = os.path.join(os.path.dirname(__file__), "..", "qdm_build.py")
    found = importlib.util.spec_from_file_location("qdm_build", path)
    module = importlib.util.module_from_spec(found)
    found.loader.exec_module(module)
    return module


def test_the_wheel_and_the_sdist_carry_the_typing_marker(tmp_path, monkeypatch):
    stand_in = tmp_path / "libqdm_api.so.1"  # the library's bytes do not matter here
    stand_in.write_bytes(b"\x7fELF")
    monkeypatch.setenv("QDM_LIBRARY", str(stand_in))
    backend = _backend()
    with zipfile.ZipFile(tmp_path / backend.build_wheel(str(tmp_path))) as z:
        names = set(z.namelist())
        record = z.read(f"qdm-{backend.VERSION}.dist-info/RECORD").decode()
    assert {"qdm/py.typed", "qdm/__init__.py", "qdm/_lib.py"} <= names
    assert "\nqdm/py.typed,sha256=" in "\n" + record
    with tarfile.open(tmp_path / backend.build_sdist(str(tmp_path))) as t:
        names = set(t.getnames())
    assert f"qdm-{backend.VERSION}/qdm/py.typed" in names


def test_a_wheel_without_a_library_is_refused_with_the_way_to_get_one(tmp_path, monkeypatch):
    monkeypatch.delenv("QDM_LIBRARY", raising=False)
    backend = _backend()
    monkeypatch.setattr(backend, "HERE", str(tmp_path))  # no ../build/release beside it
    monkeypatch.setattr(backend, "_installed_library", lambda: None)
    with pytest.raises(RuntimeError) as refused:
        backend.build_wheel(str(tmp_path))
    assert "QDM_LIBRARY=" in str(refused.value) and "--target qdm_api" in str(refused.value)
    assert not list(tmp_path.glob("*.whl"))
