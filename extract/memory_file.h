// SPDX-License-Identifier: GPL-2.0-or-later
// Files that have no name: bytes out of a container, handed to a reader that wants a descriptor.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include "base/scoped_fd.h"
#include "extract/format.h"

namespace fileindexd {

class MemoryFile {
 public:
  // Makes an empty one. False when the host has no memory or descriptor left.
  [[nodiscard]] bool Open();
  // False when the bytes do not fit into memory.
  [[nodiscard]] bool Append(std::string_view bytes);
  // The file as a reader takes it. Good as long as this object lives.
  Document AsDocument(const std::string& name, int depth) const;

  int64_t size = 0;

 private:
  ScopedFd file;
};

// Reads all of a document into memory. False where it cannot be read, is empty or longer than
// `limit`, and `why` then says so.
bool ReadWhole(const Document& document, int64_t limit, std::string& bytes, std::string& why);

// The first bytes of a document, at most `count`.
std::string FirstBytes(const Document& document, size_t count);

}  // namespace fileindexd
