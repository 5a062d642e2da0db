// SPDX-License-Identifier: GPL-2.0-or-later
// A document as a stream of the C library, for libraries that want one.
#pragma once

#include <cstdio>

#include "extract/format.h"

namespace fileindexd {

// The document must outlive it. What fails meanwhile is noted as the document's fault at the end.
class DocumentStream {
 public:
  explicit DocumentStream(const Document& read_document);
  ~DocumentStream();
  DocumentStream(const DocumentStream&) = delete;
  DocumentStream& operator=(const DocumentStream&) = delete;

  bool HasFailed() const { return stream == nullptr || ferror(stream) != 0; }

  FILE* stream;  // at the document's beginning; null: the host has no descriptor or memory left

 private:
  const Document& document;
};

}  // namespace fileindexd
