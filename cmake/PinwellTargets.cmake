# The three kinds of target in this tree. All targets of a kind are built in the same way.

# pinwell_library(NAME SOURCES...): the static library of one folder. Its headers are included as
# "folder/header.h" from the folder above, which keeps every dependency visible in the source.
function(pinwell_library name)
  add_library(${name} STATIC ${ARGN})
  target_include_directories(${name} PUBLIC ${CMAKE_CURRENT_SOURCE_DIR}/..)
  target_link_libraries(${name} PRIVATE pinwell_warnings pinwell_hardening PUBLIC pinwell_sanitizers)
endfunction()

# pinwell_executable(NAME SOURCES...): a program, in <build>/bin.
function(pinwell_executable name)
  add_executable(${name} ${ARGN})
  target_link_libraries(${name} PRIVATE pinwell_warnings pinwell_hardening pinwell_sanitizers)
endfunction()

# pinwell_test(NAME [WHOLE] [SHARDS COUNT] [SLOW] [THREADS] [TIMEOUT SECONDS] SOURCES...): a GoogleTest program.
# Every test in it is a test of ctest. With WHOLE the program is one test: for tables of many quick rows.
# PINWELL_WHOLE_TESTS does the same for a folder. SHARDS splits a whole program into this number of parts, which run
# side by side.
# SLOW gives its tests the label "slow": scripts/test leaves them out after an edit, and runs them for a release.
# THREADS gives a whole program the label "threads", and adds it to the target "threaded_tests": the tested code uses
# several threads, and ThreadSanitizer runs it.
function(pinwell_test name)
  cmake_parse_arguments(PARSE_ARGV 1 test "WHOLE;SLOW;THREADS" "TIMEOUT;SHARDS" "")
  if(PINWELL_WHOLE_TESTS OR test_SHARDS)
    set(test_WHOLE TRUE)
  endif()
  if(NOT test_TIMEOUT AND test_WHOLE)
    set(test_TIMEOUT 600)
  elseif(NOT test_TIMEOUT)
    set(test_TIMEOUT 120)
  endif()
  set(properties TIMEOUT ${test_TIMEOUT})
  set(labels)
  if(test_SLOW)
    list(APPEND labels slow)
  endif()
  if(test_THREADS)
    if(NOT test_WHOLE)
      message(FATAL_ERROR "${name}: THREADS is for whole programs")
    endif()
    list(APPEND labels threads)
    if(NOT TARGET threaded_tests)
      add_custom_target(threaded_tests)
    endif()
    add_dependencies(threaded_tests ${name})
  endif()
  add_executable(${name} ${test_UNPARSED_ARGUMENTS})
  set_target_properties(${name} PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${CMAKE_BINARY_DIR}/tests)
  target_compile_options(${name} PRIVATE ${pinwell_test_warnings})
  target_link_libraries(${name} PRIVATE pinwell_warnings pinwell_sanitizers test_support
                        GTest::gmock GTest::gtest_main)
  if(test_SHARDS)
    foreach(shard RANGE 1 ${test_SHARDS})
      math(EXPR index "${shard} - 1")
      add_test(NAME ${name}.${shard} COMMAND ${name})
      set_tests_properties(${name}.${shard} PROPERTIES ${properties}
        ENVIRONMENT "GTEST_TOTAL_SHARDS=${test_SHARDS};GTEST_SHARD_INDEX=${index}" LABELS "${labels}")
    endforeach()
  elseif(test_WHOLE)
    add_test(NAME ${name} COMMAND ${name})
    set_tests_properties(${name} PROPERTIES ${properties} LABELS "${labels}")
  else()
    # By the names of parameters: their values may be long, or contain bytes that differ from run to run.
    gtest_discover_tests(${name} NO_PRETTY_VALUES DISCOVERY_MODE PRE_TEST PROPERTIES ${properties}
      LABELS "${labels}")
  endif()
endfunction()
