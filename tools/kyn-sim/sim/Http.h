#pragma once

// The system's HTTP library is a shared library built with TLS, zlib and brotli support; its
// classes change layout with these switches, so they must match (the pkg-config flags set them).
#if !defined(CPPHTTPLIB_OPENSSL_SUPPORT) || !defined(CPPHTTPLIB_ZLIB_SUPPORT) || !defined(CPPHTTPLIB_BROTLI_SUPPORT)
#error "build with the compile flags of pkg-config's cpp-httplib"
#endif
#include <httplib.h>
