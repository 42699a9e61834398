# Flags shared by every target of the tree, carried by an interface target so
# that they reach tests, benchmarks and fuzzers too.
add_library(tonebits_flags INTERFACE)
target_compile_options(tonebits_flags INTERFACE
  -ffp-contract=off -fno-fast-math
  -Wall -Wextra -Wpedantic -Wshadow -Wnon-virtual-dtor)
if(TONEBITS_WERROR)
  target_compile_options(tonebits_flags INTERFACE -Werror)
endif()
if(TONEBITS_FORCE_SCALAR)
  target_compile_definitions(tonebits_flags INTERFACE TONEBITS_FORCE_SCALAR=1)
endif()
if(TONEBITS_SANITIZE)
  set(_san -fsanitize=${TONEBITS_SANITIZE} -fno-omit-frame-pointer)
  if(TONEBITS_SANITIZE MATCHES "undefined")
    list(APPEND _san -fno-sanitize-recover=undefined)
  endif()
  target_compile_options(tonebits_flags INTERFACE ${_san})
  target_link_options(tonebits_flags INTERFACE ${_san})
endif()
if(TONEBITS_BUILD_FUZZ)
  # Coverage feedback from the library itself, not only from the fuzz drivers.
  target_compile_options(tonebits_flags INTERFACE -fsanitize=fuzzer-no-link)
endif()
