# Installs the conformance kit: sources and the CMake file that builds them against an installed package.
set(kit_target share/krv/conformance)
install(FILES ${CMAKE_CURRENT_LIST_DIR}/CMakeLists.txt DESTINATION ${kit_target})
install(DIRECTORY ${CMAKE_CURRENT_LIST_DIR}/../ DESTINATION ${kit_target}/tools/conformance
        FILES_MATCHING PATTERN "*.h" PATTERN "*.cpp" PATTERN kit EXCLUDE)
