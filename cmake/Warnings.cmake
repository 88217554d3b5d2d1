# Every target of ours is built with these; third-party headers come in as SYSTEM and are exempt.
add_library(pinwell_warnings INTERFACE)
target_compile_options(pinwell_warnings INTERFACE
  -Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion -Wshadow
  $<$<COMPILE_LANGUAGE:CXX>:-Wold-style-cast>
  $<$<BOOL:${PINWELL_WERROR}>:-Werror>)
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
  # g++ 12 takes operator+ of a literal and a string for an overlapping copy when it optimises.
  target_compile_options(pinwell_warnings INTERFACE -Wno-restrict)
endif()
