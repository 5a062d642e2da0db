# SPDX-License-Identifier: GPL-2.0-or-later
# Readers for documents that are more than text.
pkg_check_modules(EXTRACT_DOCUMENTS REQUIRED IMPORTED_TARGET
  poppler-cpp libarchive libxml-2.0 gmime-3.0 libgsf-1)

add_library(extract_documents STATIC
  archive.cpp
  document_stream.cpp
  epub.cpp
  gobject.cpp
  iso_date.cpp
  mail.cpp
  mail_parts.cpp
  memory_file.cpp
  odf_words.cpp
  office_words.cpp
  office_zip.cpp
  old_office.cpp
  old_workbook_text.cpp
  ole_file.cpp
  pdf.cpp
  rtf.cpp
  rtf_tokens.cpp
  slides_text.cpp
  unpacker.cpp
  word_text.cpp
  workbook_records.cpp
  workbook_text.cpp
  xml_part.cpp)
target_link_libraries(extract_documents
  PUBLIC extract_answer extract_text PkgConfig::EXTRACT_DOCUMENTS
  PRIVATE extract_readers project_flags)
check_headers(extract_documents
  document_stream.h gobject.h iso_date.h little_endian.h mail_parts.h memory_file.h nested.h office_words.h
  old_office.h ole_file.h rtf_tokens.h unpacker.h utf16.h workbook_records.h xml_part.h)
