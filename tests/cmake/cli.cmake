# The installed qdm tool (Linux), run by tests/cmake/cli.sh from a prefix under
# the build tree: stdin and stdout, --jobs, every exit code, plots, CSV
# dialects and hostile input.
if(NOT TARGET qdm_cli)
  return()
endif()
set(_cli_prefix ${CMAKE_CURRENT_BINARY_DIR}/cli_prefix)
add_test(NAME cli.install
         COMMAND ${CMAKE_COMMAND} --install ${CMAKE_BINARY_DIR} --prefix ${_cli_prefix})
set_tests_properties(cli.install PROPERTIES FIXTURES_SETUP qdm_cli_installed)
foreach(case stdin_stdout jobs exit_codes argument_words plot csv limits present readme defaults)
  add_test(NAME cli.${case}
           COMMAND bash ${CMAKE_CURRENT_LIST_DIR}/cli.sh ${_cli_prefix}
                   ${CMAKE_CURRENT_BINARY_DIR}/cli_work/${case}
                   ${CMAKE_SOURCE_DIR}/tests/data/marple64.csv
                   ${CMAKE_SOURCE_DIR}/README.md ${case})
  set_tests_properties(cli.${case} PROPERTIES FIXTURES_REQUIRED qdm_cli_installed)
endforeach()
if(QDM_SANITIZE)
  # cli.defaults and cli.readme also run the Python package on the instrumented
  # library: the interpreter is not instrumented, so the sanitizer run-time has
  # to come first.
  execute_process(COMMAND ${CMAKE_CXX_COMPILER} -print-file-name=libasan.so
                  OUTPUT_VARIABLE _cli_asan OUTPUT_STRIP_TRAILING_WHITESPACE)
  set_tests_properties(cli.defaults cli.readme PROPERTIES ENVIRONMENT
                       "QDM_PYTHON_PRELOAD=${_cli_asan}")
endif()
