// SPDX-License-Identifier: GPL-2.0-or-later
// Files within files: what they may cost together, and how their text joins the outer one's.
#pragma once

#include <chrono>
#include <cstdint>

#include "extract/format.h"

namespace fileindexd {

// What reading one file may cost, everything inside it included, however it is packed. The
// outermost object begins anew; those of the readers inside go on with what is left. By a count of
// what is unpacked, never by a ratio: a bomb and a big log are told apart by nothing else.
class Allowance {
 public:
  static constexpr int MAX_DEPTH = 3;                    // archives and messages inside each other
  static constexpr int64_t MAX_BYTES = 512LL << 20;      // unpacked, all members together
  static constexpr int64_t MAX_MEMBER_BYTES = 48 << 20;  // of one that is read: it lies in memory
  static constexpr int MAX_MEMBERS = 1000;               // that are read
  // Well under the deadline for a document: what was found by then is answered.
  static constexpr std::chrono::seconds MAX_TIME{40};

  Allowance();
  ~Allowance();
  Allowance(const Allowance&) = delete;
  Allowance& operator=(const Allowance&) = delete;

  // What one of these denies is noted, for HasBound.
  bool TakeMember();
  bool TakeBytes(int64_t bytes);  // false when it is spent
  bool IsSpent() const;           // no time or no bytes are left

  void NoteBound();       // a bound that somebody else holds ended the reading
  bool HasBound() const;  // something was not read, since it would have cost too much
};

// Lets `reader` add its text to the sink, but neither fields nor kind: those belong to the file
// around it. What goes wrong inside is not the outer file's failure, so there is no result.
void ReadNestedText(FormatReader reader, const Document& document, ContentSink& sink);

}  // namespace fileindexd
