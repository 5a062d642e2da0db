// SPDX-License-Identifier: GPL-2.0-or-later
// DESIGN: the linker hands the Worker's calls of the indexer to the wrappers below (--wrap, see
// CMakeLists.txt), which are named after the symbols that they stand in front of.
#include "unit/fault/operations.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <mutex>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

#include "platform/indexer.h"
#include "unit/fault/plan.h"

namespace fileindexd::fault {

namespace {

constexpr std::array<std::string_view, 7> FORMS = {"AddFSDocument failed, ",
                                                   "DelFSDocument failed, ",
                                                   "DelDocument failed, ",
                                                   "[s] Document[",
                                                   "[s] Directory[",
                                                   "Worker[s] failed to commit db",
                                                   "Worker[s] fileindex db committed"};

std::mutex mutex;
std::vector<std::string>& Due() {
  static std::vector<std::string>& lines = *new std::vector<std::string>;
  return lines;
}

void Owe(const std::string& line) {
  const std::lock_guard guard(mutex);
  Due().push_back(line);
}

// For an operation at a path that has just failed.
std::string FailedAt(const std::string& path) {
  return "path=" + path + ", code=" + std::to_string(TALO::IR::ErrorHandler::GetError());
}

std::vector<std::string> Written() {
  std::vector<std::string> lines;
  std::istringstream log(Logged());
  for (std::string line; std::getline(log, line);) {
    const std::string text = line.substr(line.find(' ') + 1);  // without the source
    if (std::any_of(FORMS.begin(), FORMS.end(),
                    [&text](std::string_view form) { return text.starts_with(form); })) {
      lines.push_back(text);
    }
  }
  return lines;
}

}  // namespace

void ExpectEachOperationLogged() {
  std::vector<std::string> written = Written();
  std::vector<std::string> due = Due();
  // A commit may come between an operation and its line.
  std::sort(written.begin(), written.end());
  std::sort(due.begin(), due.end());
  EXPECT_EQ(written, due);
  EXPECT_FALSE(due.empty());
}

using Json::Value;
using TALO::IR::Indexer;

bool RealAdd(Indexer*, const std::string&, const Value&) __asm__("__real_" ADD_SYMBOL);
bool RealUpdate(Indexer*, const std::string&, const Value&,
                const Value&) __asm__("__real_" UPDATE_SYMBOL);
bool RealDelete(Indexer*, const std::string&, int) __asm__("__real_" DELETE_SYMBOL);
bool RealCommit(Indexer*) __asm__("__real_" COMMIT_SYMBOL);

bool Add(Indexer*, const std::string&, const Value&) __asm__("__wrap_" ADD_SYMBOL);
bool Update(Indexer*, const std::string&, const Value&,
            const Value&) __asm__("__wrap_" UPDATE_SYMBOL);
bool Delete(Indexer*, const std::string&, int) __asm__("__wrap_" DELETE_SYMBOL);
bool Commit(Indexer*) __asm__("__wrap_" COMMIT_SYMBOL);

bool Add(Indexer* indexer, const std::string& path, const Value& cfg) {
  const bool done = RealAdd(indexer, path, cfg);
  Owe(done ? "[s] Document[" + path + "] added" : "AddFSDocument failed, " + FailedAt(path));
  return done;
}

bool Update(Indexer* indexer, const std::string& path, const Value& cfg, const Value& data) {
  const bool done = RealUpdate(indexer, path, cfg, data);
  if (done) {  // wanted: one that failed says nothing
    Owe("[s] Document[" + path + "] updated");
  }
  return done;
}

bool Delete(Indexer* indexer, const std::string& path, int mode) {
  const bool done = RealDelete(indexer, path, mode);
  const std::string number = std::to_string(mode);
  if (mode == 0) {
    Owe(done ? "[s] Document[" + path + "] deleted" : "DelFSDocument failed, " + FailedAt(path));
  } else {
    Owe(done ? "[s] Directory[" + path + "] deleted, mode=" + number
             : "DelDocument failed, mode=" + number + ", " + FailedAt(path));
  }
  return done;
}

bool Commit(Indexer* indexer) {
  const bool done = RealCommit(indexer);
  Owe(done ? "Worker[s] fileindex db committed" : "Worker[s] failed to commit db");
  return done;
}

}  // namespace fileindexd::fault
