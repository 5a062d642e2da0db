// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/left_out.h"

#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <cerrno>

#include "base/scoped_fd.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

std::string LeftOutPath() {
  return StateRoot() + "/contents-left-out";
}

}  // namespace

bool WriteLeftOut(const std::string& left_out) {
  const std::string path = LeftOutPath();
  if (left_out.empty()) {
    return unlink(path.c_str()) == 0 || errno == ENOENT;
  }

  const std::string fresh = path + ".new";
  (void)unlink(fresh.c_str());  // left by one that was killed
  const std::string line = left_out + "\n";
  const ScopedFd file(open(fresh.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  return file.fd >= 0 &&
         write(file.fd, line.data(), line.size()) == static_cast<ssize_t>(line.size()) &&
         rename(fresh.c_str(), path.c_str()) == 0;
}

std::string ReadLeftOut() {
  std::array<char, 4096> buffer = {};
  const ScopedFd file(open(LeftOutPath().c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC));
  const ssize_t length = file.fd < 0 ? 0 : read(file.fd, buffer.data(), buffer.size());
  std::string text(buffer.data(), length > 0 ? static_cast<size_t>(length) : 0);
  return text.substr(0, text.find('\n'));
}

}  // namespace fileindexd
