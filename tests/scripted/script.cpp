// SPDX-License-Identifier: GPL-2.0-or-later
// Record and tables of the scripted platform.
//
// Plain pthread primitives, not the library's: a thread that blocks here can be cancelled, and the
// unwind must run through frames that allow it.
#include "scripted/script.h"

#include <algorithm>
#include <ctime>

#include "base/mutex_guard.h"

namespace fileindexd::scripted {

struct Script::Plan {
  std::optional<int> answer;
  std::vector<std::function<void()>> run;
  // The releases so far where the call is to block: one that comes before it waits counts, too.
  std::optional<int> block;
};

namespace {

// Counts the threads that are held; an unwind leaves through here too.
class BlockedCount {
 public:
  BlockedCount(int& counted, pthread_cond_t* told) : blocked(counted) {
    ++blocked;
    pthread_cond_broadcast(told);
  }
  BlockedCount(const BlockedCount&) = delete;
  BlockedCount& operator=(const BlockedCount&) = delete;
  ~BlockedCount() { --blocked; }

  int& blocked;
};

}  // namespace

Script& TheScript() {
  static auto* const script = new Script;  // outlives every thread and every static
  return *script;
}

void Script::Reset() {
  const MutexGuard lock(&mutex);
  shares.clear();
  folders.clear();
  resume_time = -1;
  markers.clear();
  need_reindex.clear();
  no_space.clear();
  index_error = 0;
  system_error = 0;
  waits.clear();
  removable_below.clear();
  rules_overlapped = false;
  rules.clear();
  said.clear();
  counts.clear();
  calls.clear();
  lines.clear();
  plain = true;
}

void Script::RecordWait(const std::string& name, int64_t time) {
  const MutexGuard lock(&mutex);
  waits[name].push_back(time);
}

void Script::Answer(const std::string& operation, int nth, int value) {
  const MutexGuard lock(&mutex);
  rules.push_back({operation, nth, nullptr, value, false});
  plain = false;
}

void Script::Fail(const std::string& operation, int nth) {
  static const std::set<std::string> NEGATIVE = {
      "TALOShareGet",           "FILEIDXDBPathGet",        "FILEIDXQueuePathGet",
      "QLIBServiceStart",       "QLIBServiceStop",         "QLIBCExec",
      "QLIBCProcPidFileCreate", "QLIBCProcAliveByPidFile", "QLIBFhsPathInSnapshot",
      "TALOFSDirIsMntPoint"};
  Answer(operation, nth, NEGATIVE.contains(operation) ? -1 : 0);
}

void Script::Run(const std::string& operation, int nth, std::function<void()> action) {
  const MutexGuard lock(&mutex);
  rules.push_back({operation, nth, std::move(action), std::nullopt, false});
  plain = false;
}

void Script::Block(const std::string& operation, int nth) {
  const MutexGuard lock(&mutex);
  rules.push_back({operation, nth, nullptr, std::nullopt, true});
  plain = false;
}

void Script::Release() {
  const MutexGuard lock(&mutex);
  ++release;
  std::erase_if(rules, [](const Rule& rule) { return rule.block; });
  pthread_cond_broadcast(&changed);
}

void Script::Say(const std::string& operation, const std::string& subject, int value) {
  const MutexGuard lock(&mutex);
  said[{operation, subject}] = value;
  plain = false;
}

Script::Plan Script::Count(const std::string& operation, const std::string& subject) {
  Plan plan;
  const int call = ++counts[operation];
  if (const auto found = said.find({operation, subject}); found != said.end()) {
    plan.answer = found->second;
  }
  for (const Rule& rule : rules) {
    if (rule.operation != operation || (rule.nth != EVERY_CALL && rule.nth != call)) {
      continue;
    }
    if (rule.answer) {
      plan.answer = rule.answer;
    }
    if (rule.run) {
      plan.run.push_back(rule.run);
    }
    if (rule.block) {
      plan.block = release;
    }
  }
  return plan;
}

void Script::AwaitReleaseAfter(int before, const std::string& operation) {
  // A destructor must not be unwound out of.
  int state = PTHREAD_CANCEL_ENABLE;
  if (operation == "~Indexer") {
    pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &state);
  }
  {
    const MutexGuard lock(&mutex);
    const BlockedCount count(blocked, &changed);
    while (release == before) {
      pthread_cond_wait(&changed, &mutex);
    }
  }
  pthread_setcancelstate(state, nullptr);
}

std::optional<int> Script::Enter(const std::string& operation, const std::string& subject,
                                 const std::string& arguments) {
  Plan plan;
  {
    const MutexGuard lock(&mutex);
    plan = Count(operation, subject);
    calls.push_back(arguments.empty() ? operation : operation + " " + arguments);
    pthread_cond_broadcast(&changed);
  }
  for (const auto& action : plan.run) {
    action();
  }
  if (plan.block) {
    AwaitReleaseAfter(*plan.block, operation);
  }
  return plan.answer;
}

std::optional<int> Script::EnterUnrecorded(const std::string& operation,
                                           const std::string& subject) {
  if (plain) {
    return std::nullopt;
  }

  Plan plan;
  {
    const MutexGuard lock(&mutex);
    plan = Count(operation, subject);
    pthread_cond_broadcast(&changed);
  }
  for (const auto& action : plan.run) {
    action();
  }
  if (plan.block) {
    AwaitReleaseAfter(*plan.block, operation);
  }
  return plan.answer;
}

void Script::Record(LogLine line) {
  const MutexGuard lock(&mutex);
  lines.push_back(std::move(line));
  pthread_cond_broadcast(&changed);
}

RuleCall::RuleCall() {
  Script& script = TheScript();
  const MutexGuard lock(&script.mutex);
  script.rules_overlapped = script.rules_overlapped || script.inside_rules > 0;
  ++script.inside_rules;
}

RuleCall::~RuleCall() {
  Script& script = TheScript();
  const MutexGuard lock(&script.mutex);
  --script.inside_rules;
}

}  // namespace fileindexd::scripted
