# Memcheck over every fit of the tool on both built-in examples, and over the
# work-block tests: no read outside memory the library owns, BLAS kernels
# included (memcheck sees into OpenBLAS, which the sanitizers do not). Only
# in a plain build, with valgrind installed.
if(QDM_SANITIZE OR QDM_TSAN OR QDM_FUZZ OR WIN32 OR NOT TARGET qdm_cli)
  return()
endif()
find_program(QDM_VALGRIND valgrind)
if(NOT QDM_VALGRIND)
  message(STATUS "No valgrind: the memcheck tests are left out")
  return()
endif()
set(_memcheck ${QDM_VALGRIND} --quiet --error-exitcode=99 --errors-for-leak-kinds=none)
foreach(fit covariance prony pcar pencil mdl covspectrum pcarspectrum)
  foreach(kind real complex)
    add_test(NAME memcheck.${fit}_${kind}
             COMMAND ${_memcheck} $<TARGET_FILE:qdm_cli> ${fit} --example ${kind})
  endforeach()
endforeach()
# The pencil's Krylov route: its FFT products and the Lanczos basis updates.
foreach(kind real complex)
  add_test(NAME memcheck.pencil_krylov_${kind}
           COMMAND ${_memcheck} $<TARGET_FILE:qdm_cli> pencil --example ${kind} --solver krylov
                   --modes 3)
endforeach()
add_test(NAME memcheck.work_blocks COMMAND ${_memcheck} $<TARGET_FILE:unit_work_blocks>)
