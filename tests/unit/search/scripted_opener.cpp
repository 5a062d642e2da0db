// SPDX-License-Identifier: GPL-2.0-or-later
// An opener without a thread: what is asked is answered when answers are taken, unless the file
// system hangs.
#include <deque>
#include <utility>

#include "search/opener.h"
#include "tests/unit/search/scripted.h"

namespace fileindexd {

struct Opener::Shared {
  std::deque<Question> questions;
};

bool& FilesystemHangs() {
  static bool hangs = false;
  return hangs;
}

Opener::Opener() : shared(std::make_shared<Shared>()) {}
Opener::~Opener() = default;

bool Opener::Ask(Question question, Time now) {
  heard = waiting == 0 ? now : heard;
  ++waiting;
  shared->questions.push_back(std::move(question));
  return true;
}

void Opener::Take(Time now) {
  while (!FilesystemHangs() && !shared->questions.empty()) {
    const Answer answer = shared->questions.front()();
    shared->questions.pop_front();
    --waiting;
    heard = now;
    answer();
  }
}

void Opener::Drop() {
  waiting = 0;
  shared->questions.clear();
}

Opener::Time Opener::Deadline() const {
  return waiting > 0 ? heard + std::chrono::seconds(10) : Time::max();
}

void Opener::AddPolled(std::vector<pollfd>& /*polled*/) const {}

}  // namespace fileindexd
