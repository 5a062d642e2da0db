# SPDX-License-Identifier: GPL-2.0-or-later
# add_process_tests(LABEL file…): one ctest entry for each Python file.
#
# Each file runs the built programs in namespaces of its own, so they may run side by side.
find_program(PYTHON3 python3 REQUIRED)

function(add_process_tests label)
  if(NOT TARGET fileindexd)
    return()  # the modules alone are built
  endif()
  foreach(file IN LISTS ARGN)
    string(REGEX REPLACE "_test\\.py$" "" name "${file}")
    string(REPLACE "/" "_" name "${label}_${name}")
    add_test(NAME ${name} COMMAND "${PYTHON3}" "${CMAKE_CURRENT_SOURCE_DIR}/${file}")
    set_tests_properties(${name} PROPERTIES
      LABELS ${label} TIMEOUT ${FILEINDEXD_TEST_TIMEOUT} SKIP_RETURN_CODE 77
      ENVIRONMENT "FILEINDEXD_BIN_DIR=$<TARGET_FILE_DIR:fileindexd>;PYTHONPATH=${PROJECT_SOURCE_DIR}/tests/process;PYTHONDONTWRITEBYTECODE=1")
  endforeach()
endfunction()
