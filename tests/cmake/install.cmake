# The installed tree as a user uses it (find_package, pkg-config, and with
# QDM_TEST_DEB=1 as root the Debian package); not in sanitizer builds, whose
# library plain programs cannot load.
if(TARGET qdm_api AND TARGET qdm_example AND NOT QDM_SANITIZE)
  add_test(NAME install.consumers
           COMMAND ${CMAKE_SOURCE_DIR}/tests/install/run.sh ${CMAKE_SOURCE_DIR} ${CMAKE_BINARY_DIR})
  set_tests_properties(install.consumers PROPERTIES RUN_SERIAL TRUE)
endif()

# The reference renders, and names every function of the plain API.
if(TARGET docs)
  add_test(NAME install.reference
           COMMAND ${CMAKE_COMMAND} -DBUILD=${CMAKE_BINARY_DIR} -DSRC=${CMAKE_SOURCE_DIR}
                   -P ${CMAKE_SOURCE_DIR}/tests/install/reference.cmake)
endif()
