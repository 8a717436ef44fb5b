include(CMakePackageConfigHelpers)

# Installs a shared library, its pkg-config file and its CMake package (NAME::NAME); the headers are installed as folders.
# `needs` is another library of the project that its headers include.
function(orvel_install_library name description needs)
  set(package_folder ${CMAKE_INSTALL_LIBDIR}/cmake/${name})
  set(made ${PROJECT_BINARY_DIR}/installed)
  install(TARGETS ${name} EXPORT ${name}Targets
    LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT runtime NAMELINK_COMPONENT development)
  install(EXPORT ${name}Targets NAMESPACE ${name}:: DESTINATION ${package_folder})

  configure_file(${PROJECT_SOURCE_DIR}/cmake/library.pc.in ${made}/${name}.pc @ONLY)
  install(FILES ${made}/${name}.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
  configure_package_config_file(${PROJECT_SOURCE_DIR}/cmake/package_config.cmake.in ${made}/${name}Config.cmake
    INSTALL_DESTINATION ${package_folder} NO_SET_AND_CHECK_MACRO NO_CHECK_REQUIRED_COMPONENTS_MACRO)
  # Before 1.0 a minor version may change what callers see.
  write_basic_package_version_file(${made}/${name}ConfigVersion.cmake COMPATIBILITY SameMinorVersion)
  install(FILES ${made}/${name}Config.cmake ${made}/${name}ConfigVersion.cmake DESTINATION ${package_folder})
endfunction()
