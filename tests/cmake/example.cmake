# Tests of the example host program (qdm_example), the demonstration of the
# host protocol: bad input must end in a non-zero exit and exactly one line on
# stderr naming what is wrong, never a crash; a good run must print valid JSON.
#
# The file serves twice: included by tests/CMakeLists.txt it defines the
# tests; run with `cmake -P` it is the checker each test runs.

if(CMAKE_SCRIPT_MODE_FILE)
  # ---- checker: EXE, ARGS and EMULATOR ('|'-separated), MODE (fail | json), EXPECT
  string(REPLACE "|" ";" args "${ARGS}")
  string(REPLACE "|" ";" emulator "${EMULATOR}")
  execute_process(COMMAND ${emulator} ${EXE} ${args} RESULT_VARIABLE rc OUTPUT_VARIABLE out
                  ERROR_VARIABLE err)
  string(REGEX REPLACE "\n$" "" line "${err}")
  if(NOT rc MATCHES "^[0-9]+$")
    message(FATAL_ERROR "qdm_example did not exit normally: ${rc}\n${err}")
  elseif(MODE STREQUAL "fail")
    # A non-zero exit and exactly one stderr line, prefixed and matching EXPECT.
    if(rc EQUAL 0 OR line MATCHES "\n" OR NOT line MATCHES "^qdm_example: .*${EXPECT}")
      message(FATAL_ERROR "exit ${rc}; expected one stderr line matching '${EXPECT}', got:\n${err}")
    endif()
    message(STATUS "exit ${rc}: ${line}")
    return()
  endif()
  # json: exit 0, no stderr, status 0, and EXPECT's '|'-separated checks
  # "path.to.member=value", where a value #N is the length of an array.
  string(JSON status ERROR_VARIABLE jerr GET "${out}" status)
  if(NOT rc EQUAL 0 OR NOT err STREQUAL "" OR jerr OR NOT status EQUAL 0)
    message(FATAL_ERROR "exit ${rc}, status '${status}' ${jerr}\n${err}\n${out}")
  endif()
  string(REPLACE "|" ";" checks "${EXPECT}")
  foreach(check ${checks})
    string(REGEX MATCH "^([^=]+)=(#?)(.*)$" _ "${check}")
    string(REPLACE "." ";" path "${CMAKE_MATCH_1}")
    set(want "${CMAKE_MATCH_3}")
    if(CMAKE_MATCH_2)
      string(JSON got ERROR_VARIABLE jerr LENGTH "${out}" ${path})
    else()
      string(JSON got ERROR_VARIABLE jerr GET "${out}" ${path})
    endif()
    if(jerr OR NOT got STREQUAL want)
      message(FATAL_ERROR "${check}: got '${got}' ${jerr}")
    endif()
  endforeach()
  return()
endif()

# ---- test definitions -------------------------------------------------------------
if(NOT TARGET qdm_example)
  return()
endif()

set(_ex_data ${CMAKE_CURRENT_BINARY_DIR}/example_data)
file(MAKE_DIRECTORY ${_ex_data})
file(WRITE ${_ex_data}/nonnumeric.csv "1.0,2.0\n3.0,abc\n")
set(_ex_marple ${CMAKE_SOURCE_DIR}/tests/data/marple64.csv)
string(REPLACE ";" "|" _ex_emulator "${CMAKE_CROSSCOMPILING_EMULATOR}")

# qdm_example_fails(name regex args...): non-zero exit, one stderr line matching regex.
# qdm_example_json(name checks args...): exit 0, JSON with status 0 and the checks.
function(_qdm_example_test mode name expect)
  string(REPLACE ";" "|" joined "${ARGN}")
  add_test(NAME example.${name}
           COMMAND ${CMAKE_COMMAND} -DEXE=$<TARGET_FILE:qdm_example> "-DARGS=${joined}"
                   "-DEMULATOR=${_ex_emulator}" -DMODE=${mode} "-DEXPECT=${expect}"
                   -P ${CMAKE_CURRENT_LIST_FILE})
endfunction()
macro(qdm_example_fails)
  _qdm_example_test(fail ${ARGN})
endmacro()
macro(qdm_example_json)
  _qdm_example_test(json ${ARGN})
endmacro()

# Bad command lines and data files.
qdm_example_fails(no_method "no method given")
qdm_example_fails(unknown_method "unknown method 'fourier'" fourier)
qdm_example_fails(unknown_option "unknown option '--ordr'" covariance --ordr 4)
qdm_example_fails(missing_value "--order needs a value" covariance --order)
qdm_example_fails(non_integer_value "--order: 'twelve' is not a number" covariance --order twelve)
qdm_example_fails(missing_library "cannot load the library" covariance --library
                  ${_ex_data}/no_such_libqdm.so)
qdm_example_fails(missing_file "cannot open data file .*no_such_file.csv" covariance
                  ${_ex_data}/no_such_file.csv)
qdm_example_fails(non_numeric_field "nonnumeric.csv:2: 'abc' is not a number" covariance
                  ${_ex_data}/nonnumeric.csv)

# Statuses from the library, printed with their meaning.
qdm_example_fails(status_bad_order "covariance returned -42412: order" covariance ${_ex_marple}
                  --order 0)
qdm_example_fails(status_bad_rate "covspectrum returned -42418: sampling rate not positive"
                  covspectrum --rate 0)
qdm_example_fails(status_largest_order "covariance returned -42412: order" covariance
                  ${_ex_marple} --order 2147483647)

# Good runs: every output handle resized and filled by the library.
qdm_example_json(json_marple64_covariance
                 "method=covariance|signal.type=complex|signal.samples=64|parameters.order=4|results.coefficients=#10|results.poles=#8"
                 covariance ${_ex_marple} --order 4)
qdm_example_json(json_marple64_covspectrum
                 "signal.type=complex|results.spectrum_db=#128|results.df_hz=0.0078125"
                 covspectrum ${_ex_marple} --order 8 --points 100)
qdm_example_json(json_builtin_pcarspectrum
                 "signal.type=real|signal.samples=128|results.amplitude=#3|results.spectrum_db=#512"
                 pcarspectrum --real-signal)
