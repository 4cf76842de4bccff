# Warning flags shared by every target of the project.
add_library(kyn_warnings INTERFACE)
target_compile_options(kyn_warnings INTERFACE
  -Wall -Wextra -Wpedantic -Wshadow -Wnon-virtual-dtor -Woverloaded-virtual
  -Wimplicit-fallthrough -Wformat=2)
if(KYN_WERROR)
  target_compile_options(kyn_warnings INTERFACE -Werror)
endif()
