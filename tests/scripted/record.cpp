// SPDX-License-Identifier: GPL-2.0-or-later
// What a test asks of the record: what was called and logged, and waiting for it.
#include <cerrno>
#include <ctime>

#include "base/mutex_guard.h"
#include "scripted/script.h"

namespace fileindexd::scripted {

namespace {

bool Holds(const std::string& text, const std::string& part) {
  return text.find(part) != std::string::npos;
}

}  // namespace

bool Script::Await(const std::function<bool()>& reached) {
  timespec limit{};
  clock_gettime(CLOCK_MONOTONIC, &limit);
  limit.tv_sec += AWAIT_LIMIT_S;

  const MutexGuard lock(&mutex);
  while (!reached()) {
    if (pthread_cond_clockwait(&changed, &mutex, CLOCK_MONOTONIC, &limit) == ETIMEDOUT) {
      return reached();
    }
  }
  return true;
}

bool Script::AwaitLine(const std::string& part, size_t times) {
  return Await([&] {
    size_t found = 0;
    for (const LogLine& line : lines) {
      found += Holds(line.text, part) ? 1U : 0U;
    }
    return found >= times;
  });
}

bool Script::AwaitCall(const std::string& part, size_t times) {
  return Await([&] {
    size_t found = 0;
    for (const std::string& call : calls) {
      found += Holds(call, part) ? 1U : 0U;
    }
    return found >= times;
  });
}

bool Script::AwaitCount(const std::string& operation, int count) {
  return Await([&] { return counts[operation] >= count; });
}

bool Script::AwaitBlocked() {
  return Await([&] { return blocked > 0; });
}

std::vector<std::string> Script::Calls() {
  const MutexGuard lock(&mutex);
  return calls;
}

std::vector<LogLine> Script::Lines() {
  const MutexGuard lock(&mutex);
  return lines;
}

std::vector<std::string> Script::Texts() {
  const MutexGuard lock(&mutex);
  std::vector<std::string> texts;
  for (const LogLine& line : lines) {
    texts.push_back(line.text);
  }
  return texts;
}

std::vector<std::string> Script::CallsOf(const std::set<std::string>& operations) {
  const MutexGuard lock(&mutex);
  std::vector<std::string> found;
  for (const std::string& call : calls) {
    if (operations.contains(call.substr(0, call.find(' ')))) {
      found.push_back(call);
    }
  }
  return found;
}

size_t Script::CountLines(const std::string& part) {
  const MutexGuard lock(&mutex);
  size_t found = 0;
  for (const LogLine& line : lines) {
    found += Holds(line.text, part) ? 1U : 0U;
  }
  return found;
}

int Script::CallCount(const std::string& operation) {
  const MutexGuard lock(&mutex);
  const auto found = counts.find(operation);
  return found == counts.end() ? 0 : found->second;
}

std::map<std::string, int> Script::Counts() {
  const MutexGuard lock(&mutex);
  return counts;
}

void Script::Forget() {
  const MutexGuard lock(&mutex);
  calls.clear();
  lines.clear();
}

}  // namespace fileindexd::scripted
