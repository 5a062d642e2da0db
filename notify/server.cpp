// SPDX-License-Identifier: GPL-2.0-or-later
//
// DESIGN. A client's way:
//
//   READING --(newline)--> WAITING --(Answer)--> WRITING --(all is sent)--> gone
//      |                                            ^
//      +--(what makes no sense: the error)----------+
//
// and from everywhere, when it hangs up, to gone. While every place is taken nobody is taken in:
// who waits, waits in the kernel, and a timer tells when the next place can be had by force.
#include "notify/server.h"

#include <poll.h>
#include <sys/epoll.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/timerfd.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <chrono>
#include <cstring>
#include <map>
#include <string_view>
#include <system_error>

#include "base/scoped_fd.h"
#include "notify/log.h"
#include "notify/request.h"
#include "state/json_text.h"
#include "state/notifier.h"

namespace fileindexd {

namespace {

using Clock = std::chrono::steady_clock;

constexpr size_t MOST_CLIENTS = 64;
constexpr int BACKLOG = 128;
constexpr size_t LONGEST_REQUEST = size_t{64} << 10;
constexpr std::chrono::seconds PATIENCE(5);
constexpr std::chrono::milliseconds SHORTEST(10);  // between two looks for a place

// In the epoll descriptor; clients follow.
constexpr uint64_t LISTENER = 0;
constexpr uint64_t TIMER = 1;
constexpr uint64_t FIRST_CLIENT = 2;

struct Client {
  enum class State { READING, WAITING, WRITING } state = State::READING;
  ScopedFd socket;
  std::string request = {};
  std::string reply = {};        // what is not sent yet
  Clock::time_point since = {};  // it came, or took some of its reply
};

std::string Failure(const std::string& what) {
  return what + ": " + std::generic_category().message(errno);
}

std::string ErrorReply(const std::string& error) {
  return "{\"ok\":false,\"error\":" + JsonText(error) + "}";
}

// Of another user than the superuser or the service's own.
bool IsStranger(int client) {
  ucred peer = {};
  socklen_t size = sizeof(peer);
  return getsockopt(client, SOL_SOCKET, SO_PEERCRED, &peer, &size) != 0 ||
         (peer.uid != 0 && peer.uid != geteuid());
}

bool Watch(int epoll, int operation, int fd, uint64_t id, uint32_t events) {
  epoll_event event = {};
  event.events = events;
  event.data.u64 = id;
  return epoll_ctl(epoll, operation, fd, &event) == 0;
}

}  // namespace

struct Server::Impl {
  ~Impl();
  bool Open(std::string& error);

  void TakeIn();
  bool MakePlace();
  bool DoesAnybodyKnock() const;
  void SetListening(bool wanted);
  // The client may be gone after each of these.
  void Read(uint64_t id, Client& client, std::vector<Request>& complete);
  void Reply(uint64_t id, Client& client, const std::string& reply);
  void Write(uint64_t id, Client& client);
  void Drop(uint64_t id);

  ScopedFd epoll;
  ScopedFd listener;
  ScopedFd timer;
  std::map<uint64_t, Client> clients;
  uint64_t next_client = FIRST_CLIENT;
  bool is_listening = false;  // the listener is watched
  bool is_bound = false;
  struct stat bound = {};  // the socket's file
};

Server::Impl::~Impl() {
  struct stat found = {};
  // Somebody else's socket may have come in its place.
  if (is_bound && lstat(NOTIFIER_SOCKET, &found) == 0 && found.st_dev == bound.st_dev &&
      found.st_ino == bound.st_ino) {
    (void)unlink(NOTIFIER_SOCKET);
  }
}

bool Server::Impl::Open(std::string& error) {
  ScopedFd events(epoll_create1(EPOLL_CLOEXEC));
  ScopedFd ticking(timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC | TFD_NONBLOCK));
  ScopedFd opened(socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (events.fd < 0 || ticking.fd < 0 || opened.fd < 0) {
    error = Failure(NOTIFIER_SOCKET);
    return false;
  }

  // The file gets the mode that the socket has when it is bound: nobody meets it with another.
  if (fchmod(opened.fd, S_IRUSR | S_IWUSR) != 0 ||
      (unlink(NOTIFIER_SOCKET) != 0 && errno != ENOENT)) {
    error = Failure(NOTIFIER_SOCKET);
    return false;
  }

  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  strncpy(address.sun_path, NOTIFIER_SOCKET, sizeof(address.sun_path) - 1);
  if (bind(opened.fd, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0 ||
      lstat(NOTIFIER_SOCKET, &bound) != 0) {
    error = Failure(NOTIFIER_SOCKET);
    return false;
  }
  is_bound = true;
  if (listen(opened.fd, BACKLOG) != 0 ||
      !Watch(events.fd, EPOLL_CTL_ADD, opened.fd, LISTENER, EPOLLIN) ||
      !Watch(events.fd, EPOLL_CTL_ADD, ticking.fd, TIMER, EPOLLIN)) {
    error = Failure(NOTIFIER_SOCKET);
    return false;
  }

  is_listening = true;
  epoll.Swap(events);
  timer.Swap(ticking);
  listener.Swap(opened);
  return true;
}

// While it does not listen, a timer tells when to look again.
void Server::Impl::SetListening(bool wanted) {
  if (wanted != is_listening &&
      Watch(epoll.fd, EPOLL_CTL_MOD, listener.fd, LISTENER, wanted ? EPOLLIN : 0U)) {
    is_listening = wanted;
  }

  itimerspec next = {};
  if (!is_listening) {
    auto first = Clock::now() + PATIENCE;
    for (const auto& [id, client] : clients) {
      if (client.state != Client::State::WAITING) {
        first = std::min(first, client.since + PATIENCE);
      }
    }
    const auto left = std::max<std::chrono::nanoseconds>(first - Clock::now(), SHORTEST);
    next.it_value.tv_sec = static_cast<time_t>(left.count() / 1'000'000'000);
    next.it_value.tv_nsec =
        static_cast<decltype(next.it_value.tv_nsec)>(left.count() % 1'000'000'000);
  }
  (void)timerfd_settime(timer.fd, 0, &next, nullptr);  // cannot fail with these values
}

void Server::Impl::Drop(uint64_t id) {
  clients.erase(id);  // closing takes it out of the epoll descriptor
  if (!is_listening) {
    SetListening(true);
  }
}

// False when there is none: the one that has kept its place for longest without a word has to go,
// but only where somebody waits for it.
bool Server::Impl::MakePlace() {
  if (clients.size() < MOST_CLIENTS) {
    return true;
  }

  auto oldest = clients.end();
  for (auto client = clients.begin(); client != clients.end(); ++client) {
    if (client->second.state != Client::State::WAITING &&
        (oldest == clients.end() || client->second.since < oldest->second.since)) {
      oldest = client;
    }
  }
  if (oldest == clients.end() || oldest->second.since + PATIENCE > Clock::now()) {
    return false;
  }

  clients.erase(oldest);
  return true;
}

bool Server::Impl::DoesAnybodyKnock() const {
  pollfd knocking = {listener.fd, POLLIN, 0};
  return poll(&knocking, 1, 0) == 1;
}

void Server::Impl::TakeIn() {
  while (DoesAnybodyKnock()) {
    if (!MakePlace()) {
      SetListening(false);
      return;
    }

    ScopedFd accepted(accept4(listener.fd, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
    if (accepted.fd < 0 && (errno == EINTR || errno == ECONNABORTED || errno == EAGAIN)) {
      continue;
    }
    if (accepted.fd < 0) {  // no descriptor is left, or no memory: a little later there may be
      LogError("%s: accept: %m", NOTIFIER_SOCKET);
      SetListening(false);
      return;
    }
    if (IsStranger(accepted.fd)) {
      continue;
    }

    const uint64_t id = next_client++;
    if (!Watch(epoll.fd, EPOLL_CTL_ADD, accepted.fd, id, EPOLLIN)) {
      LogError("%s: epoll: %m", NOTIFIER_SOCKET);
      continue;
    }
    Client& client = clients[id];
    client.socket.Swap(accepted);
    client.since = Clock::now();
  }
  SetListening(true);
}

void Server::Impl::Read(uint64_t id, Client& client, std::vector<Request>& complete) {
  std::array<char, 16384> buffer;
  while (client.request.size() <= LONGEST_REQUEST) {
    const ssize_t count = recv(client.socket.fd, buffer.data(), buffer.size(), MSG_DONTWAIT);
    if (count < 0 && errno == EINTR) {
      continue;
    }
    if (count < 0 && errno == EAGAIN) {
      return;
    }
    if (count <= 0) {
      Drop(id);
      return;
    }

    const std::string_view part(buffer.data(), static_cast<size_t>(count));
    const size_t end = part.find('\n');
    client.request.append(part.substr(0, end));
    if (end != std::string_view::npos && client.request.size() <= LONGEST_REQUEST) {
      Request request;
      request.client = id;
      const std::string wrong = ReadRequest(client.request, request);
      if (!wrong.empty()) {
        Reply(id, client, ErrorReply(wrong));
        return;
      }

      client.state = Client::State::WAITING;
      // Nothing but its hanging up, which is always told.
      (void)Watch(epoll.fd, EPOLL_CTL_MOD, client.socket.fd, id, 0);
      complete.push_back(std::move(request));
      return;
    }
  }
  Reply(id, client, ErrorReply("the request is too long"));
}

void Server::Impl::Reply(uint64_t id, Client& client, const std::string& reply) {
  client.state = Client::State::WRITING;
  client.reply = reply + "\n";
  client.since = Clock::now();
  Write(id, client);
}

void Server::Impl::Write(uint64_t id, Client& client) {
  size_t sent = 0;
  while (sent < client.reply.size()) {
    const ssize_t count = send(client.socket.fd, client.reply.data() + sent,
                               client.reply.size() - sent, MSG_NOSIGNAL | MSG_DONTWAIT);
    if (count < 0 && errno == EINTR) {
      continue;
    }
    if (count < 0 && errno == EAGAIN) {
      break;
    }
    if (count < 0) {  // it has gone
      Drop(id);
      return;
    }
    sent += static_cast<size_t>(count);
    client.since = Clock::now();
  }

  client.reply.erase(0, sent);
  if (client.reply.empty() || !Watch(epoll.fd, EPOLL_CTL_MOD, client.socket.fd, id, EPOLLOUT)) {
    Drop(id);
  }
}

Server::Server() : impl(std::make_unique<Impl>()) {}
Server::~Server() = default;

bool Server::Open(std::string& error) {
  return impl->Open(error);
}

int Server::Descriptor() const {
  return impl->epoll.fd;
}

std::vector<Request> Server::Serve() {
  std::vector<Request> complete;
  std::array<epoll_event, MOST_CLIENTS + 2> events = {};
  // One call tells of all: what comes during it is told by the next.
  const int count = epoll_wait(impl->epoll.fd, events.data(), static_cast<int>(events.size()), 0);
  bool may_take_in = false;
  for (int i = 0; i < count; ++i) {
    const epoll_event& event = events.at(static_cast<size_t>(i));
    const uint64_t id = event.data.u64;  // a copy: the structure is packed
    const auto found = impl->clients.find(id);
    if (id < FIRST_CLIENT) {
      may_take_in = true;
    } else if (found != impl->clients.end()) {
      Client& client = found->second;
      if (client.state == Client::State::READING) {
        impl->Read(found->first, client, complete);
      } else if (client.state == Client::State::WRITING && (event.events & EPOLLOUT) != 0) {
        impl->Write(found->first, client);
      } else if ((event.events & (EPOLLHUP | EPOLLERR)) != 0) {
        impl->Drop(found->first);
      }
    }
  }
  if (may_take_in) {
    impl->TakeIn();
  }
  return complete;
}

void Server::Answer(uint64_t client, const std::string& reply) {
  const auto found = impl->clients.find(client);
  if (found != impl->clients.end() && found->second.state == Client::State::WAITING) {
    impl->Reply(client, found->second, reply);
  }
}

bool Server::IsWaiting(uint64_t client) const {
  const auto found = impl->clients.find(client);
  return found != impl->clients.end() && found->second.state == Client::State::WAITING;
}

}  // namespace fileindexd
