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
  bool has_bound = false;
  std::chrono::steady_clock::time_point start;
};

thread_local Spent spent;

}  // namespace

Allowance::Allowance() {
  if (spent.users++ == 0) {
    spent.members = 0;
    spent.bytes = 0;
    spent.has_bound = false;
    spent.start = std::chrono::steady_clock::now();
  }
}

Allowance::~Allowance() {
  --spent.users;
}

bool Allowance::TakeMember() {
  const bool is_taken = spent.members < MAX_MEMBERS;
  spent.members += is_taken ? 1 : 0;
  spent.has_bound = spent.has_bound || !is_taken;
  return is_taken;
}

bool Allowance::TakeBytes(int64_t bytes) {
  spent.bytes += bytes;
  return !IsSpent();
}

bool Allowance::IsSpent() const {
  const bool is_spent =
      spent.bytes > MAX_BYTES || std::chrono::steady_clock::now() - spent.start > MAX_TIME;
  spent.has_bound = spent.has_bound || is_spent;
  return is_spent;
}

void Allowance::NoteBound() {
  spent.has_bound = true;
}

bool Allowance::HasBound() const {
  return spent.has_bound;
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
