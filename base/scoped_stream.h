// SPDX-License-Identifier: GPL-2.0-or-later
// Owners of a stdio stream and of a directory stream, for early exits and for a thread that is
// cancelled. Both close functions may be cancellation points, hence noexcept(false).
#pragma once

#include <dirent.h>

#include <cstdio>
#include <utility>

namespace fileindexd {

// Owns a stdio stream; null is none.
class ScopedFile {
 public:
  explicit ScopedFile(FILE* owned = nullptr) : file(owned) {}
  ScopedFile(const ScopedFile&) = delete;
  ScopedFile& operator=(const ScopedFile&) = delete;
  ~ScopedFile() noexcept(false) { Close(); }

  void Close() {
    FILE* closing = std::exchange(file, nullptr);
    if (closing != nullptr) {
      (void)fclose(closing);  // only ever read from: nothing is lost when this fails
    }
  }

  FILE* file;
};

// Owns a directory stream; null is none.
class ScopedDir {
 public:
  explicit ScopedDir(DIR* owned = nullptr) : dir(owned) {}
  ScopedDir(const ScopedDir&) = delete;
  ScopedDir& operator=(const ScopedDir&) = delete;
  ~ScopedDir() noexcept(false) { Close(); }

  void Close() {
    DIR* closing = std::exchange(dir, nullptr);
    if (closing != nullptr) {
      closedir(closing);
    }
  }

  DIR* dir;
};

}  // namespace fileindexd
