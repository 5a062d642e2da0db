// SPDX-License-Identifier: GPL-2.0-or-later
// What a watch tells: something has happened to a name.
#pragma once

#include <cstdint>
#include <functional>
#include <string>

namespace fileindexd {

// Bits; the kernel merges what happens to one name in short succession, in no order.
enum Happening : uint32_t {
  CREATED = 0x1,
  MODIFIED = 0x2,    // written to or cut, and still open
  ATTRIBUTES = 0x4,  // mode, owner, times, extended attributes, number of links
  WRITTEN = 0x8,     // closed after it was open for writing
  DELETED = 0x10,
  MOVED_FROM = 0x20,  // renamed away, to an unknown place or out of what is watched
  MOVED_TO = 0x40,    // renamed to this name; `from` tells the former one where it is known
};

// What other names of the same thing show as well.
constexpr uint32_t CHANGES_THING = MODIFIED | ATTRIBUTES | WRITTEN;

struct Change {
  uint32_t what = 0;       // of Happening
  bool directory = false;  // what the kernel says of the thing
  std::string path;        // normal; empty where the thing has no name that can be told: only with
                           // `target`
  std::string from = {};   // with MOVED_TO: the former path, or empty
  // What was changed, whatever its name is by now: bytes of the handle of a thing that is no
  // directory, with one of CHANGES_THING. Empty where the watch cannot tell.
  std::string target = {};
};

// Takes changes in the order in which they were read.
using TellChange = std::function<void(const Change& change)>;

}  // namespace fileindexd
