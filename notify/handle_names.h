// SPDX-License-Identifier: GPL-2.0-or-later
// From the handles of directories to their paths.
#pragma once

#include <fcntl.h>

#include <string>
#include <string_view>
#include <unordered_map>

namespace fileindexd {

// One thread. Needs CAP_DAC_READ_SEARCH.
class HandleNames {
 public:
  enum class Result {
    NAMED,
    GONE,      // there is no such directory any more
    TOO_LONG,  // its path has more than 4095 bytes: `path` is that of the deepest directory above
               // it that can be named
    FAILED,    // errno tells
  };
  struct Name {
    Result result = Result::FAILED;
    std::string path;  // within the file system, normal
  };

  // `mount_fd` is of a directory in a mount that shows the whole file system; not owned.
  explicit HandleNames(int mount_fd) : mount(mount_fd) {}

  // The directory's path as it was when this handle was asked for first since the last Forget. The
  // handle stays in memory until then; so long lives the result.
  const Name& Find(file_handle& handle);
  void Forget() { names.clear(); }

  // Whether handles of this file system can be turned into paths at all. False, and `error` then
  // names the call and the reason.
  static bool Work(int mount_fd, std::string& error);

 private:
  Name Resolve(file_handle& handle) const;

  int mount;
  // By the bytes of the handle, which are not copied: they lie in the buffer of events.
  std::unordered_map<std::string_view, Name> names;
};

}  // namespace fileindexd
