# Installation: both faces' libraries and headers, a CMake package (targets
# qdm::qdm, the host face, and qdm::qdm_api, the plain C API), a pkg-config
# file for the plain API, and a Debian package through CPack.
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

install(TARGETS qdm qdm_api EXPORT qdmTargets
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
        ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
        RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR}
        INCLUDES DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})
install(FILES ${CMAKE_SOURCE_DIR}/include/qdm.h ${CMAKE_SOURCE_DIR}/include/qdm_api.h
              ${CMAKE_SOURCE_DIR}/include/qdm_status.h ${QDM_GENERATED_INCLUDE}/qdm_version.h
        DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})

# The host face's target carries its header too.
target_include_directories(qdm INTERFACE $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}>)

set(QDM_CMAKE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/qdm)
install(EXPORT qdmTargets NAMESPACE qdm:: DESTINATION ${QDM_CMAKE_DIR})
configure_package_config_file(${CMAKE_SOURCE_DIR}/cmake/qdmConfig.cmake.in
                              ${CMAKE_BINARY_DIR}/qdmConfig.cmake
                              INSTALL_DESTINATION ${QDM_CMAKE_DIR})
write_basic_package_version_file(${CMAKE_BINARY_DIR}/qdmConfigVersion.cmake
                                 COMPATIBILITY SameMajorVersion)
install(FILES ${CMAKE_BINARY_DIR}/qdmConfig.cmake ${CMAKE_BINARY_DIR}/qdmConfigVersion.cmake
        DESTINATION ${QDM_CMAKE_DIR})

# pkg-config: `pkg-config --cflags --libs qdm` gives the plain C API, with a run
# path to the library so that a program built from it runs from any prefix. The
# paths are written relative to the .pc file, so an installed tree can move.
file(RELATIVE_PATH QDM_PC_TO_PREFIX /${CMAKE_INSTALL_LIBDIR}/pkgconfig /)
string(REGEX REPLACE "/$" "" QDM_PC_TO_PREFIX "${QDM_PC_TO_PREFIX}")
configure_file(${CMAKE_SOURCE_DIR}/cmake/qdm.pc.in ${CMAKE_BINARY_DIR}/qdm.pc @ONLY)
install(FILES ${CMAKE_BINARY_DIR}/qdm.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

# cpack -G DEB: qdm_<version>_<arch>.deb, its dependencies on the system's
# LAPACK and BLAS packages found by dpkg-shlibdeps.
set(CPACK_PACKAGE_NAME qdm)
set(CPACK_PACKAGE_VENDOR "qdm developers")
set(CPACK_PACKAGE_CONTACT "qdm developers <qdm@example.invalid>")
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "${PROJECT_DESCRIPTION}")
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SECTION science)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
# On QDM_BLAS=openblas the libraries carry their own OpenBLAS and need only the
# Fortran run-time; on reference, the reference BLAS and LAPACK packages.
include(CPack)

# The reference: the header comments of both faces and the status page made
# from the status table, rendered by Doxygen into docs/html of the build tree.
find_package(Doxygen QUIET)
if(DOXYGEN_FOUND)
  configure_file(${CMAKE_SOURCE_DIR}/docs/Doxyfile.in ${CMAKE_BINARY_DIR}/docs/Doxyfile @ONLY)
  add_custom_target(docs
      COMMAND ${Python3_EXECUTABLE} ${CMAKE_SOURCE_DIR}/tools/status_table.py
              ${CMAKE_SOURCE_DIR}/include/qdm_status.h > ${CMAKE_BINARY_DIR}/docs/status.md
      COMMAND ${DOXYGEN_EXECUTABLE} ${CMAKE_BINARY_DIR}/docs/Doxyfile
      COMMENT "Rendering the reference into ${CMAKE_BINARY_DIR}/docs/html" VERBATIM)
endif()
