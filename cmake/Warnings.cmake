# Every target of ours is built with these; third-party headers come in as SYSTEM and are exempt.
add_library(pinwell_warnings INTERFACE)
target_compile_options(pinwell_warnings INTERFACE
  -Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion -Wshadow
  $<$<COMPILE_LANGUAGE:CXX>:-Wold-style-cast>
  $<$<BOOL:${PINWELL_WERROR}>:-Werror>)
