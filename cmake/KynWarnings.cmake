# Warning flags shared by every target of the project.
add_library(kyn_warnings INTERFACE)
target_compile_options(kyn_warnings INTERFACE
  -Wall -Wextra -Wpedantic -Wshadow -Wnon-virtual-dtor -Woverloaded-virtual
  -Wimplicit-fallthrough -Wformat=2)
if(KYN_WERROR)
  target_compile_options(kyn_warnings INTERFACE -Werror)
endif()
# GCC 12 reports impossible sizes for inlined std::string copies whenever it optimises, the
# sanitizer builds at -O1 included (its bugs 105329 and 105651). Those warnings are false there, so
# they are off for GCC 12; clang's builds keep them.
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_GREATER_EQUAL 12)
  target_compile_options(kyn_warnings INTERFACE -Wno-stringop-overflow -Wno-stringop-overread -Wno-restrict
                                                 -Wno-array-bounds)
endif()
