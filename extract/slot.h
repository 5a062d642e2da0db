// SPDX-License-Identifier: GPL-2.0-or-later
// One helper of the pool and the job that it has.
//
//           Give                 answer names a converter            it ended
//   idle  ------->  READING  ------------------------->  CONVERTING  ------->  READING_RESULT
//     ^                | answer                              | no start, time         | answer
//     +----------------+-------------------------------------+-----------------------+
//
// In each stage the helper may also die, be killed for its time, or talk nonsense: the slot is
// empty then, and is filled again with the next job. Where that was the host's doing (killed from
// outside, ended before it began, no processor time) the same job is begun again, a few times. One
// thread; nothing waits.
#pragma once

#include <poll.h>

#include <chrono>
#include <list>
#include <optional>
#include <string>
#include <vector>

#include "extract/answer.h"
#include "extract/child.h"
#include "extract/pool.h"
#include "extract/starter.h"

namespace fileindexd {

class Slot {
 public:
  using Clock = std::chrono::steady_clock;

  // `options` outlive the slot; the others are the pool's.
  Slot(const PoolOptions& pool_options, Starter& pool_starter, std::string& pool_left_out,
       std::list<Child>& pool_dying)
      : options(pool_options), starter(pool_starter), left_out(pool_left_out), dying(pool_dying) {}

  bool IsFree() const { return stage == Stage::IDLE && !is_closing; }
  bool HasJob() const { return stage != Stage::IDLE; }
  // Only while free. An outcome at once where no helper can be had.
  std::optional<ExtractOutcome> Give(ExtractJob&& job, Clock::time_point now);
  std::optional<ExtractOutcome> Work(Clock::time_point now);
  // Kills what runs; the job is gone without outcome.
  void Clear();

  void AddPolled(std::vector<pollfd>& polled) const;
  Clock::time_point Due() const;

 private:
  enum class Stage { IDLE, READING, CONVERTING, READING_RESULT };

  // Of a helper; its jobs can be sent at once.
  bool Start(std::string& error);
  // The file, from its beginning, to the helper that is there. False, with errno, on failure:
  // nothing has gone out.
  bool Send(int file, const std::string& name);
  // The same to a helper that is there or is started; it has not begun then. True also where a new
  // one ended at once: how, is judged when its end is seen. False, and `error` then says why, where
  // none can be had; there is none then.
  bool Hand(int file, const std::string& name, std::string& error);
  // The job's time starts anew when a helper begins it.
  void AllowTime(Clock::time_point now);
  // Begins the job, or begins it again.
  std::optional<ExtractOutcome> Begin();
  void Receive(Clock::time_point now);
  // Of one that is being started: `start` is its number as long as it is.
  std::optional<ExtractOutcome> AwaitStart(uint64_t& start, Child& child);
  std::optional<ExtractOutcome> TakeFrames();
  std::optional<ExtractOutcome> Take(Answer& answer);
  std::optional<ExtractOutcome> TakeAnswer(Answer& answer);
  std::optional<ExtractOutcome> JudgeEnd(int status);
  std::optional<ExtractOutcome> StartConverter(const std::string& name);
  std::optional<ExtractOutcome> AwaitConverter();
  std::optional<ExtractOutcome> BeginResult();
  bool IsStarved() const;  // see PoolOptions::deadline
  // The step at which its time was up.
  std::optional<ExtractOutcome> BeginAgain(Clock::time_point now);
  std::optional<ExtractOutcome> Overdue(Clock::time_point now);
  std::optional<ExtractOutcome> Nonsense(const std::string& what);
  ExtractOutcome End(ExtractOutcome::Result result, const std::string& reason);
  void DropHelper();
  void DropConverter();

  const PoolOptions& options;
  Starter& starter;
  std::string& left_out;
  std::list<Child>& dying;  // killed, not reaped yet

  uint64_t helper_start = 0;  // the starter's number for it; 0: it is there, or there is none
  Child helper;
  ScopedFd socket;  // of a helper that is being started, too
  std::string received;
  bool is_ready = false;    // its doors are closed
  bool is_closing = false;  // its socket is closed, its end not seen yet
  Clock::time_point grace;  // until then
  unsigned jobs_done = 0;

  Stage stage = Stage::IDLE;
  ExtractJob current;
  Clock::time_point deadline;
  bool is_timed = false;                    // `deadline` counts from when a helper began it
  bool has_begun = false;                   // the helper has it
  std::chrono::nanoseconds used_before{0};  // the helper's processor time, when it had begun
  int lost_helpers = 0;                     // at this job, by no fault of its own
  Content found;                            // by the first reading
  uint64_t converter_start = 0;             // as the helper's
  Child converter;
  std::string converter_name;
  std::string converter_fault;
  ScopedFd result;  // what the converter makes, in memory
};

}  // namespace fileindexd
