// SPDX-License-Identifier: GPL-2.0-or-later
// What leaves the index. The root is looked at last: before anything is taken away, and after what
// is to leave was found gone.
#include "index/converger.h"

namespace fileindexd {

namespace {

// Of one file, and of a tree of links: what is not refreshed is read once more by a reindex.
constexpr size_t MOST_LINKS = 1000;
constexpr size_t MOST_LINKS_NOTED = 10000;

}  // namespace

IndexError Converger::Delete(const Settings& in_force, const Share& in_share,
                             const std::string& path, DeleteMode mode) {
  added_path = nullptr;
  settings = &in_force;
  share = &in_share;
  sql_failed = false;
  other_paths.clear();
  if (mode == DeleteMode::ALL) {
    const IndexError error = RemoveAt(path, true);
    return error == IndexError::NONE ? RemoveBelow(path, true) : error;
  }

  const Look look = LookAt(*settings, path);
  if (look.verdict == Verdict::UNKNOWN) {
    return IndexError::IO;
  }
  // What is there on a foreign disk tells nothing about what is known.
  IndexError error = look.verdict == Verdict::BELONGS ? CheckMount(look) : IndexError::NONE;
  if (error != IndexError::NONE) {
    return error;
  }
  if (mode == DeleteMode::ENTRY || look.verdict != Verdict::BELONGS) {
    error = RemoveAt(path, look.verdict == Verdict::GONE);
  }
  error = error == IndexError::NONE ? RemoveBelow(path, false) : error;
  return error == IndexError::NONE ? SettleOtherPaths() : error;
}

// Taking a link away moves the change time of the others: unrefreshed, they would look to the next
// add as if somebody had written to them, and be read anew.
IndexError Converger::NoteLinks(const Entry& removed) {
  if (removed.thing != Thing::FILE || !removed.content_wanted ||
      other_paths.size() >= MOST_LINKS_NOTED) {
    return IndexError::NONE;
  }
  const size_t before = other_paths.size();
  const IndexError error = Sql(table.OtherPaths(removed, false, other_paths, MOST_LINKS + 1));
  if (other_paths.size() - before > MOST_LINKS) {
    other_paths.resize(before);
  }
  return error;
}

// `root_counts`: the root is looked at even if no entry stands there.
IndexError Converger::RemoveAt(const std::string& path, bool root_counts) {
  Entry known;
  bool found = false;
  IndexError error = Sql(table.Find(path, known, found));
  if (error == IndexError::NONE && (found || root_counts)) {
    error = CheckRoot();
  }
  if (error != IndexError::NONE || !found) {
    return error;
  }
  error = Sql(table.Remove(known));
  return error == IndexError::NONE && root_counts ? NoteLinks(known) : error;
}

IndexError Converger::RemoveBelow(const std::string& path, bool even_what_belongs) {
  return ForEachSliceBelow(path, [&](const std::vector<Entry>& rows) {
    return RemoveFromSlice(path, rows, even_what_belongs);
  });
}

// `rows`: some of those below `path`.
IndexError Converger::RemoveFromSlice(const std::string& path, const std::vector<Entry>& rows,
                                      bool even_what_belongs) {
  // Nothing is below what is gone: one look tells of them all.
  const bool all =
      even_what_belongs || (!rows.empty() && LookAt(*settings, path).verdict == Verdict::GONE);
  std::vector<const Entry*> leaving;
  for (const Entry& known : rows) {
    const Verdict verdict = all ? Verdict::GONE : LookAt(*settings, known.path).verdict;
    if (verdict == Verdict::UNKNOWN) {
      return IndexError::IO;
    }
    if (verdict != Verdict::BELONGS) {
      leaving.push_back(&known);
    }
  }

  IndexError error = leaving.empty() ? IndexError::NONE : CheckRoot();
  error = error == IndexError::NONE ? Sql(table.RemoveAll(leaving)) : error;
  for (size_t i = 0; i < leaving.size() && error == IndexError::NONE && !even_what_belongs; ++i) {
    error = NoteLinks(*leaving[i]);
  }
  return error;
}

}  // namespace fileindexd
