// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/memory_file.h"

#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "extract/read_at.h"

namespace fileindexd {

bool MemoryFile::Open() {
  ScopedFd made(memfd_create("member", MFD_CLOEXEC));
  file.Swap(made);
  size = 0;
  return file.fd >= 0;
}

bool MemoryFile::Append(std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t written = pwrite(file.fd, bytes.data(), bytes.size(), size);
    if (written < 0 && errno == EINTR) {
      continue;
    }
    if (written <= 0) {
      return false;
    }
    size += written;
    bytes.remove_prefix(static_cast<size_t>(written));
  }
  return true;
}

Document MemoryFile::AsDocument(const std::string& name, int depth) const {
  return {file.fd, name, size, depth};
}

bool ReadWhole(const Document& document, int64_t limit, std::string& bytes, std::string& why) {
  // The size on record only saves growing: the file may have changed since.
  std::string read_bytes;
  if (document.size > limit) {
    why = "too big";
    return false;
  }
  constexpr size_t STEP = 256 * 1024;
  size_t length = 0;
  read_bytes.resize(static_cast<size_t>(std::max<int64_t>(document.size, 0)) + 1);
  for (;;) {
    if (length == read_bytes.size()) {
      read_bytes.resize(length + STEP);
    }
    const size_t room = read_bytes.size() - length;
    const size_t got =
        ReadAt(document, static_cast<int64_t>(length), read_bytes.data() + length, room);
    if (got < room && errno != 0) {
      why = "cannot be read";
      return false;
    }
    length += got;
    if (static_cast<int64_t>(length) > limit) {
      why = "too big";
      return false;
    }
    if (got < room) {
      break;
    }
  }
  if (length == 0) {
    why = "empty";
    return false;
  }
  read_bytes.resize(length);
  bytes.swap(read_bytes);
  return true;
}

std::string FirstBytes(const Document& document, size_t count) {
  std::string bytes(count, '\0');
  bytes.resize(ReadAt(document, 0, bytes.data(), count));
  return bytes;
}

}  // namespace fileindexd
