# SPDX-License-Identifier: GPL-2.0-or-later
# Readers for documents that are more than text.
pkg_check_modules(EXTRACT_DOCUMENTS REQUIRED IMPORTED_TARGET
  poppler-cpp libarchive libxml-2.0 gmime-3.0 libgsf-1)

add_library(extract_documents STATIC
  archive.cpp
  memory_file.cpp
  nested.cpp
  pdf.cpp
  unpacker.cpp
  utf16.cpp)
target_link_libraries(extract_documents PUBLIC extract_sink PRIVATE project_flags PkgConfig::EXTRACT_DOCUMENTS)
check_headers(extract_documents memory_file.h nested.h unpacker.h utf16.h)
