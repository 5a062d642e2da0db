# SPDX-License-Identifier: GPL-2.0-or-later
# add_unit_test(NAME LIBS lib… SOURCES file…): one GoogleTest program, one ctest entry for each program.
#
# Whole programs, not single cases, are ctest's entries: starting a process for each of a thousand
# cases would cost more than the cases do.
#
# THREADS says that the program has more than one of them: the others have nothing to show to the
# thread sanitizer, and are built for it by name alone.
function(add_unit_test name)
  cmake_parse_arguments(arg "THREADS" "" "LIBS;SOURCES;LABELS" ${ARGN})
  add_executable(${name} ${arg_SOURCES})
  target_link_libraries(${name} PRIVATE project_flags ${arg_LIBS} GTest::gtest_main GTest::gmock)
  set_target_properties(${name} PROPERTIES IS_TEST ON
    RUNTIME_OUTPUT_DIRECTORY "${PROJECT_BINARY_DIR}/tests-bin")
  if(FILEINDEXD_SANITIZE STREQUAL "thread" AND NOT arg_THREADS)
    set_target_properties(${name} PROPERTIES EXCLUDE_FROM_ALL ON)
    return()
  endif()
  add_test(NAME ${name} COMMAND ${name} --gtest_brief=1)
  if(NOT arg_LABELS)
    set(arg_LABELS unit)
  endif()
  set_tests_properties(${name} PROPERTIES TIMEOUT ${FILEINDEXD_TEST_TIMEOUT}
    LABELS "${arg_LABELS}")
endfunction()

# add_long_test(NAME PROGRAM [option…]): one more entry for a unit test, with all that takes its
# time; the program's own entry stays short however the tests are run.
function(add_long_test name program)
  if(NOT TEST ${program})
    return()
  endif()
  add_test(NAME ${name} COMMAND ${program} --gtest_brief=1 ${ARGN})
  set_tests_properties(${program} PROPERTIES ENVIRONMENT FILEINDEXD_TEST_SCALE=normal)
  set_tests_properties(${name} PROPERTIES
    LABELS long TIMEOUT 14400 ENVIRONMENT FILEINDEXD_TEST_SCALE=long)
endfunction()

# add_test_library(NAME LIBS lib… SOURCES file…): what several of these programs have in common.
function(add_test_library name)
  cmake_parse_arguments(arg "" "" "LIBS;SOURCES" ${ARGN})
  add_library(${name} STATIC ${arg_SOURCES})
  target_link_libraries(${name} PUBLIC ${arg_LIBS} GTest::gtest PRIVATE project_flags)
  set_target_properties(${name} PROPERTIES IS_TEST ON)
endfunction()
