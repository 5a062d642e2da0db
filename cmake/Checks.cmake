# SPDX-License-Identifier: GPL-2.0-or-later
# check_headers(TARGET header…): every header compiles alone.
function(check_headers target)
  add_library(${target}_headers OBJECT)
  target_link_libraries(${target}_headers PRIVATE ${target} project_flags)
  foreach(header IN LISTS ARGN)
    file(RELATIVE_PATH path "${PROJECT_SOURCE_DIR}" "${CMAKE_CURRENT_SOURCE_DIR}/${header}")
    string(MAKE_C_IDENTIFIER "${path}" id)
    set(source "${CMAKE_CURRENT_BINARY_DIR}/check_${id}.cpp")
    file(CONFIGURE OUTPUT "${source}" CONTENT "#include \"${path}\"\n")
    target_sources(${target}_headers PRIVATE "${source}")
  endforeach()
endfunction()
