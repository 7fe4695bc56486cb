# The entry-frame unit test runs the real resize path against the emulated host
# run-time, which the library's host lookup finds in the executable's scope.
if(TARGET unit_entry_frame)
  target_link_libraries(unit_entry_frame PRIVATE gfrtemu)
  target_include_directories(unit_entry_frame PRIVATE ${CMAKE_SOURCE_DIR}/emuhost)
endif()
