// SPDX-License-Identifier: GPL-2.0-or-later
// Comparison of an index with the disk: a walk and the entries in step, both streaming in byte
// order of the paths. Memory grows with the largest directory and the depth, not with the share.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "index/entry.h"
#include "state/store.h"

namespace fileindexd {

enum class Difference {
  MISSING,    // on disk, belongs, not in the index
  LEFT_OVER,  // in the index, gone from the disk or no longer belonging
  STALE,      // attributes or the kind of thing differ
  CONTENT,    // content is wanted and should not be, or the other way
};
// "missing", "left-over", "stale", "content".
const char* DifferenceText(Difference difference);

// Of an entry and what was seen at its path, which belongs: whether they are not the same thing in
// the same state, and whether its content is wanted under the flags in force.
bool IsStale(const Entry& entry, const Look& look);
bool IsContentDue(const Entry& entry, const Look& look, const ContentFlags& wanted);

// One difference, valid during the call that tells of it.
struct Found {
  Difference difference = Difference::MISSING;
  const std::string& path;
  Thing known = Thing::NONE;  // what the index holds
  Thing seen = Thing::NONE;   // what is on disk and belongs
};
// False: stop after this path.
using Report = std::function<bool(const Found& found)>;

struct Comparison {
  uint64_t entries = 0;  // entries read
  uint64_t seen = 0;     // things on disk that belong
  uint64_t differences = 0;
  uint64_t compared = 0;  // paths that are done

  // Things that could not be looked at, and directories that could not be read. Of what is there
  // and below nothing is told, whatever the index holds.
  uint64_t unreadable = 0;
  std::string first_unreadable;   // the path of the first of them
  std::string unreadable_reason;  // and why
};

// A comparison in pieces. One thread; between two calls it holds no descriptor of the share and no
// transaction, only its connection to the index. Whatever changes meanwhile is met or not, as it
// falls; on a share that does not change, pieces tell together what one run tells.
class Comparer {
 public:
  Comparer(StateStore& state, std::string compared_share);
  ~Comparer();
  Comparer(const Comparer&) = delete;
  Comparer& operator=(const Comparer&) = delete;

  // To be set before Start: an index that is not there is taken for an empty one, so that all that
  // belongs is told as missing. Otherwise it refuses the comparison, unless no folder wants one.
  bool missing_is_empty = false;
  bool has_index = false;  // since Start: whether there is one

  // Begins under the settings of now; with `position` (of any comparer of this share) behind it.
  // False when the comparison cannot be made, and Error() then says why in one line: the root is
  // missing, cannot be read, lies on another file system, or is empty where the index holds entries
  // below it; the index cannot be read.
  bool Start(const std::string& position = {});

  enum class Result {
    DONE,     // all is compared, and the root still is what it was
    STOPPED,  // go on with Run, or later with Position
    FAILED,   // Error() says why; what was told before is not to be acted on
  };
  // Goes on for so many paths at most. All differences of one path are told before it stops.
  Result Run(const Report& report, uint64_t most_paths = UINT64_MAX);

  // The last path that is done; empty before the first.
  const std::string& Position() const { return position; }
  // How many paths there will be in all, as far as it can be told: never less than are done.
  uint64_t Estimate() const;
  const std::string& Error() const { return error; }

  Comparison counts;  // since Start

 private:
  struct Side;

  bool Step(const Report& report);
  bool Tell(const Report& report, Difference difference, const std::string& path);
  bool NextEntry();
  bool NextThing();
  bool PassOver(int reason);
  bool IsPassedOver(const std::string& path);
  bool OpenIndex();
  bool CheckRoot();
  bool Refuse(const std::string& why);
  bool RefuseUnreadable();

  StateStore& store;
  const std::string share_name;
  std::string position;
  std::string error;
  bool going = true;
  uint64_t left_over = 0;
  uint64_t estimate = 0;
  std::unique_ptr<Side> side;
};

// The whole comparison of share `share_name` under the settings in force, calling `report` with
// each difference until it returns false. False when it could not be made, and `error` then says
// why; differences reported before still hold.
bool CompareShare(StateStore& store, const std::string& share_name,
                  const std::function<bool(Difference, const std::string& path)>& report,
                  Comparison& result, std::string& error);

// From now on the calling thread works when nobody else does: lowest priority, idle class of disk
// access. There is no way back.
void WorkAtIdle();

}  // namespace fileindexd
