# Drift check of the committed FFT kernels: regenerate them into a temporary
# directory and compare file by file with fft/kernels/. The same file serves
# as the test registration (included from tests/CMakeLists.txt) and as the
# check itself (run with cmake -P).
if(CMAKE_SCRIPT_MODE_FILE)
  file(REMOVE_RECURSE "${TMP}")
  execute_process(COMMAND "${PYTHON}" "${SRC}/tools/gen_fft_kernels.py" --out "${TMP}"
                  RESULT_VARIABLE rc)
  if(NOT rc EQUAL 0)
    message(FATAL_ERROR "tools/gen_fft_kernels.py failed (${rc})")
  endif()
  file(GLOB fresh RELATIVE "${TMP}" "${TMP}/*")
  file(GLOB committed RELATIVE "${SRC}/fft/kernels" "${SRC}/fft/kernels/*")
  list(SORT fresh)
  list(SORT committed)
  if(NOT fresh STREQUAL committed)
    message(FATAL_ERROR "fft/kernels file set differs from the generator's:\n"
                        "  generated: ${fresh}\n  committed: ${committed}")
  endif()
  set(drifted "")
  foreach(f ${fresh})
    execute_process(COMMAND ${CMAKE_COMMAND} -E compare_files "${TMP}/${f}" "${SRC}/fft/kernels/${f}"
                    RESULT_VARIABLE differs)
    if(NOT differs EQUAL 0)
      list(APPEND drifted ${f})
    endif()
  endforeach()
  if(drifted)
    message(FATAL_ERROR "fft/kernels drifted from tools/gen_fft_kernels.py: ${drifted}\n"
                        "Regenerate with: python3 tools/gen_fft_kernels.py --out fft/kernels")
  endif()
  message(STATUS "fft/kernels match tools/gen_fft_kernels.py")
else()
  find_package(Python3 COMPONENTS Interpreter)
  if(Python3_Interpreter_FOUND)
    add_test(NAME fft.kernels_drift
             COMMAND ${CMAKE_COMMAND} -DPYTHON=${Python3_EXECUTABLE} -DSRC=${CMAKE_SOURCE_DIR}
                     -DTMP=${CMAKE_CURRENT_BINARY_DIR}/fft_kernels_drift
                     -P ${CMAKE_CURRENT_LIST_FILE})
  endif()
endif()
