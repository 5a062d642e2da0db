# SPDX-License-Identifier: GPL-2.0-or-later
# Readers for documents that are more than text.
pkg_check_modules(EXTRACT_DOCUMENTS REQUIRED IMPORTED_TARGET
  poppler-cpp libarchive libxml-2.0 gmime-3.0 libgsf-1)

add_library(extract_documents STATIC
  archive.cpp
  epub.cpp
  iso_date.cpp
  memory_file.cpp
  nested.cpp
  old_office.cpp
  ole_file.cpp
  odf_words.cpp
  office_words.cpp
  office_zip.cpp
  pdf.cpp
  slides_text.cpp
  unpacker.cpp
  word_text.cpp
  workbook_text.cpp
  utf16.cpp
  xml_part.cpp)
target_link_libraries(extract_documents
  PUBLIC extract_sink PkgConfig::EXTRACT_DOCUMENTS PRIVATE project_flags)
check_headers(extract_documents 
  iso_date.h memory_file.h nested.h little_endian.h office_words.h old_office.h ole_file.h unpacker.h utf16.h xml_part.h)
