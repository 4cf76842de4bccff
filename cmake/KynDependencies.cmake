# Third-party libraries, all from Debian's packages (scripts/install-deps installs them).
find_package(Threads REQUIRED)
find_package(nlohmann_json 3.11 REQUIRED)
find_package(CURL REQUIRED)
find_package(ICU 72 REQUIRED COMPONENTS uc i18n data)
find_package(OpenSSL REQUIRED)
find_package(PkgConfig REQUIRED)
pkg_check_modules(SYSTEMD REQUIRED IMPORTED_TARGET libsystemd)

find_program(KYN_GENRB genrb REQUIRED)
find_program(KYN_PKGDATA pkgdata REQUIRED)
find_program(KYN_GENCCODE genccode REQUIRED)
