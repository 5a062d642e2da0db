// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/last_commit.h"

#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <charconv>
#include <cstdio>
#include <new>
#include <system_error>

#include "base/scoped_fd.h"

namespace fileindexd {

namespace {

constexpr size_t NOTE_SIZE = 20;
constexpr int FLAGS = O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK;  // a pipe may stand in its place

std::string NotePath(const std::string& index_path) {
  return index_path + "/last-commit";
}

}  // namespace

// Always as long as before, and written over in one call: it is never seen half.
void NoteLastCommit(const std::string& index_path, int64_t number) {
  try {
    const ScopedFd note(open(NotePath(index_path).c_str(), O_WRONLY | O_CREAT | FLAGS, 0600));
    std::array<char, NOTE_SIZE + 1> text{};
    (void)snprintf(text.data(), text.size(), "%019lld\n", static_cast<long long>(number));
    if (note.fd >= 0) {
      (void)!pwrite(note.fd, text.data(), NOTE_SIZE, 0);
    }
  } catch (const std::bad_alloc&) {  // for the path
  }
}

int64_t NotedCommit(const std::string& index_path) {
  const ScopedFd note(open(NotePath(index_path).c_str(), O_RDONLY | FLAGS));
  std::array<char, NOTE_SIZE> text{};
  if (note.fd < 0 || pread(note.fd, text.data(), text.size(), 0) != NOTE_SIZE) {
    return 0;
  }
  int64_t number = 0;
  const char* end = text.data() + NOTE_SIZE - 1;
  const auto [stopped, failed] = std::from_chars(text.data(), end, number);
  return failed == std::errc() && stopped == end && *end == '\n' ? number : 0;
}

}  // namespace fileindexd
