# The plain face's test programs, linked from the core objects: they reach the
# allocation and LAPACK fault hooks, and check the work blocks' guards after
# their tests.
if(NOT TARGET qdm_api)
  return()
endif()

function(qdm_plain_test name)
  add_executable(${name} ${ARGN} ${CMAKE_SOURCE_DIR}/tests/support/guard_check.cpp
                 $<TARGET_OBJECTS:qdm_core> ${QDM_API_SOURCES})
  target_include_directories(${name} PRIVATE ${CMAKE_SOURCE_DIR} ${CMAKE_CURRENT_SOURCE_DIR}
                             ${CMAKE_SOURCE_DIR}/include ${QDM_GENERATED_INCLUDE})
  target_compile_definitions(${name} PRIVATE QDM_BUILDING_API)
  target_link_libraries(${name} PRIVATE ${QDM_LINALG_LIBS} GTest::gtest_main Threads::Threads
                        ${CMAKE_DL_LIBS})
  gtest_discover_tests(${name} DISCOVERY_MODE PRE_TEST TEST_PREFIX "api."
                       DISCOVERY_TIMEOUT 120)
endfunction()

# Against the built libqdm, loaded as the host loads it.
qdm_plain_test(api_plain_vs_host ${CMAKE_SOURCE_DIR}/tests/api/plain_vs_host.cpp
               ${CMAKE_SOURCE_DIR}/tests/api/plain_records.cpp
               ${CMAKE_SOURCE_DIR}/tests/api/plain_krylov.cpp
               ${CMAKE_SOURCE_DIR}/tests/api/plain_messages.cpp
               ${CMAKE_SOURCE_DIR}/tests/api/plain_defaults.cpp)
target_include_directories(api_plain_vs_host PRIVATE ${CMAKE_SOURCE_DIR}/emuhost)
target_compile_definitions(api_plain_vs_host PRIVATE QDM_LIBRARY_PATH="$<TARGET_FILE:qdm>")
target_link_libraries(api_plain_vs_host PRIVATE gfrtemu)
add_dependencies(api_plain_vs_host qdm)

# From many threads at once (also built alone for the ThreadSanitizer run).
qdm_plain_test(api_plain_threads ${CMAKE_SOURCE_DIR}/tests/api/plain_threads.cpp)
# Error bars of modes, and the stabilization diagram.
qdm_plain_test(api_mode_errors ${CMAKE_SOURCE_DIR}/tests/api/plain_mode_errors.cpp)
qdm_plain_test(api_stabilization ${CMAKE_SOURCE_DIR}/tests/api/plain_stabilization.cpp)
# Batches: every fit's batch twin against its single calls.
qdm_plain_test(api_plain_batch ${CMAKE_SOURCE_DIR}/tests/api/plain_batch.cpp)
