// SPDX-License-Identifier: GPL-2.0-or-later
// A folder of a measuring program's own, below FILEINDEXD_BENCH_DIR or else the working folder, so
// that the disk is one that was chosen; removed with all it holds.
#pragma once

#include <string>

namespace fileindexd {

class ScratchFolder {
 public:
  // Ends the program where the folder cannot be made.
  ScratchFolder();
  ScratchFolder(const ScratchFolder&) = delete;
  ScratchFolder& operator=(const ScratchFolder&) = delete;
  ~ScratchFolder();

  std::string path;  // absolute
};

}  // namespace fileindexd
