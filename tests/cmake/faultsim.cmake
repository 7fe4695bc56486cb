# qdm_faultsim: the library built from the same internal objects as libqdm plus
# exported hooks that make the k-th work allocation fail and count what is
# still allocated. Only the fault-injection e2e test loads it.
add_library(qdm_faultsim SHARED $<TARGET_OBJECTS:qdm_core>
            ${CMAKE_SOURCE_DIR}/tests/helpers/faultsim_hooks.cpp)
target_include_directories(qdm_faultsim PRIVATE ${CMAKE_SOURCE_DIR})
target_link_libraries(qdm_faultsim PRIVATE ${QDM_LINALG_LIBS} Threads::Threads ${CMAKE_DL_LIBS})
if(NOT WIN32)
  target_link_options(qdm_faultsim PRIVATE -Wl,--no-undefined ${QDM_LINALG_SHARED_OPTIONS})
endif()

if(TARGET e2e_fault_injection)
  target_compile_definitions(e2e_fault_injection PRIVATE
      QDM_FAULTSIM_LIBRARY_PATH="$<TARGET_FILE:qdm_faultsim>")
  add_dependencies(e2e_fault_injection qdm_faultsim)
endif()
