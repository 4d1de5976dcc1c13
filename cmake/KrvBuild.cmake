# Common settings and the helpers with which every folder declares its libraries, plug-ins and tests.
include(GNUInstallDirs)

set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
set(CMAKE_CXX_VISIBILITY_PRESET hidden)
set(CMAKE_VISIBILITY_INLINES_HIDDEN ON)
if(NOT CMAKE_BUILD_TYPE)
  set(CMAKE_BUILD_TYPE Release CACHE STRING "" FORCE)
endif()

# The build tree has the same shape as an installation: bin, lib, lib/qrfformats, etc/qrfformats.
set(CMAKE_INSTALL_LIBDIR lib CACHE STRING "Library folder; the home is looked for above it" FORCE)
set(KRV_HOME_DIR ${CMAKE_BINARY_DIR})
set(CMAKE_RUNTIME_OUTPUT_DIRECTORY ${KRV_HOME_DIR}/bin)
set(CMAKE_LIBRARY_OUTPUT_DIRECTORY ${KRV_HOME_DIR}/lib)
set(CMAKE_ARCHIVE_OUTPUT_DIRECTORY ${KRV_HOME_DIR}/lib)
set(CMAKE_INSTALL_RPATH "$ORIGIN;$ORIGIN/../lib;$ORIGIN/..")
set(CMAKE_BUILD_RPATH_USE_ORIGIN ON)

# Source places in exceptions are paths in the source tree, never of the machine that built the library.
add_compile_options("-ffile-prefix-map=${CMAKE_SOURCE_DIR}/=")
# The 64-bit processors of the last fifteen years; wider vectors are chosen at run time where they pay.
if(CMAKE_SYSTEM_PROCESSOR MATCHES "x86_64|amd64|AMD64")
  add_compile_options(-march=x86-64-v2)
endif()
if(KRV_WARNINGS_AS_ERRORS)
  add_compile_options(-Wall -Wextra -Wpedantic $<$<CXX_COMPILER_ID:GNU>:-Wshadow=local> -Wnon-virtual-dtor -Woverloaded-virtual -Werror)
endif()
if(KRV_SANITIZE)
  add_compile_options(-fsanitize=${KRV_SANITIZE} -fno-omit-frame-pointer -fno-sanitize-recover=all)
  add_link_options(-fsanitize=${KRV_SANITIZE})
  add_compile_definitions(KRV_SANITIZED=1)
endif()
if(KRV_BUILD_FUZZERS)
  add_compile_options(-fsanitize=fuzzer-no-link,address,undefined -fno-omit-frame-pointer -fno-sanitize-recover=all)
  add_link_options(-fsanitize=address,undefined)
  add_compile_definitions(KRV_SANITIZED=1)
endif()

find_program(KRV_CCACHE ccache)
if(KRV_CCACHE)
  set(CMAKE_CXX_COMPILER_LAUNCHER ${KRV_CCACHE})
endif()

find_package(Threads REQUIRED)
find_package(PkgConfig REQUIRED)

# krv_add_library(NAME FOLDERS f... EXCEPT regex SOURCES s... PUBLIC libs... PRIVATE libs...): a shared library of all
# sources below the folders but those that the expression matches, and of the sources. <NAME>_EXPORTS is what its export
# macro looks at.
function(krv_add_library name)
  cmake_parse_arguments(ARG "" "EXCEPT" "FOLDERS;SOURCES;PUBLIC;PRIVATE" ${ARGN})
  set(sources)
  foreach(folder IN LISTS ARG_FOLDERS)
    file(GLOB_RECURSE found CONFIGURE_DEPENDS ${CMAKE_CURRENT_SOURCE_DIR}/${folder}/*.cpp)
    list(APPEND sources ${found})
  endforeach()
  if(ARG_EXCEPT)
    list(FILTER sources EXCLUDE REGEX ${ARG_EXCEPT})
  endif()
  add_library(${name} SHARED ${sources} ${ARG_SOURCES})
  target_include_directories(${name} PUBLIC $<BUILD_INTERFACE:${CMAKE_SOURCE_DIR}>
                                            $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/krv>)
  target_compile_features(${name} PUBLIC cxx_std_20)
  target_link_libraries(${name} PUBLIC ${ARG_PUBLIC} PRIVATE ${ARG_PRIVATE})
  set_target_properties(${name} PROPERTIES VERSION ${PROJECT_VERSION} SOVERSION ${PROJECT_VERSION_MAJOR})
  string(REGEX REPLACE "^krv" "" short ${name})
  set_target_properties(${name} PROPERTIES EXPORT_NAME ${short})
  add_library(krv::${short} ALIAS ${name})
  set_property(GLOBAL APPEND PROPERTY KRV_LIBRARIES ${name})
endfunction()

# krv_add_format_plugin(NAME SOURCES s... DESCRIPTION file.xml LIBRARIES libs... [NOT_REGISTERED]):
# a loadable library NAME.so in lib/qrfformats, its description in etc/qrfformats, both listed in the registry.
function(krv_add_format_plugin name)
  cmake_parse_arguments(ARG "NOT_REGISTERED" "DESCRIPTION" "SOURCES;LIBRARIES" ${ARGN})
  krv_format_library(${name} SOURCES ${ARG_SOURCES} LIBRARIES ${ARG_LIBRARIES})
  set_target_properties(format_${name} PROPERTIES LIBRARY_OUTPUT_DIRECTORY ${KRV_HOME_DIR}/lib/qrfformats)
  if(NOT ARG_NOT_REGISTERED)
    get_filename_component(description ${ARG_DESCRIPTION} ABSOLUTE)
    configure_file(${description} ${KRV_HOME_DIR}/etc/qrfformats/${ARG_DESCRIPTION} COPYONLY)
    set_property(GLOBAL APPEND PROPERTY KRV_FORMATS ${ARG_DESCRIPTION})
    install(TARGETS format_${name} LIBRARY DESTINATION lib/qrfformats)
    install(FILES ${description} DESTINATION etc/qrfformats)
  endif()
endfunction()

include(KrvPlugin)

# Writes the registry from the plug-ins that were declared: it never lists what is not built.
function(krv_write_registry)
  get_property(formats GLOBAL PROPERTY KRV_FORMATS)
  set(KRV_REGISTRY_ENTRIES "")
  foreach(format IN LISTS formats)
    string(APPEND KRV_REGISTRY_ENTRIES "  <Format>${format}</Format>\n")
  endforeach()
  configure_file(${CMAKE_SOURCE_DIR}/etc/qrfformats/availableformats.xml.in
                 ${KRV_HOME_DIR}/etc/qrfformats/availableformats.xml @ONLY)
  install(FILES ${KRV_HOME_DIR}/etc/qrfformats/availableformats.xml DESTINATION etc/qrfformats)
endfunction()

# krv_add_test(NAME FOLDER f LIBRARIES libs...): one GoogleTest program of all *_test.cpp below the folder.
function(krv_add_test name)
  cmake_parse_arguments(ARG "" "FOLDER" "SOURCES;LIBRARIES" ${ARGN})
  set(sources ${ARG_SOURCES})
  if(ARG_FOLDER)
    file(GLOB_RECURSE found CONFIGURE_DEPENDS ${CMAKE_CURRENT_SOURCE_DIR}/${ARG_FOLDER}/*_test.cpp)
    list(APPEND sources ${found})
  endif()
  if(NOT sources)
    return()
  endif()
  add_executable(${name} ${sources})
  target_link_libraries(${name} PRIVATE ${ARG_LIBRARIES} GTest::gmock GTest::gtest_main)
  target_include_directories(${name} PRIVATE ${CMAKE_SOURCE_DIR})
  target_compile_definitions(${name} PRIVATE KRV_TEST_HOME="${KRV_HOME_DIR}")
  gtest_discover_tests(${name} DISCOVERY_MODE PRE_TEST DISCOVERY_TIMEOUT 60 PROPERTIES TIMEOUT 600)
endfunction()

# krv_vector_kernels(VARIABLE STEM): the source files of inner loops that are compiled for each instruction set, with the
# options that they want: gobs/STEM.cpp, STEMavx2.cpp and STEMavx512.cpp. These hold for the folder that calls this: the
# loops are no part of a library's interface, whoever wants them compiles them in. Results do not depend on the
# processor: products and sums are not contracted.
function(krv_vector_kernels variable stem)
  set(stem ${CMAKE_SOURCE_DIR}/gobs/${stem})
  set(sources ${stem}.cpp ${stem}avx2.cpp ${stem}avx512.cpp)
  set_source_files_properties(${sources} PROPERTIES COMPILE_OPTIONS
    "-O3;-fno-math-errno;-fno-trapping-math;-ffp-contract=off;-Wno-psabi")
  # The library asks the processor before it calls the wide ones.
  if(CMAKE_SYSTEM_PROCESSOR MATCHES "x86_64|amd64|AMD64")
    set_property(SOURCE ${stem}avx2.cpp APPEND PROPERTY COMPILE_OPTIONS -mavx2)
    set_property(SOURCE ${stem}avx512.cpp APPEND PROPERTY
      COMPILE_OPTIONS -mavx512f -mavx512bw -mavx512dq -mavx512vl -mavx512vbmi)
  endif()
  set(${variable} ${sources} PARENT_SCOPE)
endfunction()

# krv_average_kernels(VARIABLE): those of averages.
function(krv_average_kernels variable)
  krv_vector_kernels(sources resampling/detail/averagekernels)
  set(${variable} ${sources} PARENT_SCOPE)
endfunction()
