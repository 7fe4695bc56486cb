# Child processes and modules for the run-time binding test (e2e_host_binding).
set(QDM_CHILD_SRC ${CMAKE_SOURCE_DIR}/tests/helpers/host_child.cpp)

add_executable(qdm_child_nohost ${QDM_CHILD_SRC})
add_executable(qdm_child_host ${QDM_CHILD_SRC})
if(WIN32)
  # GetProcAddress on the executable sees only its own exports: the child
  # carries the emulated run-time and exports gGFRTVersion itself.
  target_sources(qdm_child_host PRIVATE ${CMAKE_SOURCE_DIR}/emuhost/emuhost.cpp)
  target_include_directories(qdm_child_host PRIVATE ${CMAKE_SOURCE_DIR}/emuhost)
  target_compile_definitions(qdm_child_host PRIVATE EMUHOST_BUILDING)
else()
  # Kept as a dependency although the child names none of its symbols: being
  # in the executable's scope is what makes it the process's host run-time.
  target_link_options(qdm_child_host PRIVATE -Wl,--no-as-needed)
  target_link_libraries(qdm_child_host PRIVATE gfrtemu)
endif()
add_executable(qdm_child_azhost ${QDM_CHILD_SRC})
target_compile_definitions(qdm_child_azhost PRIVATE QDM_CHILD_OWN_HOST)
set_target_properties(qdm_child_azhost PROPERTIES ENABLE_EXPORTS ON)
foreach(child qdm_child_nohost qdm_child_host qdm_child_azhost)
  target_include_directories(${child} PRIVATE ${CMAKE_SOURCE_DIR}/include
                                              ${CMAKE_SOURCE_DIR}/tests)
  target_link_libraries(${child} PRIVATE ${CMAKE_DL_LIBS})
endforeach()

# Exports the probe symbol but no NumericArrayResize.
add_library(qdm_nofunc_module MODULE ${CMAKE_SOURCE_DIR}/tests/helpers/nofunc_module.cpp)
# The emulated run-time under the run-time module's own name (libgfrt.so).
add_library(qdm_gfrt_module SHARED ${CMAKE_SOURCE_DIR}/emuhost/emuhost.cpp)
target_include_directories(qdm_gfrt_module PRIVATE ${CMAKE_SOURCE_DIR}/emuhost
                                                   ${CMAKE_SOURCE_DIR}/include)
target_compile_definitions(qdm_gfrt_module PRIVATE EMUHOST_BUILDING)
set_target_properties(qdm_gfrt_module PROPERTIES OUTPUT_NAME gfrt
                      LIBRARY_OUTPUT_DIRECTORY ${CMAKE_CURRENT_BINARY_DIR}/gfrt
                      RUNTIME_OUTPUT_DIRECTORY ${CMAKE_CURRENT_BINARY_DIR}/gfrt)

if(TARGET e2e_host_binding)
  target_compile_definitions(e2e_host_binding PRIVATE
      QDM_CHILD_NOHOST="$<TARGET_FILE:qdm_child_nohost>"
      QDM_CHILD_HOST="$<TARGET_FILE:qdm_child_host>"
      QDM_CHILD_AZHOST="$<TARGET_FILE:qdm_child_azhost>"
      QDM_NOFUNC_MODULE="$<TARGET_FILE:qdm_nofunc_module>"
      QDM_GFRT_MODULE="$<TARGET_FILE:qdm_gfrt_module>"
      QDM_GFRTEMU_MODULE="$<TARGET_FILE:gfrtemu>")
  add_dependencies(e2e_host_binding qdm_child_nohost qdm_child_host qdm_child_azhost
                   qdm_nofunc_module qdm_gfrt_module)
endif()
