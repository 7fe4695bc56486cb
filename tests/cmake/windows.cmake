# Windows build only: the DLL's export table holds exactly the fifteen entry
# points, and it imports nothing but system DLLs.
if(WIN32)
  find_program(QDM_OBJDUMP NAMES x86_64-w64-mingw32-objdump objdump REQUIRED)
  set(QDM_EXPECTED_EXPORTS
      SetGFRTModule
      QdmReCovarianceH QdmCxCovarianceH QdmRePCARH QdmCxPCARH QdmRePronyH QdmCxPronyH
      QdmReMatrixPencilH QdmCxMatrixPencilH QdmReMinDescriptLenH QdmCxMinDescriptLenH
      QdmReCovPowerSpectrH QdmCxCovPowerSpectrH QdmRePCARPowerSpectrumH
      QdmCxPCARPowerSpectrumH)
  string(REPLACE ";" "\\;" exports_arg "${QDM_EXPECTED_EXPORTS}")
  add_test(NAME e2e.WindowsDll.ExactExportsSystemImports
           COMMAND ${CMAKE_COMMAND} -DOBJDUMP=${QDM_OBJDUMP} -DDLL=$<TARGET_FILE:qdm>
                   -DEXPORTS=${exports_arg} -P ${CMAKE_SOURCE_DIR}/tools/check_dll_tables.cmake)
endif()

# The Windows build computes what the Linux build computes, to rounding: the
# example host of each runs every method on the same signals and the JSON
# outputs are compared number by number (relative tolerance 1e-9). Needs the
# Linux example host, QDM_LINUX_EXAMPLE (scripts/windows.sh passes it).
set(QDM_LINUX_EXAMPLE "" CACHE FILEPATH "The Linux build's qdm_example, for cross-platform checks")
if(WIN32 AND TARGET qdm_example AND QDM_LINUX_EXAMPLE)
  find_program(QDM_PYTHON NAMES python3 REQUIRED)
  string(REPLACE ";" "|" _win_emulator "${CMAKE_CROSSCOMPILING_EMULATOR}")
  set(_win_out ${CMAKE_CURRENT_BINARY_DIR}/linux_vs_windows)
  file(MAKE_DIRECTORY ${_win_out})
  set(_win_marple ${CMAKE_SOURCE_DIR}/tests/data/marple64.csv)
  # name | arguments
  set(_win_cases
      "covariance_real|covariance"
      "covariance_complex|covariance|--example|complex"
      "prony_real|prony|--real-signal"
      "prony_complex|prony|--example|complex"
      "pcar_real|pcar"
      "pcar_complex|pcar|--example|complex"
      "pencil_real|pencil|--real-signal"
      "pencil_complex|pencil|--example|complex"
      "mdl_real|mdl"
      "mdl_complex|mdl|--example|complex"
      "covspectrum_real|covspectrum"
      "covspectrum_complex|covspectrum|--example|complex"
      "pcarspectrum_real|pcarspectrum|--real-signal"
      "pcarspectrum_complex|pcarspectrum|--example|complex"
      "marple64_covariance|covariance|${_win_marple}|--order|4"
      "marple64_covspectrum|covspectrum|${_win_marple}|--order|8|--points|100")
  foreach(case IN LISTS _win_cases)
    string(FIND "${case}" "|" bar)
    string(SUBSTRING "${case}" 0 ${bar} name)
    math(EXPR bar "${bar} + 1")
    string(SUBSTRING "${case}" ${bar} -1 args)
    add_test(NAME example.windows_matches_linux.${name}
             COMMAND ${CMAKE_COMMAND} "-DEMULATOR=${_win_emulator}"
                     -DWIN_EXE=$<TARGET_FILE:qdm_example> -DLINUX_EXE=${QDM_LINUX_EXAMPLE}
                     "-DARGS=${args}" -DOUT=${_win_out}/${name} -DPYTHON=${QDM_PYTHON}
                     -DCOMPARE=${CMAKE_SOURCE_DIR}/tools/compare_json.py
                     -P ${CMAKE_SOURCE_DIR}/tools/compare_example_runs.cmake)
  endforeach()
endif()

# Windows threads (CreateThread) calling the DLL at once, and the DLL unloaded
# and reloaded between rounds of such calls.
if(WIN32)
  add_executable(e2e_windows_threads ${CMAKE_SOURCE_DIR}/tests/windows/threads.cpp)
  target_link_libraries(e2e_windows_threads PRIVATE gfrtemu GTest::gtest_main)
  target_include_directories(e2e_windows_threads PRIVATE ${CMAKE_SOURCE_DIR}/tests
                             ${CMAKE_SOURCE_DIR}/include ${CMAKE_SOURCE_DIR}/emuhost)
  target_compile_definitions(e2e_windows_threads PRIVATE QDM_LIBRARY_PATH="$<TARGET_FILE:qdm>")
  add_dependencies(e2e_windows_threads qdm)
  gtest_discover_tests(e2e_windows_threads DISCOVERY_MODE PRE_TEST TEST_PREFIX "e2e."
                       DISCOVERY_TIMEOUT 120)
endif()

# The library's own LAPACK and CBLAS error handlers (Windows build only).
if(WIN32)
  add_executable(unit_windows_lapack_errors ${CMAKE_SOURCE_DIR}/tests/windows/lapack_errors.cpp)
  target_link_libraries(unit_windows_lapack_errors PRIVATE qdm_core ${QDM_LINALG_LIBS}
                        GTest::gtest_main Threads::Threads)
  gtest_discover_tests(unit_windows_lapack_errors DISCOVERY_MODE PRE_TEST TEST_PREFIX "unit."
                       DISCOVERY_TIMEOUT 120)
endif()
