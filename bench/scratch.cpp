// SPDX-License-Identifier: GPL-2.0-or-later
#include "bench/scratch.h"

#include <cstdlib>
#include <filesystem>
#include <system_error>

#include "bench/measure.h"

namespace fileindexd {

ScratchFolder::ScratchFolder() {
  const char* chosen = getenv("FILEINDEXD_BENCH_DIR");  // NOLINT(concurrency-mt-unsafe): one thread
  std::error_code error;
  const std::filesystem::path above =
      std::filesystem::canonical(chosen != nullptr ? chosen : ".", error);
  path = (above / "fileindexd-bench-XXXXXX").string();
  if (error || mkdtemp(path.data()) == nullptr) {
    Fail("cannot make a folder like " + path);
  }
}

ScratchFolder::~ScratchFolder() {
  std::error_code ignored;  // what stays is a folder that says whose it was
  std::filesystem::remove_all(path, ignored);
}

}  // namespace fileindexd
