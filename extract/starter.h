// SPDX-License-Identifier: GPL-2.0-or-later
// Starts children from a thread whose table of descriptors is its own.
//
// DESIGN: a child gets a copy of each descriptor that its starter has, and closes it before its
// program begins, which some file systems (FUSE) are asked about; one whose server is gone never
// answers, and whoever starts the child waits for it. So the files that the service holds open are
// none of the starter's: it gets those alone that the child is to have.
//
//   Start   program, descriptors  ->  thread: starts it  -> its process
//
// One thread beside that. What a child gets may hang the starter all the same: that is waited for
// a while, and until it comes back nothing else can be started.
#pragma once

#include <memory>
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
  // As SpawnChild.
  bool Start(const std::string& program, std::vector<std::string> arguments,
             const ChildFiles& files, Child& child, std::string& error);

 private:
  struct Asked;
  struct Shared;
  static void Run(const std::shared_ptr<Shared>& shared, int end);

  std::shared_ptr<Shared> shared;  // with the thread; none: not open
  ScopedFd asking;
};

}  // namespace fileindexd
