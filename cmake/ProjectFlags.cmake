# SPDX-License-Identifier: GPL-2.0-or-later
# The one place for compiler flags: every target links `project_flags`.
set(FILEINDEXD_SANITIZE "" CACHE STRING "Value of -fsanitize=, empty for none")
option(FILEINDEXD_FUZZ "Instrument for clang's fuzzer" OFF)
option(FILEINDEXD_COVERAGE "Instrument for gcov" OFF)
option(FILEINDEXD_HARDEN "Fortified, position independent, read-only relocations" OFF)

find_package(Threads REQUIRED)

add_library(project_flags INTERFACE)
target_include_directories(project_flags INTERFACE "${PROJECT_SOURCE_DIR}")
target_compile_features(project_flags INTERFACE cxx_std_20)
target_compile_definitions(project_flags INTERFACE
  _GNU_SOURCE _FILE_OFFSET_BITS=64 _TIME_BITS=64)
# Not -Wpedantic: it rejects "%m", which every log line uses.
# The prefix map makes __FILE__ the path from the project's root, as the log shows it.
target_compile_options(project_flags INTERFACE
  -Wall -Wextra -Wshadow -Wformat=2 -Wconversion
  "-fmacro-prefix-map=${PROJECT_SOURCE_DIR}/=")
target_link_libraries(project_flags INTERFACE Threads::Threads)

# Tests are compiled far more often than they run.
target_compile_options(project_flags INTERFACE $<$<BOOL:$<TARGET_PROPERTY:IS_TEST>>:-O0>)

if(FILEINDEXD_SANITIZE)
  target_compile_options(project_flags INTERFACE
    "-fsanitize=${FILEINDEXD_SANITIZE}" -fno-sanitize-recover=all -fno-omit-frame-pointer -g1
    $<$<NOT:$<BOOL:$<TARGET_PROPERTY:IS_TEST>>>:-O1>)
  target_link_options(project_flags INTERFACE "-fsanitize=${FILEINDEXD_SANITIZE}")
endif()
if(FILEINDEXD_FUZZ)
  target_compile_options(project_flags INTERFACE -fsanitize=fuzzer-no-link)
endif()
if(FILEINDEXD_COVERAGE)
  target_compile_options(project_flags INTERFACE --coverage)
  target_link_options(project_flags INTERFACE --coverage)
endif()
if(FILEINDEXD_HARDEN)
  target_compile_options(project_flags INTERFACE
    -U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=2 -fstack-protector-strong -fPIE)
  target_link_options(project_flags INTERFACE -pie -Wl,-z,relro,-z,now)
endif()
