# Every target of ours is built with these warnings. Third-party headers are SYSTEM and exempt.
add_library(pinwell_warnings INTERFACE)
target_compile_options(pinwell_warnings INTERFACE
  -Wall -Wextra -Wpedantic -Wconversion -Wsign-conversion -Wshadow
  $<$<COMPILE_LANGUAGE:CXX>:-Wold-style-cast>
  $<$<BOOL:${PINWELL_WERROR}>:-Werror>)
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_UNITY_BUILD)
  # g++ treats a source file that is compiled together with others as a header, and warns of its local types.
  target_compile_options(pinwell_warnings INTERFACE $<$<COMPILE_LANGUAGE:CXX>:-Wno-subobject-linkage>)
endif()
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
  # g++ 12 reports false faults in inlined strings and vectors: overlapping copies in operator+ of a literal and a
  # string, and writes after the end of a buffer that has just grown.
  target_compile_options(pinwell_warnings INTERFACE -Wno-restrict)
  set(pinwell_test_warnings -Wno-array-bounds -Wno-stringop-overflow)
endif()
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU")
  # g++ 12 to 14 falsely report the use of an empty std::optional's value in an assignment. clang-tidy finds variables
  # that are used before they are set.
  target_compile_options(pinwell_warnings INTERFACE -Wno-maybe-uninitialized)
endif()
