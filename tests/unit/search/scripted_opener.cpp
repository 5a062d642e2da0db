// SPDX-License-Identifier: GPL-2.0-or-later
// An opener without a thread: what is asked is answered, and what is to be closed is closed, when
// answers are taken, unless the file system hangs.
#include <deque>
#include <utility>

#include "search/opener.h"
#include "tests/unit/search/scripted.h"

namespace fileindexd {

struct Opener::Shared {
  std::deque<Question> questions;
  std::deque<Question> dropped;
  std::deque<std::shared_ptr<ScopedFd>> closing;
};

bool& FilesystemHangs() {
  static bool hangs = false;
  return hangs;
}

Opener::Opener() : shared(std::make_shared<Shared>()) {}
Opener::~Opener() = default;

bool Opener::Ask(Question question, Time now, Work work) {
  heard = waiting == 0 ? now : heard;
  ++waiting;
  shared->questions.push_back([question = std::move(question), work = std::move(work)] {
    Answer answer = question();
    if (work != nullptr) {
      work();
    }
    return answer;
  });
  return true;
}

void Opener::Take(Time now, size_t /*most*/) {
  if (!FilesystemHangs()) {
    shared->dropped.clear();
    shared->closing.clear();
  }
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
  for (Question& question : shared->questions) {
    shared->dropped.push_back(std::move(question));
  }
  shared->questions.clear();
}

std::shared_ptr<ScopedFd> Opener::Keep(ScopedFd& file) {
  return {new ScopedFd(file.Release()),
          [owner = shared](ScopedFd* last) { owner->closing.emplace_back(last); }};
}

Opener::Time Opener::Deadline() const {
  return waiting > 0 ? heard + std::chrono::seconds(10) : Time::max();
}

void Opener::AddPolled(std::vector<pollfd>& polled) const {
  polled.push_back({OPENER_POLLED, POLLIN, 0});
}

}  // namespace fileindexd
