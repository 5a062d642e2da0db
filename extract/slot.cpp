// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/slot.h"

#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "extract/converters.h"
#include "extract/error_text.h"
#include "extract/format.h"
#include "extract/helper_codes.h"

namespace fileindexd {

namespace {

using Result = ExtractOutcome::Result;

// Libraries leak a little with each file.
constexpr unsigned JOBS_OF_A_HELPER = 500;
// A busy host starts processes slowly; the document's own time begins when the helper has it.
constexpr std::chrono::seconds TO_BEGIN(60);
// Who ends before it has begun, or is killed by somebody, tells nothing about the file. Killed
// again and again at the same one, as by a host short of memory, it may be that file's doing.
constexpr int LOST_HELPERS = 3;
// Whose helper got less than this part of the deadline as processor time is begun again. A few
// times only: a helper that waits for something that never comes gets none either.
constexpr int USED_PART = 4;
constexpr int STARVED_TIMES = 2;

// The text of both, and of the fields those that only `converted` has.
void Merge(Content& found, const Content& converted, size_t text_cap) {
  ContentSink sink(text_cap);
  sink.content = std::move(found);
  if (!converted.text.empty()) {
    sink.AddText(" ");
    sink.AddText(converted.text);
  }
  sink.content.is_cut = sink.content.is_cut || converted.is_cut;
  for (const TextField& text : converted.texts) {
    sink.Set(text.field, text.text);
  }
  for (const NumberField& number : converted.numbers) {
    sink.Set(number.field, number.number);
  }
  found = std::move(sink.content);
}

}  // namespace

std::optional<ExtractOutcome> Slot::Give(ExtractJob&& job, Clock::time_point now) {
  current = std::move(job);
  lost_helpers = 0;
  AllowTime(now);
  return Begin();
}

void Slot::AllowTime(Clock::time_point now) {
  deadline = now + std::max<Clock::duration>(options.deadline, TO_BEGIN);
  is_timed = false;
}

std::optional<ExtractOutcome> Slot::Begin() {
  stage = Stage::READING;
  found = Content();
  converter_fault.clear();
  std::string error;
  if (!Hand(current.file->fd, current.name, error)) {
    return End(Result::LOST, error);
  }
  return std::nullopt;
}

std::optional<ExtractOutcome> Slot::Work(Clock::time_point now) {
  std::optional<ExtractOutcome> outcome;
  if (helper_start != 0) {
    outcome = AwaitStart(helper_start, helper);
  } else if (converter_start != 0) {
    outcome = AwaitStart(converter_start, converter);
  } else if (stage == Stage::CONVERTING) {
    outcome = AwaitConverter();
  }
  if (!outcome && helper.IsThere()) {
    const std::optional<int> status = Reap(helper);
    // What it said last came before its end.
    Receive(now);
    outcome = TakeFrames();
    if (status) {
      DropHelper();
      outcome = outcome ? std::move(outcome) : JudgeEnd(*status);
    } else if (!outcome && is_closing && now >= grace) {
      if (has_begun) {
        outcome = Nonsense("it closed its connection");
      } else {
        Kill(helper);  // and then another gets the job
        grace = Clock::time_point::max();
      }
    }
  }
  if (!outcome && HasJob() && now >= deadline) {
    outcome = Overdue(now);
  }
  return outcome;
}

std::optional<ExtractOutcome> Slot::AwaitStart(uint64_t& start, Child& child) {
  std::string error;
  const std::optional<bool> is_started = starter.Take(start, child, error);
  if (!is_started) {
    return std::nullopt;
  }
  start = 0;
  if (*is_started) {
    return std::nullopt;
  }
  if (!helper.IsThere()) {
    DropHelper();  // closes its socket
  }
  return End(Result::LOST, error);
}

std::optional<ExtractOutcome> Slot::TakeFrames() {
  if (!received.empty() && stage != Stage::READING && stage != Stage::READING_RESULT) {
    return Nonsense("it was not asked anything");
  }
  while (true) {
    const size_t size = FrameSize(received);
    if (size > MaxFrame(options.text_cap)) {
      return Nonsense("an answer too long");
    }
    if (size == 0 || received.size() < size) {
      return std::nullopt;
    }

    std::string fault;
    std::optional<Answer> answer =
        DecodeAnswer(std::string_view(received).substr(0, size), options.text_cap, fault);
    if (!answer) {
      return Nonsense(fault);
    }
    received.erase(0, size);
    if (auto outcome = Take(*answer)) {
      return outcome;
    }
  }
}

std::optional<ExtractOutcome> Slot::Take(Answer& answer) {
  const bool is_asked = stage == Stage::READING || stage == Stage::READING_RESULT;
  switch (answer.sort) {
    case Answer::Sort::READY:
      if (is_ready) {
        return Nonsense("a second greeting");
      }
      is_ready = true;
      left_out = answer.left_out;
      return std::nullopt;
    case Answer::Sort::BEGUN:
      if (!is_ready || !is_asked || has_begun) {
        return Nonsense("it begins what it was not asked for");
      }
      has_begun = true;
      used_before = ProcessorTime(helper);
      if (!is_timed) {  // once for a document, however many helpers begin it
        deadline = Clock::now() + options.deadline;
        is_timed = true;
      }
      return std::nullopt;
    case Answer::Sort::ANSWER:
    case Answer::Sort::UNREAD:
      if (!is_asked || !has_begun || !received.empty()) {
        return Nonsense("an answer that was not asked for");
      }
      return TakeAnswer(answer);
  }
  return std::nullopt;
}

std::optional<ExtractOutcome> Slot::TakeAnswer(Answer& answer) {
  ++jobs_done;
  if (answer.sort == Answer::Sort::UNREAD) {
    return End(Result::UNREAD, answer.reason);
  }
  if (stage == Stage::READING_RESULT) {
    Merge(found, answer.content, options.text_cap);
    if (converter_fault.empty() && answer.has_failed) {
      converter_fault = answer.reason;
    }
    const std::string fault = converter_fault;
    return fault.empty() ? End(Result::DONE, "")
                         : End(Result::FAILED, converter_name + ": " + fault);
  }

  found = std::move(answer.content);
  if (answer.has_failed) {
    return End(Result::FAILED, answer.reason);
  }
  if (!answer.converter.empty()) {
    return StartConverter(answer.converter);
  }
  return End(Result::DONE, "");
}

std::optional<ExtractOutcome> Slot::StartConverter(const std::string& name) {
  const Converter* wanted = FindConverter(name);
  if (wanted == nullptr) {
    return Nonsense("a converter that there is not");
  }

  converter_name = name;
  ScopedFd made(memfd_create("converted", MFD_CLOEXEC));
  std::string error;
  if (made.fd < 0 || lseek(current.file->fd, 0, SEEK_SET) != 0) {
    return End(Result::LOST, name + ": " + ErrorText(errno));
  }
  converter_start =
      starter.Ask(options.program, {CONVERT_MODE, name}, {current.file->fd, made.fd, -1}, error);
  if (converter_start == 0) {
    return End(Result::LOST, error);
  }
  result.Swap(made);
  stage = Stage::CONVERTING;
  return std::nullopt;
}

std::optional<ExtractOutcome> Slot::AwaitConverter() {
  const std::optional<int> status = Reap(converter);
  if (!status) {
    return std::nullopt;
  }

  if (IsKilledFromOutside(*status) && ++lost_helpers <= LOST_HELPERS) {
    return StartConverter(converter_name);
  }
  if (*status == EXIT_DOORS << 8) {
    return End(Result::LOST, converter_name + ": the doors cannot be closed");
  }
  if (*status == EXIT_PROGRAM << 8) {
    return End(Result::FAILED, converter_name + ": cannot be started");
  }
  if (*status != 0) {
    converter_fault = StatusText(*status);
  }
  return BeginResult();
}

std::optional<ExtractOutcome> Slot::BeginResult() {
  const off_t size = lseek(result.fd, 0, SEEK_END);
  if (size <= 0) {  // nothing in it, or nothing that the program could read
    return converter_fault.empty() ? End(Result::DONE, "")
                                   : End(Result::FAILED, converter_name + ": " + converter_fault);
  }

  stage = Stage::READING_RESULT;
  std::string error;
  if (!Hand(result.fd, FindConverter(converter_name)->result, error)) {
    return End(Result::LOST, error);
  }
  return std::nullopt;
}

std::optional<ExtractOutcome> Slot::JudgeEnd(int status) {
  if (stage != Stage::READING && stage != Stage::READING_RESULT) {
    return std::nullopt;  // the next job starts another
  }
  if (!is_ready) {
    return End(Result::LOST, options.program + ": does not start: " + StatusText(status));
  }
  if ((!has_begun || IsKilledFromOutside(status)) && ++lost_helpers <= LOST_HELPERS) {
    return stage == Stage::READING ? Begin() : BeginResult();
  }
  if (!has_begun) {  // it has not seen the file: whatever ends it, the file does not
    return End(Result::LOST, "the helper ended before it began, with " + StatusText(status));
  }
  if (status == EXIT_MEMORY << 8) {
    return End(Result::KILLED, "needs more memory than is allowed");
  }
  return End(Result::KILLED, "the helper ended with " + StatusText(status));
}

// On a host that is busy with other things a document may not have had the time that has passed.
bool Slot::IsStarved() const {
  const auto little = options.deadline / USED_PART;
  if (stage == Stage::CONVERTING) {
    return converter.IsThere() && ProcessorTime(converter) < little;
  }
  return has_begun && helper.IsThere() && ProcessorTime(helper) - used_before < little;
}

std::optional<ExtractOutcome> Slot::BeginAgain(Clock::time_point now) {
  if (stage == Stage::CONVERTING) {
    DropConverter();
    deadline = now + options.deadline;
    return StartConverter(converter_name);
  }
  DropHelper();
  AllowTime(now);
  return stage == Stage::READING ? Begin() : BeginResult();
}

std::optional<ExtractOutcome> Slot::Overdue(Clock::time_point now) {
  if (IsStarved() && ++lost_helpers <= STARVED_TIMES) {
    return BeginAgain(now);
  }

  const long long limit = options.deadline.count();
  const std::string took = limit % 1000 == 0
                               ? "took longer than " + std::to_string(limit / 1000) + " s"
                               : "took longer than " + std::to_string(limit) + " ms";
  if (stage == Stage::CONVERTING) {
    return converter_start == 0 ? End(Result::FAILED, converter_name + ": " + took)
                                : End(Result::LOST, converter_name + ": does not start in time");
  }
  DropHelper();
  if (!has_begun) {
    return End(Result::LOST, options.program + ": does not start in time");
  }
  return stage == Stage::READING ? End(Result::KILLED, took)
                                 : End(Result::FAILED, converter_name + ": " + took);
}

std::optional<ExtractOutcome> Slot::Nonsense(const std::string& what) {
  DropHelper();
  if (!HasJob()) {
    return std::nullopt;
  }
  return End(has_begun ? Result::KILLED : Result::LOST, "the helper talked nonsense: " + what);
}

void Slot::DropConverter() {
  if (converter_start != 0) {
    starter.Drop(std::exchange(converter_start, 0), converter);
  }
  Kill(converter);
  if (converter.IsThere()) {
    dying.emplace_back().Swap(converter);
  }
}

ExtractOutcome Slot::End(Result how, const std::string& reason) {
  ExtractOutcome outcome;
  outcome.id = current.id;
  outcome.result = how;
  outcome.reason = reason;
  if (how == Result::DONE || how == Result::FAILED) {
    outcome.content = std::move(found);
  }

  DropConverter();
  found = Content();
  result.Close();
  current.file.reset();
  stage = Stage::IDLE;
  if (jobs_done >= JOBS_OF_A_HELPER) {
    DropHelper();
  }
  return outcome;
}

void Slot::Clear() {
  DropHelper();
  if (HasJob()) {
    (void)End(Result::LOST, "");
  }
}

Slot::Clock::time_point Slot::Due() const {
  Clock::time_point due = HasJob() ? deadline : Clock::time_point::max();
  return is_closing ? std::min(due, grace) : due;
}

}  // namespace fileindexd
