# The Python package over libqdm_api: its pytest suite against the freshly
# built library, and an install with pip into a virtual environment, offline,
# that must then load the library it bundled with no LD_LIBRARY_PATH.
# The interpreter must have numpy and pytest (Debian's python3-numpy and
# python3-pytest); QDM_PYTHON names another one.
if(NOT TARGET qdm_api)
  return()
endif()
set(QDM_PYTHON "" CACHE FILEPATH "Python interpreter with numpy and pytest for the Python tests")
if(NOT QDM_PYTHON)
  foreach(candidate /usr/bin/python3 ${Python3_EXECUTABLE})
    execute_process(COMMAND ${candidate} -c "import numpy, pytest" RESULT_VARIABLE rc
                    OUTPUT_QUIET ERROR_QUIET)
    if(rc EQUAL 0)
      set(QDM_PYTHON ${candidate} CACHE FILEPATH "" FORCE)
      break()
    endif()
  endforeach()
endif()
if(NOT QDM_PYTHON)
  message(STATUS "No Python with numpy and pytest: the Python tests are left out")
  return()
endif()

set(_py_env QDM_LIBRARY=$<TARGET_FILE:qdm_api> PYTHONPATH=${CMAKE_SOURCE_DIR}/python
            PYTHONDONTWRITEBYTECODE=1)
if(QDM_SANITIZE)
  # The interpreter is not instrumented: the sanitizer run-time has to come first.
  execute_process(COMMAND ${CMAKE_CXX_COMPILER} -print-file-name=libasan.so
                  OUTPUT_VARIABLE _py_asan OUTPUT_STRIP_TRAILING_WHITESPACE)
  list(APPEND _py_env LD_PRELOAD=${_py_asan} ASAN_OPTIONS=detect_leaks=0)
endif()
add_test(NAME python.pytest
         COMMAND ${CMAKE_COMMAND} -E env ${_py_env}
                 ${QDM_PYTHON} -m pytest -q -p no:cacheprovider ${CMAKE_SOURCE_DIR}/python/tests)

if(NOT QDM_SANITIZE)
  set(_venv ${CMAKE_CURRENT_BINARY_DIR}/python_venv)
  add_test(NAME python.install
           COMMAND sh -c "rm -rf '${_venv}' && '${QDM_PYTHON}' -m venv --system-site-packages '${_venv}' \
&& QDM_LIBRARY='$<TARGET_FILE:qdm_api>' '${_venv}/bin/python' -m pip install -q --no-index \
--no-cache-dir '${CMAKE_SOURCE_DIR}/python' && cd '${_venv}' && env -u QDM_LIBRARY -u LD_LIBRARY_PATH \
'${_venv}/bin/python' -c \"import numpy as np, qdm, qdm._lib as L; \
assert L.lib._name.startswith('${_venv}'), L.lib._name; \
print(qdm.covariance(np.cos(0.4 * np.arange(32.0)) + 0.01 * np.arange(32.0), order=3).poles)\"")
  set_tests_properties(python.install PROPERTIES TIMEOUT 300)
endif()
