# What `cmake --install` lays out for an integrator: component `library` is what programs are built
# against, component `tools` the program `orvenix`.
install(DIRECTORY include/orvenix DESTINATION include COMPONENT library FILES_MATCHING PATTERN "*.h")

if(ORVENIX_CE)
  install(FILES ${CMAKE_BINARY_DIR}/orvenix.dll DESTINATION bin COMPONENT library)
  install(FILES ${CMAKE_BINARY_DIR}/orvenix.lib DESTINATION lib COMPONENT library)
  return()
endif()

include(CMakePackageConfigHelpers)
set(package_folder lib/cmake/Orvenix)
install(TARGETS orvenix EXPORT OrvenixTargets
        LIBRARY DESTINATION lib COMPONENT library
        RUNTIME DESTINATION bin COMPONENT library
        ARCHIVE DESTINATION lib COMPONENT library
        INCLUDES DESTINATION include)

if(NOT WIN32)
  # What the library stands on here: the simulator, the way in, and the declarations of its calls.
  install(TARGETS cesim EXPORT OrvenixTargets LIBRARY DESTINATION lib COMPONENT library)
  install(FILES simulator/desk/desk.h DESTINATION include/cesim COMPONENT library)
  install(DIRECTORY platform/linux/ platform/api/ DESTINATION include/cesim/platform
          COMPONENT library FILES_MATCHING PATTERN "*.h")
  install(TARGETS orvenix_program orvenix_client
          RUNTIME DESTINATION bin COMPONENT tools
          LIBRARY DESTINATION lib COMPONENT tools)
  set_target_properties(orvenix cesim orvenix_client PROPERTIES INSTALL_RPATH "$ORIGIN")
  set_target_properties(orvenix_program PROPERTIES INSTALL_RPATH "$ORIGIN/../lib")
  configure_file(cmake/orvenix.pc.in orvenix.pc @ONLY)
  install(FILES ${CMAKE_CURRENT_BINARY_DIR}/orvenix.pc DESTINATION lib/pkgconfig COMPONENT library)
endif()

install(EXPORT OrvenixTargets NAMESPACE Orvenix:: DESTINATION ${package_folder} COMPONENT library)
configure_package_config_file(cmake/OrvenixConfig.cmake.in OrvenixConfig.cmake
                              INSTALL_DESTINATION ${package_folder})
write_basic_package_version_file(OrvenixConfigVersion.cmake COMPATIBILITY SameMajorVersion)
install(FILES ${CMAKE_CURRENT_BINARY_DIR}/OrvenixConfig.cmake
              ${CMAKE_CURRENT_BINARY_DIR}/OrvenixConfigVersion.cmake
        DESTINATION ${package_folder} COMPONENT library)
