// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/nested.h"

#include <new>
#include <utility>

namespace fileindexd {

namespace {

struct Spent {
  int users = 0;
  int members = 0;
  int64_t bytes = 0;
  std::chrono::steady_clock::time_point start;
};

thread_local Spent spent;

}  // namespace

Allowance::Allowance() {
  if (spent.users++ == 0) {
    spent.members = 0;
    spent.bytes = 0;
    spent.start = std::chrono::steady_clock::now();
  }
}

Allowance::~Allowance() {
  --spent.users;
}

bool Allowance::TakeMember() {
  return spent.members < MAX_MEMBERS && ++spent.members <= MAX_MEMBERS;
}

bool Allowance::TakeBytes(int64_t bytes) {
  spent.bytes += bytes;
  return spent.bytes <= MAX_BYTES;
}

bool Allowance::IsSpent() const {
  return spent.bytes > MAX_BYTES || std::chrono::steady_clock::now() - spent.start > MAX_TIME;
}

void ReadNestedText(FormatReader reader, const Document& document, ContentSink& sink) {
  const Kind kind = sink.content.kind;
  std::vector<TextField> texts = std::exchange(sink.content.texts, {});
  std::vector<NumberField> numbers = std::exchange(sink.content.numbers, {});
  std::string why;
  try {
    sink.AddText("\n");
    (void)reader(document, sink, why);  // half a member is better than none, and nobody asks why
    sink.AddText("\n");
  } catch (const std::exception&) {  // no memory either: one member's failure is its own
    sink.has_thrown = true;
  }
  sink.content.kind = kind;
  sink.content.texts = std::move(texts);
  sink.content.numbers = std::move(numbers);
  sink.converter.clear();  // no program is started for a member
}

}  // namespace fileindexd
