// SPDX-License-Identifier: GPL-2.0-or-later
// The input is what a client of the control socket sends before it goes.
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <exception>

#include "base/scoped_fd.h"
#include "daemon/daemon.h"
#include "fuzz/target.h"
#include "platform/log.h"
#include "scripted/script.h"

namespace fileindexd::fuzz {

namespace {

// A Daemon without shares that listens at an address that the kernel chooses.
class Server {
 public:
  Server() {
    daemon.socket_fd = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_un any = {};
    any.sun_family = AF_UNIX;
    const bool listening =
        bind(daemon.socket_fd, reinterpret_cast<sockaddr*>(&any), sizeof(any.sun_family)) == 0 &&
        listen(daemon.socket_fd, 1) == 0;
    length = sizeof(address);
    Require(listening &&
                getsockname(daemon.socket_fd, reinterpret_cast<sockaddr*>(&address), &length) == 0,
            "a socket");
    Require(daemon.SetupInotify() && daemon.SetupWorkers(), "a daemon");
  }

  void Serve(const uint8_t* data, size_t size) {
    const ScopedFd client(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    Require(connect(client.fd, reinterpret_cast<const sockaddr*>(&address), length) == 0,
            "a connection");
    Require(write(client.fd, data, size) == static_cast<ssize_t>(size), "room for the request");
    shutdown(client.fd, SHUT_WR);

    bool thrown = false;
    try {
      daemon.HandleCommand();
    } catch (const std::exception&) {
      thrown = true;  // the main loop's to catch
    }

    int32_t reply = 1;
    const ssize_t got = read(client.fd, &reply, sizeof(reply));
    Require(thrown ? got <= 0 : got == sizeof(reply), "one reply, or none after an exception");
    Require(thrown || reply == 0 || reply == -1, "a reply that exists");
    Require(daemon.workers.empty(), "no Worker without a share");
    TALO::FILEINDEX::LOG_LEVEL = LOG_LEVEL_ERROR;
    scripted::TheScript().Forget();
  }

 private:
  Daemon daemon;
  sockaddr_un address = {};
  socklen_t length = 0;
};

}  // namespace

}  // namespace fileindexd::fuzz

int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static fileindexd::fuzz::Server server;
  server.Serve(data, size);
  return 0;
}
