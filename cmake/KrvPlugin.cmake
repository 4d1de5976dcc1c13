# How a format plug-in is built, in this tree and by authors elsewhere.

# krv_format_library(NAME SOURCES s... LIBRARIES libs...): target format_NAME, the loadable library NAME.so.
function(krv_format_library name)
  cmake_parse_arguments(ARG "" "" "SOURCES;LIBRARIES" ${ARGN})
  add_library(format_${name} MODULE ${ARG_SOURCES})
  set_target_properties(format_${name} PROPERTIES PREFIX "" SUFFIX ".so" OUTPUT_NAME ${name}
                        CXX_VISIBILITY_PRESET hidden VISIBILITY_INLINES_HIDDEN ON)
  target_link_libraries(format_${name} PRIVATE krv::datasources krv::gobs krv::toolkit ${ARG_LIBRARIES})
endfunction()

# The rest is for authors elsewhere; this tree registers its own formats.
if(COMMAND krv_add_format_plugin)
  return()
endif()

# krv_add_format_plugin(NAME SOURCES s... DESCRIPTION file.xml [LIBRARIES libs...]): the plug-in, and its installation
# into the home of the framework that CMAKE_INSTALL_PREFIX names: lib/qrfformats/NAME.so, etc/qrfformats/file.xml, and
# an entry in the registry unless it is there already.
function(krv_add_format_plugin name)
  cmake_parse_arguments(ARG "" "DESCRIPTION" "SOURCES;LIBRARIES" ${ARGN})
  krv_format_library(${name} SOURCES ${ARG_SOURCES} LIBRARIES ${ARG_LIBRARIES})
  set_target_properties(format_${name} PROPERTIES INSTALL_RPATH "$ORIGIN/..")
  get_filename_component(description ${ARG_DESCRIPTION} ABSOLUTE)
  get_filename_component(entry ${ARG_DESCRIPTION} NAME)
  install(TARGETS format_${name} LIBRARY DESTINATION lib/qrfformats)
  install(FILES ${description} DESTINATION etc/qrfformats)
  install(CODE "
    set(registry \"\$ENV{DESTDIR}\${CMAKE_INSTALL_PREFIX}/etc/qrfformats/availableformats.xml\")
    if(NOT EXISTS \"\${registry}\")
      message(FATAL_ERROR \"\${registry} is missing: install into the home of the framework, ${krvdatasources_HOME}\")
    endif()
    file(READ \"\${registry}\" text)
    if(NOT text MATCHES \"<Format>${entry}</Format>\")
      string(REPLACE \"</Formats>\" \"  <Format>${entry}</Format>\\n</Formats>\" text \"\${text}\")
      file(WRITE \"\${registry}\" \"\${text}\")
    endif()")
endfunction()
