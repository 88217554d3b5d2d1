# Every target of ours is built with these; third-party headers come in as SYSTEM and are exempt.
add_library(pinwell_warnings INTERFACE)
target_compile_options(pinwell_warnings INTERFACE
  -Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion -Wshadow
  $<$<COMPILE_LANGUAGE:CXX>:-Wold-style-cast>
  $<$<BOOL:${PINWELL_WERROR}>:-Werror>)
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_UNITY_BUILD)
  # g++ takes a source file that is compiled together with others for a header, and warns of its local types.
  target_compile_options(pinwell_warnings INTERFACE $<$<COMPILE_LANGUAGE:CXX>:-Wno-subobject-linkage>)
endif()
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
  # g++ 12 reports faults in inlined strings and vectors that are not there: overlapping copies in operator+ of a
  # literal and a string, writes after the end of a buffer that has just been made longer.
  target_compile_options(pinwell_warnings INTERFACE -Wno-restrict)
  set(pinwell_test_warnings -Wno-array-bounds -Wno-stringop-overflow)
endif()
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  # g++ 12 to 14 report that the value of an empty std::optional is used where one is assigned. clang-tidy looks for
  # variables that are used before they are set.
  target_compile_options(pinwell_warnings INTERFACE -Wno-maybe-uninitialized)
endif()
