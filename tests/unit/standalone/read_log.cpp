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
constexpr size_t LONGEST_LINE = 8192;

bool HideDevices() {
  return mount("tmpfs", "/dev", "tmpfs", 0, nullptr) == 0 &&
         mknod("/dev/null", S_IFCHR | 0666, makedev(1, 3)) == 0 &&
         mknod("/dev/urandom", S_IFCHR | 0666, makedev(1, 9)) == 0;
}

}  // namespace

LogSocket::LogSocket() : fd(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0)) {
  const auto* address = reinterpret_cast<const sockaddr*>(&LOG_ADDRESS);
  ready = HideDevices() && bind(fd.fd, address, sizeof(LOG_ADDRESS)) == 0;
}

LogSocket::~LogSocket() {
  if (ready) {
    umount2("/dev", MNT_DETACH);
  }
}

std::vector<std::string> LogSocket::Take() {
  std::vector<std::string> lines;
  char line[LONGEST_LINE];
  ssize_t length = 0;
  while ((length = recv(fd.fd, line, sizeof(line), MSG_DONTWAIT)) > 0) {
    lines.emplace_back(line, static_cast<size_t>(length));
  }
  return lines;
}

ReadLog::ReadLog() {
  if (!socket.ready) {
    return;
  }

  reader = std::thread([this] {
    char line[LONGEST_LINE];
    while (!end) {
      if (recv(socket.fd.fd, line, sizeof(line), 0) > 0) {
        ++lines;
      }
    }
  });
}

ReadLog::~ReadLog() {
  if (!socket.ready) {
    return;
  }
  end = true;
  const ScopedFd last(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const auto* address = reinterpret_cast<const sockaddr*>(&LOG_ADDRESS);
  (void)sendto(last.fd, "", 0, 0, address, sizeof(LOG_ADDRESS));
  reader.join();
}

}  // namespace fileindexd
