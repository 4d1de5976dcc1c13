# Installs the conformance kit: sources and the CMake file that builds them against an installed package.
set(kit ${CMAKE_CURRENT_LIST_DIR})
set(kit_target share/krv/conformance)
install(FILES ${kit}/CMakeLists.txt DESTINATION ${kit_target})
install(FILES ${kit}/../conformance.h ${kit}/../conformance.cpp ${kit}/../krvconformance.cpp
        DESTINATION ${kit_target}/tests/conformance)
foreach(name formathome recipe tempfolder)
  install(FILES ${kit}/../../support/${name}.h ${kit}/../../support/${name}.cpp DESTINATION ${kit_target}/tests/support)
endforeach()
