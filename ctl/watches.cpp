// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/watches.h"

#include <sys/stat.h>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <system_error>

namespace fileindexd {

// The kernel shows each watch as a line "inotify wd:1 ino:5f2 sdev:…", with its numbers in
// hexadecimal digits. The device is left alone: btrfs shows another one there than stat tells.
bool IsUnwatched(pid_t pid, const std::string& path) {
  struct stat status {};
  if (stat(path.c_str(), &status) != 0) {
    return false;
  }

  std::error_code error;
  std::filesystem::directory_iterator files("/proc/" + std::to_string(pid) + "/fdinfo", error);
  for (; !error && files != std::filesystem::directory_iterator(); files.increment(error)) {
    std::ifstream lines(files->path());
    for (std::string line; std::getline(lines, line);) {
      const size_t number = line.find(" ino:");
      if (line.starts_with("inotify wd:") && number != std::string::npos &&
          strtoull(line.c_str() + number + 5, nullptr, 16) == status.st_ino) {
        return false;
      }
    }
  }
  return !error;
}

}  // namespace fileindexd
