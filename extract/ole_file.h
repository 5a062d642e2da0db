// SPDX-License-Identifier: GPL-2.0-or-later
// Compound files: the streams of a document from before the time of ZIP and XML.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "extract/document_stream.h"
#include "extract/format.h"

struct _GsfInfile;  // NOLINT(bugprone-reserved-identifier): as the library has it

namespace fileindexd {

class OleFile {
 public:
  OleFile() = default;
  ~OleFile();
  OleFile(const OleFile&) = delete;
  OleFile& operator=(const OleFile&) = delete;

  // False, with `why`, where the document is no compound file. It must outlive this object.
  bool Open(const Document& document, std::string& why);
  bool Has(const char* stream) const;
  // The stream's bytes, up to MAX_STREAM of them, or up to where it is damaged; empty: there is
  // none.
  std::string Stream(const char* stream) const;
  // Title, author and the like.
  void SetSummary(ContentSink& sink) const;

  static constexpr size_t MAX_STREAM = 128 << 20;

 private:
  std::optional<DocumentStream> file;
  _GsfInfile* infile = nullptr;  // NOLINT(bugprone-reserved-identifier): the library's own name
};

}  // namespace fileindexd
