# Every code block of README.md runs as written (tests/readme/readme_blocks.py):
# readme.blocks runs the blocks a reader runs from the repository root, with the
# installed tool (cli.install's prefix) and this tree's libraries; the table in
# the script names what runs each of the others. Not in sanitizer builds, whose
# libraries plain programs and the interpreter cannot load.
if(NOT TARGET qdm_cli OR NOT TARGET qdm_example OR QDM_SANITIZE OR CMAKE_CROSSCOMPILING)
  return()
endif()
set(_readme_script ${CMAKE_SOURCE_DIR}/tests/readme/readme_blocks.py)
if(QDM_BUILD_BENCH)
  set(_readme_bench)
else()
  set(_readme_bench --no-bench)
endif()
add_test(NAME readme.blocks
         COMMAND /usr/bin/python3 ${_readme_script} check ${CMAKE_SOURCE_DIR}/README.md
                 ${CMAKE_SOURCE_DIR} ${CMAKE_BINARY_DIR} ${CMAKE_CURRENT_BINARY_DIR}/cli_prefix
                 ${CMAKE_CURRENT_BINARY_DIR}/readme_blocks ${_readme_bench})
set_tests_properties(readme.blocks PROPERTIES FIXTURES_REQUIRED qdm_cli_installed TIMEOUT 600)

# The install block as root (into /usr/local, removed again), then the Python
# install and the main job, in a copy of the repository whose build tree is kept
# here between runs. Once per suite: only in the tree on the default BLAS, which
# is what the README's commands build.
if(QDM_BLAS STREQUAL "openblas")
  add_test(NAME readme.install
           COMMAND /usr/bin/python3 ${_readme_script} install ${CMAKE_SOURCE_DIR}/README.md
                   ${CMAKE_SOURCE_DIR} ${CMAKE_CURRENT_BINARY_DIR}/readme_install)
  set_tests_properties(readme.install PROPERTIES SKIP_RETURN_CODE 77 TIMEOUT 1800
                       RESOURCE_LOCK usr_local)
endif()
