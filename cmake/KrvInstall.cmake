# What `cmake --install` lays out beside the plug-ins, which krv_add_format_plugin installs. The tree may be moved as a
# whole: nothing in it names the place where it was made.
include(CMakePackageConfigHelpers)
set(KRV_PACKAGE_DIR lib/cmake/krvdatasources)

get_property(libraries GLOBAL PROPERTY KRV_LIBRARIES)
install(TARGETS ${libraries} EXPORT krvdatasourcesTargets LIBRARY DESTINATION lib)
install(EXPORT krvdatasourcesTargets NAMESPACE krv:: DESTINATION ${KRV_PACKAGE_DIR})

# The shared base of format plug-ins is linked into each of them, so its authors need it as a library.
set_target_properties(krvpluginsupport PROPERTIES EXPORT_NAME pluginsupport)
install(TARGETS krvpluginsupport EXPORT krvpluginsupportTargets ARCHIVE DESTINATION lib)
install(EXPORT krvpluginsupportTargets NAMESPACE krv:: DESTINATION ${KRV_PACKAGE_DIR})

foreach(folder toolkit gobs datasources operations krv plugins/support)
  install(DIRECTORY ${CMAKE_SOURCE_DIR}/${folder}/ DESTINATION include/krv/${folder}
          FILES_MATCHING PATTERN "*.h" PATTERN detail EXCLUDE PATTERN vectors.h EXCLUDE)
endforeach()

configure_package_config_file(${CMAKE_CURRENT_LIST_DIR}/krvdatasourcesConfig.cmake.in
                              ${CMAKE_BINARY_DIR}/package/krvdatasourcesConfig.cmake
                              INSTALL_DESTINATION ${KRV_PACKAGE_DIR} NO_SET_AND_CHECK_MACRO)
write_basic_package_version_file(${CMAKE_BINARY_DIR}/package/krvdatasourcesConfigVersion.cmake
                                 COMPATIBILITY SameMinorVersion)
install(FILES ${CMAKE_BINARY_DIR}/package/krvdatasourcesConfig.cmake
              ${CMAKE_BINARY_DIR}/package/krvdatasourcesConfigVersion.cmake
              ${CMAKE_CURRENT_LIST_DIR}/KrvPlugin.cmake
        DESTINATION ${KRV_PACKAGE_DIR})

foreach(module krvdatasources krvoperations)
  configure_file(${CMAKE_CURRENT_LIST_DIR}/${module}.pc.in ${CMAKE_BINARY_DIR}/package/${module}.pc @ONLY)
  install(FILES ${CMAKE_BINARY_DIR}/package/${module}.pc DESTINATION lib/pkgconfig)
endforeach()

# For authors of format plug-ins: the worked example; tools/conformance installs the conformance checks.
install(FILES ${CMAKE_SOURCE_DIR}/examples/formatplugin/CMakeLists.txt DESTINATION share/krv/formatplugin)
install(DIRECTORY ${CMAKE_SOURCE_DIR}/plugins/demo DESTINATION share/krv/formatplugin/plugins)
install(DIRECTORY ${CMAKE_SOURCE_DIR}/docs DESTINATION share/krv)
install(FILES ${CMAKE_SOURCE_DIR}/LICENSE DESTINATION share/krv)
