# Debian packages (make package): kyn-assistant with the plug-in, the two programs and the Python
# module; kyn-assistant-dev with the header, the library link, pkg-config and CMake files. The
# dependencies on Debian's libraries are read off the binaries by dpkg-shlibdeps.
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME kyn-assistant)
set(CPACK_PACKAGE_VERSION ${PROJECT_VERSION})
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "Kyn friends' location sharing for desktop voice assistants")
set(CPACK_PACKAGE_DESCRIPTION
  "A plug-in that a voice assistant loads to answer where friends are, to show or hide the user's\nlocation, and to tell when a friend arrives at or leaves a place; with a command-line host and\na reference server.")
set(CPACK_PACKAGE_CONTACT "kyn-assistant developers <kyn-assistant@localhost>")
set(CPACK_PACKAGING_INSTALL_PREFIX "${CMAKE_INSTALL_PREFIX}")
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_STRIP_FILES ON)
set(CPACK_COMPONENTS_ALL runtime dev)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SECTION misc)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_NAME kyn-assistant)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_SHLIBDEPS ON)
# A shlibs file, so that packages built against the library depend on a version that has its symbols.
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_DEPENDS "ca-certificates")
set(CPACK_DEBIAN_RUNTIME_PACKAGE_RECOMMENDS "python3")
set(CPACK_DEBIAN_DEV_PACKAGE_NAME kyn-assistant-dev)
set(CPACK_DEBIAN_DEV_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEV_PACKAGE_DEPENDS "kyn-assistant (= ${PROJECT_VERSION})")
set(CPACK_DEBIAN_DEV_PACKAGE_RECOMMENDS "pkg-config")
include(CPack)
