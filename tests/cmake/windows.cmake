# Windows build only: the DLL's export table holds exactly the fifteen entry
# points, and it imports nothing but system DLLs.
if(WIN32)
  find_program(QDM_OBJDUMP NAMES x86_64-w64-mingw32-objdump objdump REQUIRED)
  set(QDM_EXPECTED_EXPORTS
      SetGFRTModule
      QdmReCovarianceH QdmCxCovarianceH QdmRePCARH QdmCxPCARH QdmRePronyH QdmCxPronyH
      QdmReMatrixPencilH QdmCxMatrixPencilH QdmReMinDescriptLenH QdmCxMinDescriptLenH
      QdmReCovPowerSpectrH QdmCxCovPowerSpectrH QdmRePCARPowerSpectrumH
      QdmCxPCARPowerSpectrumH)
  string(REPLACE ";" "\\;" exports_arg "${QDM_EXPECTED_EXPORTS}")
  add_test(NAME e2e.WindowsDll.ExactExportsSystemImports
           COMMAND ${CMAKE_COMMAND} -DOBJDUMP=${QDM_OBJDUMP} -DDLL=$<TARGET_FILE:qdm>
                   -DEXPORTS=${exports_arg} -P ${CMAKE_SOURCE_DIR}/tools/check_dll_tables.cmake)
endif()

# GetProcAddress on the executable sees only the executable's own exports, not
# those of the DLLs it imports. The entry-frame unit test relies on the
# library finding the host run-time through the executable, so on Windows the
# emulated run-time is compiled into that program, which then exports
# NumericArrayResize and gGFRTVersion itself.
if(WIN32 AND TARGET unit_entry_frame)
  target_sources(unit_entry_frame PRIVATE ${CMAKE_SOURCE_DIR}/emuhost/emuhost.cpp)
  target_compile_definitions(unit_entry_frame PRIVATE EMUHOST_BUILDING)
endif()
