// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/standalone/read_log.h"

#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/un.h>

#include <csignal>
#include <cstring>

namespace fileindexd {

namespace {

constexpr sockaddr_un LOG_ADDRESS = {AF_UNIX, "/dev/log"};

bool HideDevices() {
  return mount("tmpfs", "/dev", "tmpfs", 0, nullptr) == 0 &&
         mknod("/dev/null", S_IFCHR | 0666, makedev(1, 3)) == 0 &&
         mknod("/dev/urandom", S_IFCHR | 0666, makedev(1, 9)) == 0;
}

}  // namespace

ReadLog::ReadLog() : socket_fd(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
  const auto* address = reinterpret_cast<const sockaddr*>(&LOG_ADDRESS);
  ready = HideDevices() && bind(socket_fd.fd, address, sizeof(LOG_ADDRESS)) == 0;
  if (!ready) {
    return;
  }

  reader = std::thread([this] {
    char line[8192];
    while (!end) {
      if (recv(socket_fd.fd, line, sizeof(line), 0) > 0) {
        ++lines;
      }
    }
  });
}

ReadLog::~ReadLog() {
  if (!ready) {
    return;
  }
  end = true;
  const ScopedFd last(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const auto* address = reinterpret_cast<const sockaddr*>(&LOG_ADDRESS);
  (void)sendto(last.fd, "", 0, 0, address, sizeof(LOG_ADDRESS));
  reader.join();
  umount2("/dev", MNT_DETACH);
}

}  // namespace fileindexd
