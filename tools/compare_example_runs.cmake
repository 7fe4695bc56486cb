# Runs the example host of the Windows build (under EMULATOR) and that of the
# Linux build on the same arguments with --json, and compares the two outputs
# numerically with compare_json.py (a spectrum CSV named in ARGS with @OUT@
# is written once per side):
#   cmake -DEMULATOR=a|b|c -DWIN_EXE=... -DLINUX_EXE=... -DARGS=a|b -DOUT=<prefix>
#         -DPYTHON=python3 -DCOMPARE=compare_json.py -P compare_example_runs.cmake
string(REPLACE "|" ";" emulator "${EMULATOR}")
string(REPLACE "|" ";" args "${ARGS}")
foreach(side linux windows)
  string(REPLACE "@OUT@" "${OUT}.${side}" side_args "${args}")
  if(side STREQUAL "linux")
    set(command ${LINUX_EXE})
  else()
    set(command ${emulator} ${WIN_EXE})
  endif()
  execute_process(COMMAND ${command} ${side_args} --json
                  RESULT_VARIABLE rc OUTPUT_FILE ${OUT}.${side}.json ERROR_VARIABLE err)
  if(NOT rc EQUAL 0)
    message(FATAL_ERROR "${side} run failed (${rc}): ${err}")
  endif()
endforeach()
execute_process(COMMAND ${PYTHON} ${COMPARE} ${OUT}.linux.json ${OUT}.windows.json
                        --ignore csv png
                RESULT_VARIABLE rc OUTPUT_VARIABLE report ERROR_VARIABLE report)
message("${report}")
if(NOT rc EQUAL 0)
  message(FATAL_ERROR "the Windows and Linux builds disagree")
endif()
