// SPDX-License-Identifier: GPL-2.0-or-later
// The host that the unit tests run on: a table of answers and a plain record of calls.
//
// Stands where the shipped platform stands, behind the same declarations. Whatever a test does not
// tell has a plain answer: path rules look at the real file system, stores hold what the fields
// below hold, and every index operation succeeds.
//
// 1. Every operation is known by its name without namespaces ("AddFSDocument", "List" of a share
//    is "Folders::List"); the indexer's constructor is "Indexer", its destructor "~Indexer".
// 2. A call is recorded, then runs what the test gave it, then waits if it is to block, then
//    answers: what was told for this call, else for this subject, else the plain answer. The
//    subject is the path, share or name that the operation is asked about.
// 3. Some calls of the C library can be told too, see host_calls.cpp: the answer is the error.
// 4. Any thread may call. The fields are guarded by `mutex`; a test that knows that no other thread
//    runs may skip it.
#pragma once

#include <pthread.h>

#include <atomic>
#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "platform/settings.h"

namespace fileindexd::scripted {

constexpr int EVERY_CALL = 0;
// How long anything is awaited before a test gives it up.
constexpr int AWAIT_LIMIT_S = 600;

struct Share {
  std::string name;
  std::string path;
  std::string queue_path;
  std::string db_path;
};

struct LogLine {
  std::string file;
  int line;
  std::string text;
};

// What shall happen in the `nth` call (from 1, counted since Reset) of an operation.
struct Rule {
  std::string operation;
  int nth = EVERY_CALL;
  std::function<void()> run;  // called with no lock held; may throw
  std::optional<int> answer;
  bool block = false;
};

class Script {
 public:
  Script() = default;
  Script(const Script&) = delete;
  Script& operator=(const Script&) = delete;

  // As new, but for records and indexers that are still alive.
  void Reset();

  // The answer of the nth call; Fail is that of a failure: false, -1, a null value, not open.
  void Answer(const std::string& operation, int nth, int value);
  void Fail(const std::string& operation, int nth = EVERY_CALL);
  void Run(const std::string& operation, int nth, std::function<void()> action);
  // Holds the nth call in a cancellation point until Release, or until the thread is cancelled.
  void Block(const std::string& operation, int nth = EVERY_CALL);
  void Release();
  // The answer for one subject, whichever call it is.
  void Say(const std::string& operation, const std::string& subject, int value);

  // Wait for an event; false when the limit passes first. A line or call matches by a part of it.
  bool AwaitLine(const std::string& part, size_t times = 1);
  bool AwaitCall(const std::string& part, size_t times = 1);
  bool AwaitCount(const std::string& operation, int count);
  bool AwaitBlocked();

  std::vector<std::string> Calls();
  std::vector<LogLine> Lines();
  // The texts of the lines alone.
  std::vector<std::string> Texts();
  // The calls that begin with one of these operation names.
  std::vector<std::string> CallsOf(const std::set<std::string>& operations);
  size_t CountLines(const std::string& part);
  int CallCount(const std::string& operation);
  // Every operation that was called, with the number of its calls.
  std::map<std::string, int> Counts();
  void Forget();  // drops recorded calls and lines; the counts go on

  // For the operations themselves.
  std::optional<int> Enter(const std::string& operation, const std::string& subject,
                           const std::string& arguments);
  // The same without a record, for what is called for every comparison.
  std::optional<int> EnterUnrecorded(const std::string& operation, const std::string& subject);
  void Record(LogLine line);
  void RecordWait(const std::string& name, int64_t time);

  // Recursive: the thread sanitizer runs a signal's handler, which logs, at the end of whatever
  // call of the library comes next, and that may be the one that took this lock.
  pthread_mutex_t mutex = PTHREAD_RECURSIVE_MUTEX_INITIALIZER_NP;
  pthread_cond_t changed = PTHREAD_COND_INITIALIZER;

  std::vector<Share> shares;
  std::vector<TALO::FILEINDEX::Folder> folders;
  int64_t resume_time = -1;  // the stored pause state
  std::set<std::string> markers;
  std::set<std::string> need_reindex;
  std::set<std::string> no_space;
  int index_error = 0;   // what ErrorHandler::GetError says
  int system_error = 0;  // what QLIBCErrGet says
  // What some calls of the C library were told to wait for, by name: the seconds of `sleep`, the
  // microseconds of `usleep`, the second until which `pthread_timedjoin_np` waits.
  std::map<std::string, std::vector<int64_t>> waits;
  std::string removable_below;  // "/bin/rm" removes below this folder only; empty: nothing

  // Alive now. Not touched by Reset.
  int live_indexers = 0;
  int live_records = 0;
  // Two calls of the path rules that want the platform mutex were inside at once.
  bool rules_overlapped = false;
  int inside_rules = 0;

 private:
  struct Plan;
  Plan Count(const std::string& operation, const std::string& subject);
  void AwaitReleaseAfter(int before, const std::string& operation);
  bool Await(const std::function<bool()>& reached);

  std::vector<Rule> rules;
  std::map<std::pair<std::string, std::string>, int> said;
  std::map<std::string, int> counts;
  std::vector<std::string> calls;
  std::vector<LogLine> lines;
  std::atomic<bool> plain = true;  // no rule and no answer was given
  int blocked = 0;
  int release = 0;  // counts releases
};

// The one script of the process: link-time platforms have no object to hang it on.
Script& TheScript();

// A call inside one of the rules that the daemon's platform mutex serialises.
class RuleCall {
 public:
  RuleCall();
  RuleCall(const RuleCall&) = delete;
  RuleCall& operator=(const RuleCall&) = delete;
  ~RuleCall();
};

}  // namespace fileindexd::scripted
