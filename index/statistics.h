// SPDX-License-Identifier: GPL-2.0-or-later
// Numbers and bytes over whole indexes, with no look at the disk.
//
// Each entry counts; the bytes of a file that has several names in a share count once, at the first
// of its paths. Of each share one state is read, and each once, however much is asked. Memory does
// not grow with the number of entries: only with that of further names of files (8 bytes each), and
// up to a limit with that of groups.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "state/settings.h"

namespace fileindexd {

// Bytes add up, and multiply, to INT64_MAX at most: a damaged index may hold any size.
constexpr int64_t AddedBytes(int64_t a, int64_t b) {
  int64_t sum = 0;
  const bool fits = !__builtin_add_overflow(a, b, &sum);
  return fits ? sum : b < 0 ? INT64_MIN : INT64_MAX;
}
constexpr int64_t ManifoldBytes(int64_t bytes, uint64_t times) {
  int64_t product = 0;
  const bool fits = !__builtin_mul_overflow(bytes, times, &product);
  return fits ? product : bytes < 0 ? INT64_MIN : INT64_MAX;
}

enum class GroupBy : uint8_t {
  KIND,       // "document", …: as found inside where the name tells nothing
  EXTENSION,  // of files and links: "pdf", small letters; "" for none
  OWNER,      // the user's number
  FOLDER,     // paths right below the share's; what is no folder there counts to the share's own
  AGE,        // of files and links, by mtime: one of AGE_NAMES
};

struct StatisticsWish {
  std::vector<Share> shares;
  bool totals = false;
  std::optional<GroupBy> by;
  uint64_t largest = 0;               // so many of the largest files
  bool duplicates = false;            // files that are probably alike
  std::optional<int64_t> born_since;  // nanoseconds: entries since then, by folder
  int64_t now = 0;                    // nanoseconds; ages are counted from it
};

struct ShareTotals {
  std::string share;
  uint64_t files = 0;
  uint64_t folders = 0;
  uint64_t links = 0;
  int64_t bytes = 0;
};

struct EntryGroup {
  std::string share;  // of folders alone
  std::string name;
  uint64_t entries = 0;
  int64_t bytes = 0;
  bool is_others = false;  // of all that are not told by name; the name is OTHER_NAMES
};

struct LargeFile {
  std::string share;
  std::string path;
  int64_t size = 0;
  int64_t mtime = 0;  // nanoseconds
};

// Files of one size whose beginning, middle and end are alike; those that were looked at for their
// content.
struct AlikeFiles {
  struct Place {
    std::string share;
    std::string path;
  };
  int64_t size = 0;
  uint64_t files = 0;         // different ones, at least two
  std::vector<Place> places;  // by path: the first one of each file, at most MOST_PLACES of them

  int64_t Spare() const { return ManifoldBytes(size, files - 1); }  // bytes
};

struct Duplicates {
  std::vector<AlikeFiles> sets;  // at most MOST_SETS
  uint64_t set_count = 0;        // of all
  uint64_t files = 0;
  int64_t spare = 0;
};

// Lists go from the most bytes to the least; of equal ones the greater number, then the lesser name
// comes first.
struct Statistics {
  std::vector<ShareTotals> totals;
  std::vector<EntryGroup> groups;
  std::vector<LargeFile> largest;
  Duplicates duplicates;
  std::vector<EntryGroup> born;
  uint64_t answered = 0;              // shares of which something is told here
  std::vector<std::string> failures;  // a line for each share that could not be read: left out
};

constexpr uint64_t MOST_LARGEST = 100000;
// Of one share. Beyond, those with the most bytes are told, and the rest as OTHER_NAMES.
constexpr size_t MOST_GROUPS = 50000;
constexpr const char* OTHER_NAMES = "(others)";
constexpr size_t MOST_SETS = 1000;
constexpr size_t MOST_PLACES = 100;

// From the youngest to the oldest: each holds what is no older than that many days, and is in none
// before it. The first one: what lies ahead of now.
struct AgeClass {
  const char* name;
  int64_t days;
};
constexpr AgeClass AGE_CLASSES[] = {
    {"future", 0}, {"day", 1},       {"week", 7},       {"month", 30},      {"quarter", 91},
    {"year", 365}, {"2 years", 730}, {"5 years", 1826}, {"10 years", 3652}, {"older", INT64_MAX},
};

void Gather(const StatisticsWish& wish, Statistics& statistics);

}  // namespace fileindexd
