// SPDX-License-Identifier: GPL-2.0-or-later
// The service's socket, root only; see state/notifier.h for what is said there. Nothing here waits,
// whatever a client does.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include "notify/request.h"

namespace fileindexd {

// One thread.
class Server {
 public:
  Server();
  ~Server();  // removes the socket if this process made it
  Server(const Server&) = delete;
  Server& operator=(const Server&) = delete;

  // Makes the socket, replacing one that is left over. False, and `error` then says why.
  bool Open(std::string& error);

  // Readable when Serve has something to do; an epoll descriptor over all clients.
  int Descriptor() const;
  // Takes in what clients sent; complete requests that make sense are returned, others are answered
  // with what is wrong. At most 64 clients; one that does not send its request within 5 s, or takes
  // nothing of its answer for as long, is dropped when another needs its place.
  std::vector<Request> Serve();

  // Answers, with one JSON object on one line, and hangs up. One that has gone is passed over.
  void Answer(uint64_t client, const std::string& reply);
  bool IsWaiting(uint64_t client) const;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl;
};

}  // namespace fileindexd
