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
# The system's packages name their prefix; any other install is relocatable, its prefix found from
# where the file lies.
if(CMAKE_INSTALL_PREFIX STREQUAL "/usr")
  set(KYN_PC_PREFIX "/usr")
else()
  file(RELATIVE_PATH KYN_PC_PREFIX "/prefix/${CMAKE_INSTALL_LIBDIR}/pkgconfig" "/prefix")
  set(KYN_PC_PREFIX "\${pcfiledir}/${KYN_PC_PREFIX}")
endif()
configure_file(${CMAKE_CURRENT_LIST_DIR}/kyn-assistant.pc.in ${PROJECT_BINARY_DIR}/kyn-assistant.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/kyn-assistant.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT dev)

# The Python module (standard library only), where the system's python3 finds it: Debian's own
# folder under /usr, the version's site folder under any other prefix.
find_package(Python3 COMPONENTS Interpreter)
if(CMAKE_INSTALL_PREFIX STREQUAL "/usr" OR NOT Python3_FOUND)
  set(kyn_python_default "lib/python3/dist-packages")
else()
  set(kyn_python_default "lib/python${Python3_VERSION_MAJOR}.${Python3_VERSION_MINOR}/dist-packages")
endif()
set(KYN_PYTHON_DIR "${kyn_python_default}" CACHE PATH "Where the Python module is installed, below the prefix")
install(DIRECTORY ${PROJECT_SOURCE_DIR}/python/kyn_assistant DESTINATION ${KYN_PYTHON_DIR} COMPONENT runtime
  PATTERN __pycache__ EXCLUDE)
# The installed module finds the installed plug-in relative to itself.
file(RELATIVE_PATH kyn_lib_from_module "/prefix/${KYN_PYTHON_DIR}/kyn_assistant" "/prefix/${CMAKE_INSTALL_LIBDIR}")
file(GENERATE OUTPUT ${PROJECT_BINARY_DIR}/python/_installed.py CONTENT
  "# Written by the install: where the plug-in lies, seen from this module.\nPLUGIN_FROM_MODULE = \"${kyn_lib_from_module}/$<TARGET_SONAME_FILE_NAME:kyn-assistant>\"\n")
install(FILES ${PROJECT_BINARY_DIR}/python/_installed.py DESTINATION ${KYN_PYTHON_DIR}/kyn_assistant COMPONENT runtime)
