# Cross-compiling for 64-bit Windows with mingw-w64 on Debian.
#
# The -posix compilers use the posix thread model: the default win32 model of
# GCC 12 has no std::mutex or std::thread. QDM_WIN_DEPS names an install
# prefix with the cross-built static LAPACK/CBLAS and GoogleTest
# (scripts/windows.sh builds and caches it).
set(CMAKE_SYSTEM_NAME Windows)
set(CMAKE_SYSTEM_PROCESSOR x86_64)

set(QDM_MINGW_TRIPLET x86_64-w64-mingw32)
set(CMAKE_C_COMPILER ${QDM_MINGW_TRIPLET}-gcc-posix)
set(CMAKE_CXX_COMPILER ${QDM_MINGW_TRIPLET}-g++-posix)
set(CMAKE_Fortran_COMPILER ${QDM_MINGW_TRIPLET}-gfortran-posix)
set(CMAKE_RC_COMPILER ${QDM_MINGW_TRIPLET}-windres)

# try_compile projects see the same dependency prefix.
list(APPEND CMAKE_TRY_COMPILE_PLATFORM_VARIABLES QDM_WIN_DEPS)
set(CMAKE_FIND_ROOT_PATH /usr/${QDM_MINGW_TRIPLET})
if(QDM_WIN_DEPS)
  list(APPEND CMAKE_FIND_ROOT_PATH ${QDM_WIN_DEPS})
endif()
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)
