# Third-party libraries, all from Debian's packages (scripts/install-deps installs them).
find_package(Threads REQUIRED)
find_package(nlohmann_json 3.11 REQUIRED)
find_package(simdjson REQUIRED)
find_package(CURL REQUIRED)
find_package(ICU 72 REQUIRED COMPONENTS uc i18n data)
find_package(OpenSSL REQUIRED)
find_package(PkgConfig REQUIRED)
pkg_check_modules(SYSTEMD REQUIRED IMPORTED_TARGET libsystemd)

find_program(KYN_GENRB genrb REQUIRED)
find_program(KYN_PKGDATA pkgdata REQUIRED)
find_program(KYN_GENCCODE genccode REQUIRED)

# libphonenumber ships neither a CMake package nor a pkg-config file.
find_path(PHONENUMBER_INCLUDE_DIR phonenumbers/phonenumberutil.h REQUIRED)
find_library(PHONENUMBER_LIBRARY phonenumber REQUIRED)
add_library(kyn_phonenumber INTERFACE)
target_include_directories(kyn_phonenumber SYSTEM INTERFACE ${PHONENUMBER_INCLUDE_DIR})
target_link_libraries(kyn_phonenumber INTERFACE ${PHONENUMBER_LIBRARY})

# stb_image, as Debian builds it into libstb.
find_path(STB_INCLUDE_DIR stb/stb_image.h REQUIRED)
find_library(STB_LIBRARY stb REQUIRED)
add_library(kyn_stb INTERFACE)
target_include_directories(kyn_stb SYSTEM INTERFACE ${STB_INCLUDE_DIR})
target_link_libraries(kyn_stb INTERFACE ${STB_LIBRARY})

# GeographicLib: Debian ships only a find module outside CMake's path.
find_path(GEOGRAPHICLIB_INCLUDE_DIR GeographicLib/Geodesic.hpp REQUIRED)
find_library(GEOGRAPHICLIB_LIBRARY GeographicLib REQUIRED)
add_library(kyn_geographiclib INTERFACE)
target_include_directories(kyn_geographiclib SYSTEM INTERFACE ${GEOGRAPHICLIB_INCLUDE_DIR})
target_link_libraries(kyn_geographiclib INTERFACE ${GEOGRAPHICLIB_LIBRARY})
