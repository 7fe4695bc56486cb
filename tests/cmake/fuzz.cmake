# The libFuzzer target (QDM_FUZZ=ON, clang). fuzz.replay runs the seed corpus and
# every input that ever failed (tests/fuzz/regressions): a fixed crash stays fixed.
if(QDM_FUZZ)
  add_executable(fuzz_exports ${CMAKE_SOURCE_DIR}/tests/fuzz/fuzz_exports.cpp ${QDM_API_SOURCES})
  target_include_directories(fuzz_exports PRIVATE ${CMAKE_SOURCE_DIR}/tests ${QDM_GENERATED_INCLUDE})
  target_compile_definitions(fuzz_exports PRIVATE QDM_BUILDING_API)
  target_link_libraries(fuzz_exports PRIVATE qdm_core gfrtemu ${QDM_LINALG_LIBS}
                        Threads::Threads ${CMAKE_DL_LIBS})
  target_link_options(fuzz_exports PRIVATE -fsanitize=fuzzer)
  file(GLOB QDM_FUZZ_INPUTS CONFIGURE_DEPENDS ${CMAKE_SOURCE_DIR}/tests/fuzz/corpus/*
       ${CMAKE_SOURCE_DIR}/tests/fuzz/regressions/*)
  # Files given one by one are run once each, never mutated.
  add_test(NAME fuzz.replay COMMAND fuzz_exports ${QDM_FUZZ_INPUTS})
endif()
