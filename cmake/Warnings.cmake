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
  # What g++ 12 reports of inlined strings and vectors is not there: overlapping copies in operator+ of a
  # literal and a string, writes behind the end of a buffer that has just been made longer, an empty std::optional that
  # is used. clang-tidy looks for what is used before it is set.
  target_compile_options(pinwell_warnings INTERFACE -Wno-restrict -Wno-maybe-uninitialized)
  set(pinwell_test_warnings -Wno-array-bounds -Wno-stringop-overflow)
endif()
