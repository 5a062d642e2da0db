// SPDX-License-Identifier: GPL-2.0-or-later
// Starts children from a thread whose table of descriptors is its own.
//
// DESIGN: a child gets a copy of each descriptor that its starter has, and closes it before its
// program begins, which some file systems (FUSE) are asked about; one whose server is gone never
// answers, and whoever starts the child waits for it. So the files that the service holds open are
// none of the starter's: it gets those alone that the child is to have.
//
//   Ask   program, descriptors  ->  thread: starts it
//   Take                              its process
//   Drop                              nobody's process: thread kills it
//
// One thread beside the asker's. What a child gets may hang it all the same: nothing else can be
// started until it comes back, but the asker goes on meanwhile.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/scoped_fd.h"
#include "extract/child.h"

namespace fileindexd {

class Starter {
 public:
  Starter() = default;
  ~Starter();
  Starter(const Starter&) = delete;
  Starter& operator=(const Starter&) = delete;

  // Before any file is open that may not answer. False, and `error` then says why, on failure.
  bool Open(std::string& error);
  // Asks for what SpawnChild does, and gives a number to take it by. 0, and `error` then says why,
  // on failure. What is asked for is to be taken or dropped.
  uint64_t Ask(const std::string& program, std::vector<std::string> arguments,
               const ChildFiles& files, std::string& error);
  // None as long as it is not known what came of it; then as SpawnChild and WatchChild, once.
  std::optional<bool> Take(uint64_t id, Child& child, std::string& error);
  // Nobody will take it. What is started later is killed; what has been is `child`.
  void Drop(uint64_t id, Child& child);
  // Readable as long as there is something to take.
  int Descriptor() const { return asking.fd; }

 private:
  struct Shared;
  static void Run(const std::shared_ptr<Shared>& shared, int end);

  std::shared_ptr<Shared> shared;  // with the thread; none: not open
  uint64_t last_id = 0;
  ScopedFd asking;
};

}  // namespace fileindexd
