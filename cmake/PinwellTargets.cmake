# The three kinds of target in this tree. All targets of a kind are built in the same way.

# pinwell_library(NAME SOURCES...): the static library of one folder. It finds the public headers of the libraries that
# it links, as "library/header.h", and its own private headers, which are beside their sources, as "header.h". An include
# of anything else of ours does not compile.
function(pinwell_library name)
  add_library(${name} STATIC ${ARGN})
  target_link_libraries(${name} PRIVATE pinwell_warnings pinwell_hardening PUBLIC pinwell_sanitizers)
endfunction()

# pinwell_headers(LIBRARY HEADERS...): the public headers of a library, by the names in the includes of others. The files
# are in the folder include/ beside its sources.
function(pinwell_headers library)
  list(TRANSFORM ARGN PREPEND include/)
  target_sources(${library} PUBLIC FILE_SET HEADERS BASE_DIRS include FILES ${ARGN})
  target_include_directories(pinwell_insides INTERFACE ${CMAKE_CURRENT_SOURCE_DIR}/include)
endfunction()

# For tests, fuzz targets and benchmarks: all headers of ours, the private ones too. These have the names of their folders
# ("trust/chain_builder.h").
add_library(pinwell_insides INTERFACE)
target_include_directories(pinwell_insides INTERFACE ${PROJECT_SOURCE_DIR} ${PROJECT_SOURCE_DIR}/platform)

# pinwell_executable(NAME SOURCES...): a program, in <build>/bin.
function(pinwell_executable name)
  add_executable(${name} ${ARGN})
  target_link_libraries(${name} PRIVATE pinwell_warnings pinwell_hardening pinwell_sanitizers)
endfunction()

# The kinds of tests, each a label of ctest: each test has exactly one (scripts/check-test-kinds).
set(PINWELL_TEST_KINDS unit e2e volume install tooling)

# pinwell_tests_are(KIND): gives that kind to the tests of add_test in this folder that have none.
function(pinwell_tests_are kind)
  get_property(tests_here DIRECTORY PROPERTY TESTS)
  foreach(test IN LISTS tests_here)
    get_property(labels TEST ${test} PROPERTY LABELS)
    set(kinds ${labels})
    list(FILTER kinds INCLUDE REGEX "^(unit|e2e|volume|install|tooling)$")
    if(NOT kinds)
      set_property(TEST ${test} APPEND PROPERTY LABELS ${kind})
    endif()
  endforeach()
endfunction()

# pinwell_test(NAME [WHOLE] [SHARDS COUNT] [SLOW] [LONG] [THREADS] [VOLUMES FILTER] [SWEEPS FILTER]
# [TIMEOUT SECONDS] SOURCES...): a GoogleTest program of the kind PINWELL_TEST_KIND.
# Every test in it is a test of ctest. With WHOLE the program is one test: for tables of many quick rows.
# PINWELL_WHOLE_TESTS does the same for a folder. SHARDS splits a whole program into this number of parts, which run
# side by side.
# SLOW gives its tests the label "slow": scripts/test leaves them out after an edit, and runs them for a release. Without
# PINWELL_SLOW_TESTS the program has no tests, and is built only by its name.
# LONG starts a whole program before the others, because it takes longer than they do, or waits.
# THREADS gives a whole program the label "threads", and adds it to the target "threaded_tests": the tested code uses
# several threads, and ThreadSanitizer runs it.
# VOLUMES is a --gtest_filter for the tests of a whole program that mount volumes. They are the test NAME.volumes, of the
# kind "volume". Outside it, a test that mounts a volume fails (tests/support/volume.h).
# SWEEPS is a --gtest_filter for the long forms of a whole program's other tests. They are the test NAME.sweeps, with the
# label "slow".
function(pinwell_test name)
  cmake_parse_arguments(PARSE_ARGV 1 test "WHOLE;SLOW;LONG;THREADS" "TIMEOUT;SHARDS;VOLUMES;SWEEPS" "")
  if(NOT PINWELL_TEST_KIND IN_LIST PINWELL_TEST_KINDS)
    message(FATAL_ERROR "${name}: set PINWELL_TEST_KIND to one of ${PINWELL_TEST_KINDS}")
  endif()
  if(PINWELL_WHOLE_TESTS OR test_SHARDS OR test_VOLUMES OR test_SWEEPS)
    set(test_WHOLE TRUE)
  endif()
  if(NOT test_TIMEOUT AND test_WHOLE)
    set(test_TIMEOUT 600)
  elseif(NOT test_TIMEOUT)
    set(test_TIMEOUT 120)
  endif()
  set(properties TIMEOUT ${test_TIMEOUT})
  if(test_LONG)
    list(APPEND properties COST 100)
  endif()
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
  # These programs only start the tested executables, and the sanitizers' code would double the time to compile them.
  # ThreadSanitizer must see all code of a process, or it reports false races.
  if(PINWELL_TEST_KIND STREQUAL e2e AND NOT PINWELL_SANITIZE MATCHES thread)
    set_target_properties(${name} PROPERTIES PINWELL_UNSANITIZED ON)
  endif()
  if(test_SLOW AND NOT PINWELL_SLOW_TESTS)
    set_target_properties(${name} PROPERTIES EXCLUDE_FROM_ALL ON)
    return()
  endif()
  set(environment PINWELL_TEST_KIND=${PINWELL_TEST_KIND})
  if(test_VOLUMES)
    add_test(NAME ${name}.volumes COMMAND ${name})
    set(volume_labels volume ${labels})
    set_tests_properties(${name}.volumes PROPERTIES ${properties} LABELS "${volume_labels}"
      ENVIRONMENT "PINWELL_TEST_KIND=volume;GTEST_FILTER=${test_VOLUMES}")
  endif()
  list(PREPEND labels ${PINWELL_TEST_KIND})
  if(test_SWEEPS)
    add_test(NAME ${name}.sweeps COMMAND ${name})
    set(sweep_labels slow ${labels})
    list(REMOVE_DUPLICATES sweep_labels)
    set_tests_properties(${name}.sweeps PROPERTIES ${properties} LABELS "${sweep_labels}"
      ENVIRONMENT "${environment};GTEST_FILTER=${test_SWEEPS}")
  endif()
  set(others ${test_VOLUMES} ${test_SWEEPS})
  if(others)
    list(JOIN others ":" others)
    list(APPEND environment GTEST_FILTER=-${others})
  endif()
  if(test_SHARDS)
    list(APPEND environment GTEST_TOTAL_SHARDS=${test_SHARDS})
    foreach(shard RANGE 1 ${test_SHARDS})
      math(EXPR index "${shard} - 1")
      add_test(NAME ${name}.${shard} COMMAND ${name})
      set_tests_properties(${name}.${shard} PROPERTIES ${properties} LABELS "${labels}"
        ENVIRONMENT "${environment};GTEST_SHARD_INDEX=${index}")
    endforeach()
  elseif(test_WHOLE)
    add_test(NAME ${name} COMMAND ${name})
    set_tests_properties(${name} PROPERTIES ${properties} LABELS "${labels}" ENVIRONMENT "${environment}")
  else()
    # By the names of parameters: their values may be long, or contain bytes that differ from run to run.
    gtest_discover_tests(${name} NO_PRETTY_VALUES DISCOVERY_MODE PRE_TEST PROPERTIES ${properties})
    # It takes no properties that are lists.
    set(lists ${CMAKE_CURRENT_BINARY_DIR}/${name}_lists.cmake)
    file(WRITE ${lists} "if(${name}_TESTS)
  set_tests_properties(\${${name}_TESTS} PROPERTIES LABELS \"${labels}\" ENVIRONMENT \"${environment}\")
endif()
")
    set_property(DIRECTORY APPEND PROPERTY TEST_INCLUDE_FILES ${lists})
  endif()
endfunction()
