# What `cmake --install` puts where (the GNU install directories), and the Debian packages that
# `make package` builds from it:
#   runtime: the plug-in (versioned, with its SONAME), kyn-assistant, kyn-sim, the Python module
#   dev:     kyn_plugin.h, the unversioned library link, pkg-config and CMake package files
include(CMakePackageConfigHelpers)

install(TARGETS kyn-assistant EXPORT kyn-assistant-targets
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT runtime NAMELINK_COMPONENT dev)
install(FILES ${PROJECT_SOURCE_DIR}/src/plugin/kyn_plugin.h
  DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/kyn-assistant COMPONENT dev)
install(TARGETS kyn-assistant-cli kyn-sim RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT runtime)

# find_package(kyn-assistant) gives the target kyn-assistant::plugin.
set(kyn_cmake_dir ${CMAKE_INSTALL_LIBDIR}/cmake/kyn-assistant)
install(EXPORT kyn-assistant-targets NAMESPACE kyn-assistant:: DESTINATION ${kyn_cmake_dir}
  FILE kyn-assistant-targets.cmake COMPONENT dev)
configure_package_config_file(${CMAKE_CURRENT_LIST_DIR}/kyn-assistant-config.cmake.in
  ${PROJECT_BINARY_DIR}/kyn-assistant-config.cmake INSTALL_DESTINATION ${kyn_cmake_dir})
write_basic_package_version_file(${PROJECT_BINARY_DIR}/kyn-assistant-config-version.cmake
  COMPATIBILITY SameMajorVersion)
install(FILES ${PROJECT_BINARY_DIR}/kyn-assistant-config.cmake ${PROJECT_BINARY_DIR}/kyn-assistant-config-version.cmake
  DESTINATION ${kyn_cmake_dir} COMPONENT dev)

# pkg-config --cflags --libs kyn-assistant
file(RELATIVE_PATH KYN_PC_TO_PREFIX "/prefix/${CMAKE_INSTALL_LIBDIR}/pkgconfig" "/prefix")
configure_file(${CMAKE_CURRENT_LIST_DIR}/kyn-assistant.pc.in ${PROJECT_BINARY_DIR}/kyn-assistant.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/kyn-assistant.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT dev)
