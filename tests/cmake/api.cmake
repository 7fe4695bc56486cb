# The plain face, linked from the core objects (the test reaches the allocation
# hook), against the built libqdm loaded as the host loads it.
if(TARGET qdm_api)
  add_executable(api_plain_vs_host ${CMAKE_SOURCE_DIR}/tests/api/plain_vs_host.cpp
                 ${CMAKE_SOURCE_DIR}/tests/support/guard_check.cpp
                 ${CMAKE_SOURCE_DIR}/tests/api/plain_records.cpp
                 ${CMAKE_SOURCE_DIR}/tests/api/plain_krylov.cpp
                 ${CMAKE_SOURCE_DIR}/tests/api/plain_messages.cpp
                 ${CMAKE_SOURCE_DIR}/tests/api/plain_defaults.cpp
                 $<TARGET_OBJECTS:qdm_core> ${QDM_API_SOURCES})
  target_include_directories(api_plain_vs_host PRIVATE ${CMAKE_SOURCE_DIR}
                             ${CMAKE_CURRENT_SOURCE_DIR} ${CMAKE_SOURCE_DIR}/include
                             ${QDM_GENERATED_INCLUDE} ${CMAKE_SOURCE_DIR}/emuhost)
  target_compile_definitions(api_plain_vs_host PRIVATE QDM_BUILDING_API
                             QDM_LIBRARY_PATH="$<TARGET_FILE:qdm>")
  target_link_libraries(api_plain_vs_host PRIVATE gfrtemu ${QDM_LINALG_LIBS} GTest::gtest_main
                        Threads::Threads ${CMAKE_DL_LIBS})
  add_dependencies(api_plain_vs_host qdm)
  gtest_discover_tests(api_plain_vs_host DISCOVERY_MODE PRE_TEST TEST_PREFIX "api."
                       DISCOVERY_TIMEOUT 120)
endif()

# The plain face from many threads at once (also built alone for the
# ThreadSanitizer run).
if(TARGET qdm_api)
  add_executable(api_plain_threads ${CMAKE_SOURCE_DIR}/tests/api/plain_threads.cpp
                 ${CMAKE_SOURCE_DIR}/tests/support/guard_check.cpp
                 $<TARGET_OBJECTS:qdm_core> ${QDM_API_SOURCES})
  target_include_directories(api_plain_threads PRIVATE ${CMAKE_SOURCE_DIR}
                             ${CMAKE_SOURCE_DIR}/include ${QDM_GENERATED_INCLUDE})
  target_compile_definitions(api_plain_threads PRIVATE QDM_BUILDING_API)
  target_link_libraries(api_plain_threads PRIVATE ${QDM_LINALG_LIBS} GTest::gtest_main
                        Threads::Threads ${CMAKE_DL_LIBS})
  gtest_discover_tests(api_plain_threads DISCOVERY_MODE PRE_TEST TEST_PREFIX "api."
                       DISCOVERY_TIMEOUT 120)
endif()

# Error bars of modes on the plain face, linked from the core objects (the
# test reaches the allocation and LAPACK fault hooks).
if(TARGET qdm_api)
  add_executable(api_mode_errors ${CMAKE_SOURCE_DIR}/tests/api/plain_mode_errors.cpp
                 ${CMAKE_SOURCE_DIR}/tests/support/guard_check.cpp
                 $<TARGET_OBJECTS:qdm_core> ${QDM_API_SOURCES})
  target_include_directories(api_mode_errors PRIVATE ${CMAKE_SOURCE_DIR}
                             ${CMAKE_SOURCE_DIR}/include ${QDM_GENERATED_INCLUDE})
  target_compile_definitions(api_mode_errors PRIVATE QDM_BUILDING_API)
  target_link_libraries(api_mode_errors PRIVATE ${QDM_LINALG_LIBS} GTest::gtest_main
                        Threads::Threads ${CMAKE_DL_LIBS})
  gtest_discover_tests(api_mode_errors DISCOVERY_MODE PRE_TEST TEST_PREFIX "api."
                       DISCOVERY_TIMEOUT 120)
endif()

# The stabilization diagram on the plain face, linked from the core objects
# (the test reaches the allocation and LAPACK fault hooks).
if(TARGET qdm_api)
  add_executable(api_stabilization ${CMAKE_SOURCE_DIR}/tests/api/plain_stabilization.cpp
                 ${CMAKE_SOURCE_DIR}/tests/support/guard_check.cpp
                 $<TARGET_OBJECTS:qdm_core> ${QDM_API_SOURCES})
  target_include_directories(api_stabilization PRIVATE ${CMAKE_SOURCE_DIR}
                             ${CMAKE_SOURCE_DIR}/include ${QDM_GENERATED_INCLUDE})
  target_compile_definitions(api_stabilization PRIVATE QDM_BUILDING_API)
  target_link_libraries(api_stabilization PRIVATE ${QDM_LINALG_LIBS} GTest::gtest_main
                        Threads::Threads ${CMAKE_DL_LIBS})
  gtest_discover_tests(api_stabilization DISCOVERY_MODE PRE_TEST TEST_PREFIX "api."
                       DISCOVERY_TIMEOUT 120)
endif()
