# Every target of ours is built with these; third-party headers come in as SYSTEM and are exempt.
add_library(pinwell_warnings INTERFACE)
target_compile_options(pinwell_warnings INTERFACE
  -Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion -Wshadow
  $<$<COMPILE_LANGUAGE:CXX>:-Wold-style-cast>
  $<$<BOOL:${PINWELL_WERROR}>:-Werror>)
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
  # What g++ 12 reports of inlined strings and vectors at -O3 is not there: overlapping copies in operator+ of a
  # literal and a string, writes behind the end of a buffer that has just been made longer.
  target_compile_options(pinwell_warnings INTERFACE -Wno-restrict)
  set(pinwell_test_warnings -Wno-array-bounds -Wno-stringop-overflow)
endif()
