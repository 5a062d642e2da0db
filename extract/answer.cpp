// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/answer.h"

#include <algorithm>
#include <type_traits>

#include "extract/characters.h"
#include "extract/format.h"

namespace fileindexd {

namespace {

constexpr size_t LENGTH_SIZE = 4;
constexpr size_t RECORD_HEAD = 5;
constexpr size_t SMALL_RECORDS = 1024;  // numbers, kind and the like, generously

template <typename Number>
void AppendNumber(std::string& bytes, Number number) {
  auto rest = static_cast<std::make_unsigned_t<Number>>(number);
  for (size_t at = 0; at < sizeof(Number); ++at) {
    bytes += static_cast<char>(rest & 0xFFU);
    rest = static_cast<decltype(rest)>(sizeof(Number) > 1 ? rest >> 8 : 0);
  }
}

// `bytes` holds at least that many.
template <typename Number>
Number ReadNumber(std::string_view bytes) {
  using Unsigned = std::make_unsigned_t<Number>;
  Unsigned number = 0;
  for (size_t at = sizeof(Number); at > 0; --at) {
    number = static_cast<Unsigned>(number << 8) | static_cast<unsigned char>(bytes[at - 1]);
  }
  return static_cast<Number>(number);
}

void AppendRecord(std::string& frame, uint8_t tag, std::string_view value) {
  frame += static_cast<char>(tag);
  AppendNumber(frame, static_cast<uint32_t>(value.size()));
  frame += value;
}

void AppendNumberRecord(std::string& frame, uint8_t tag, uint64_t number) {
  std::string value;
  AppendNumber(value, number);
  AppendRecord(frame, tag, value);
}

std::string CleanReason(std::string_view bytes) {
  ContentSink sink(MAX_REASON);
  sink.AddText(bytes);
  return sink.content.text.empty() ? "unknown" : sink.content.text;
}

void AppendFields(std::string& frame, const Content& content) {
  for (unsigned tag = 1; tag < TAG_TEXT; ++tag) {
    const auto field = static_cast<ContentField>(tag);
    for (const TextField& text : content.texts) {
      if (text.field == field) {
        AppendRecord(frame, static_cast<uint8_t>(tag), text.text);
      }
    }
    for (const NumberField& number : content.numbers) {
      if (number.field == field) {
        AppendNumberRecord(frame, static_cast<uint8_t>(tag), static_cast<uint64_t>(number.number));
      }
    }
  }
}

void AppendContent(std::string& body, const Answer& answer) {
  const Content& content = answer.content;
  AppendFields(body, content);
  if (!content.text.empty()) {
    AppendRecord(body, TAG_TEXT, content.text);
  }
  if (content.is_cut) {
    AppendRecord(body, TAG_CUT, "");
  }
  AppendRecord(body, TAG_KIND, std::string(1, static_cast<char>(content.kind)));
  AppendNumberRecord(body, TAG_SAMPLE, content.sample);
  if (!answer.converter.empty()) {
    AppendRecord(body, TAG_CONVERTER, answer.converter);
  }
  if (answer.has_failed) {
    AppendRecord(body, TAG_FAILED, CleanReason(answer.reason));
  }
}

bool IsCleanWithin(std::string_view value, size_t limit) {
  return !value.empty() && value.size() <= limit && IsCleanText(value);
}

// Goes into lines of others' logs.
bool IsReason(std::string_view value) {
  return IsCleanWithin(value, MAX_REASON) && value.find('\n') == std::string_view::npos;
}

bool TakeField(uint8_t tag, std::string_view value, Content& content) {
  const auto field = static_cast<ContentField>(tag);
  if (!IsNumberField(field)) {
    content.texts.push_back({field, std::string(value)});
    return IsCleanWithin(value, ContentSink::MAX_FIELD);
  }

  if (value.size() != sizeof(int64_t)) {
    return false;
  }
  content.numbers.push_back({field, ReadNumber<int64_t>(value)});
  return IsPlausible(field, content.numbers.back().number);
}

bool TakeKind(std::string_view value, Content& content) {
  if (value.size() != 1 || static_cast<unsigned char>(value[0]) > static_cast<int>(Kind::PHOTO)) {
    return false;
  }
  content.kind = static_cast<Kind>(value[0]);
  return true;
}

bool TakeReady(std::string_view value, Answer& answer) {
  if (value.empty() || static_cast<uint8_t>(value[0]) != ANSWER_VERSION) {
    return false;
  }
  answer.sort = Answer::Sort::READY;
  answer.left_out = value.substr(1);
  return answer.left_out.empty() || IsReason(answer.left_out);
}

bool TakeRecord(uint8_t tag, std::string_view value, size_t text_cap, Answer& answer) {
  Content& content = answer.content;
  switch (tag) {
    case TAG_TEXT:
      content.text = value;
      return IsCleanWithin(value, text_cap);
    case TAG_CUT:
      content.is_cut = true;
      return value.empty();
    case TAG_KIND:
      return TakeKind(value, content);
    case TAG_SAMPLE:
      if (value.size() != sizeof(uint64_t)) {
        return false;
      }
      content.sample = ReadNumber<uint64_t>(value);
      return true;
    case TAG_CONVERTER:
      answer.converter = value;
      return IsReason(value);
    case TAG_FAILED:
      answer.has_failed = true;
      answer.reason = value;
      return IsReason(value);
    case TAG_BEGUN:
      answer.sort = Answer::Sort::BEGUN;
      return value.empty();
    case TAG_READY:
      return TakeReady(value, answer);
    case TAG_UNREAD:
      answer.sort = Answer::Sort::UNREAD;
      answer.reason = value;
      return IsReason(value);
    default:
      return IsContentField(tag) && TakeField(tag, value, content);
  }
}

}  // namespace

std::string EncodeJob(const JobOrder& job) {
  std::string_view name = job.name;
  name.remove_prefix(name.size() - std::min(name.size(), MAX_JOB_NAME));
  std::string frame;
  AppendNumber(frame, static_cast<uint32_t>(sizeof(job.text_cap) + name.size()));
  AppendNumber(frame, job.text_cap);
  frame += name;
  return frame;
}

std::optional<JobOrder> DecodeJob(std::string_view frame) {
  constexpr size_t HEAD = LENGTH_SIZE + sizeof(JobOrder::text_cap);
  if (frame.size() < HEAD || frame.size() > HEAD + MAX_JOB_NAME ||
      frame.size() != LENGTH_SIZE + ReadNumber<uint32_t>(frame)) {
    return std::nullopt;
  }
  return JobOrder{ReadNumber<uint32_t>(frame.substr(LENGTH_SIZE)), std::string(frame.substr(HEAD))};
}

std::string EncodeAnswer(const Answer& answer) {
  std::string body;
  switch (answer.sort) {
    case Answer::Sort::READY: {
      const std::string left_out = answer.left_out.empty() ? "" : CleanReason(answer.left_out);
      AppendRecord(body, TAG_READY, static_cast<char>(ANSWER_VERSION) + left_out);
      break;
    }
    case Answer::Sort::BEGUN:
      AppendRecord(body, TAG_BEGUN, "");
      break;
    case Answer::Sort::UNREAD:
      AppendRecord(body, TAG_UNREAD, CleanReason(answer.reason));
      break;
    case Answer::Sort::ANSWER:
      AppendContent(body, answer);
      break;
  }

  std::string frame;
  frame.reserve(LENGTH_SIZE + body.size());
  AppendNumber(frame, static_cast<uint32_t>(body.size()));
  frame += body;
  return frame;
}

size_t MaxFrame(size_t text_cap) {
  return LENGTH_SIZE + TEXT_FIELD_COUNT * (RECORD_HEAD + ContentSink::MAX_FIELD) + RECORD_HEAD +
         text_cap + 2 * MAX_REASON + SMALL_RECORDS;
}

size_t FrameSize(std::string_view received) {
  return received.size() < LENGTH_SIZE ? 0 : LENGTH_SIZE + ReadNumber<uint32_t>(received);
}

std::optional<Answer> DecodeAnswer(std::string_view frame, size_t text_cap, std::string& fault) {
  const auto refuse = [&fault](const std::string& why) {
    fault = why;
    return std::nullopt;
  };
  if (frame.size() < LENGTH_SIZE || frame.size() > MaxFrame(text_cap) ||
      FrameSize(frame) != frame.size()) {
    return refuse("a frame of the wrong length");
  }

  Answer answer;
  unsigned last = 0;
  bool has_kind = false;
  bool has_sample = false;
  for (std::string_view rest = frame.substr(LENGTH_SIZE); !rest.empty();) {
    if (rest.size() < RECORD_HEAD) {
      return refuse("half a record");
    }
    const auto tag = static_cast<uint8_t>(rest[0]);
    const auto size = ReadNumber<uint32_t>(rest.substr(1));
    rest.remove_prefix(RECORD_HEAD);
    if (size > rest.size() || tag <= last) {
      return refuse("record " + std::to_string(tag) + " where it cannot be");
    }
    if (!TakeRecord(tag, rest.substr(0, size), text_cap, answer)) {
      return refuse("record " + std::to_string(tag) + " with a wrong value");
    }
    if (answer.sort != Answer::Sort::ANSWER && last != 0) {
      return refuse("more than one record where one stands alone");
    }
    has_kind = has_kind || tag == TAG_KIND;
    has_sample = has_sample || tag == TAG_SAMPLE;
    last = tag;
    rest.remove_prefix(size);
  }
  if (answer.sort == Answer::Sort::ANSWER && (!has_kind || !has_sample)) {
    return refuse("an answer without kind or sample");
  }
  return answer;
}

}  // namespace fileindexd
