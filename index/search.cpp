// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/search.h"

#include <sys/stat.h>

#include <algorithm>
#include <deque>
#include <iterator>
#include <utility>

#include "index/asked.h"
#include "index/asked_share.h"
#include "index/entry_table.h"
#include "index/query_slips.h"
#include "index/side_by_side.h"
#include "index/suggestion.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr uint64_t MOST_HITS = UINT64_MAX / 4;

// Names of shares in a question that are none: null, or the first of them.
const QueryNode* UnknownShare(const QueryNode& node, const Question& question) {
  const auto is_in = [](const std::vector<std::string>& names, const std::string& share) {
    return std::find(names.begin(), names.end(), share) != names.end();
  };
  for (const std::string& share :
       node.part == Part::SHARE ? node.names : std::vector<std::string>()) {
    if (!is_in(question.shares, share) && !is_in(question.known, share)) {
      return &node;
    }
  }
  for (const QueryNode& below : node.below) {
    const QueryNode* unknown = UnknownShare(below, question);
    if (unknown != nullptr) {
      return unknown;
    }
  }
  return nullptr;
}

bool HoldsAny(sqlite3* db, const std::string& path) {
  const PathRange range(path);
  Statement below;
  const std::string sql =
      "SELECT 1 FROM entries WHERE " + AtOrBelowSql("?1", "?2", "?3") + " LIMIT 1";
  if (below.Prepare(db, sql.c_str()) != SQLITE_OK) {
    return true;  // not known
  }
  range.Bind(below);
  return below.Step() != SQLITE_DONE;
}

bool IsDirectory(const std::string& path) {
  struct stat status {};
  return lstat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

bool ReadQuestion(const Question& question, NameMarker& names, Asked& asked, std::string& error) {
  if (!asked.Read(question, names, error)) {
    return false;
  }
  const QueryNode* unknown = UnknownShare(asked.tree, question);
  if (unknown != nullptr) {
    error = QueryError{"there is no such share", unknown->start}.Line(asked.text);
    return false;
  }
  return true;
}

// A share without an index yet knows no more than what lies on its disk.
bool Knows(const AskedShare& share, const Question& question, const std::string& path) {
  if (share.run != nullptr && HoldsAny(share.reader.database.db, path)) {
    return true;
  }
  const auto root = question.roots.find(share.name);
  return root != question.roots.end() &&
         (Covers(path, root->second) ||
          (!share.has_index && Covers(root->second, path) && IsDirectory(path)));
}

// A share that the question rules out was not asked: what may lie in it is taken for known.
bool IsKnown(const std::string& path, const Question& question,
             const std::deque<AskedShare>& shares) {
  if (std::any_of(shares.begin(), shares.end(),
                  [&](const AskedShare& share) { return Knows(share, question, path); })) {
    return true;
  }
  return std::any_of(question.shares.begin(), question.shares.end(), [&](const std::string& name) {
    const bool is_asked =
        std::any_of(shares.begin(), shares.end(),
                    [&name](const AskedShare& share) { return share.name == name; });
    const auto root = question.roots.find(name);
    return !is_asked && (root == question.roots.end() || Covers(path, root->second) ||
                         Covers(root->second, path));
  });
}

// A folder in the question's text of which the shares know nothing: null, or the first of them.
const QueryNode* UnknownFolder(const QueryNode& node, const Question& question,
                               const std::deque<AskedShare>& shares) {
  const bool is_written = node.part == Part::UNDER && node.end > node.start;
  if (is_written && !IsKnown(node.names.front(), question, shares)) {
    return &node;
  }
  for (size_t i = 0; i < node.below.size() && node.part != Part::NOT; ++i) {
    const QueryNode* unknown = UnknownFolder(node.below[i], question, shares);
    if (unknown != nullptr) {
      return unknown;
    }
  }
  return nullptr;
}

}  // namespace

struct Asker::Impl {
  std::deque<AskedShare> shares;
  NameMarker names;
  CutterPool cutters;
  SideBySide side_by_side;
  bool AskAll(const Question& question, Answer& answer, std::string& error);
  std::string FirstWithHits(Question question, const std::vector<std::string>& texts);
  void Choose(const std::vector<std::string>& wanted);
  Answer Gather(const HitOrder& order, uint64_t offset, uint64_t wanted);
  void Complete(std::vector<Hit>& hits);
};

// In order. Shares that are not asked this time are closed.
void Asker::Impl::Choose(const std::vector<std::string>& wanted) {
  const bool same = std::equal(
      shares.begin(), shares.end(), wanted.begin(), wanted.end(),
      [](const AskedShare& share, const std::string& name) { return share.name == name; });
  if (!same) {
    shares.clear();
    for (const std::string& share : wanted) {
      shares.emplace_back(share);
    }
  }
}

void Asker::Impl::Complete(std::vector<Hit>& hits) {
  std::vector<AskedShare*> shown;
  for (AskedShare& share : shares) {
    if (std::any_of(hits.begin(), hits.end(),
                    [&](const Hit& hit) { return hit.share == share.name; })) {
      shown.push_back(&share);
    }
  }
  side_by_side.Run(shown.size(), [&](size_t i) { shown[i]->Complete(hits, cutters); });
}

// A suggestion that has no hit either is none. Empty: all are, or a share does not answer: nobody
// waits for it once for each suggestion.
std::string Asker::Impl::FirstWithHits(Question question, const std::vector<std::string>& texts) {
  question.offset = 0;
  question.limit = 1;
  question.count_all = false;
  question.suggests = false;
  question.shows = false;
  for (const std::string& text : texts) {
    question.text = text;
    Answer answer;
    std::string error;
    if (AskAll(question, answer, error) && !answer.hits.empty()) {
      return text;
    }
    if (!answer.failures.empty()) {
      break;
    }
  }
  return "";
}

// What all shares have found, but for the first `offset` hits.
Answer Asker::Impl::Gather(const HitOrder& order, uint64_t offset, uint64_t wanted) {
  Answer made;
  BestHits best(wanted, order);
  for (AskedShare& share : shares) {
    made.total += share.total;
    if (share.has_contents) {
      made.words[share.name] = share.words;
    }
    std::move(share.failures.begin(), share.failures.end(), std::back_inserter(made.failures));
    for (Hit& hit : share.hits) {
      best.Add(std::move(hit));
    }
  }
  best.Cut();
  const auto skipped = static_cast<std::ptrdiff_t>(std::min<uint64_t>(offset, best.hits.size()));
  made.hits.assign(std::make_move_iterator(best.hits.begin() + skipped),
                   std::make_move_iterator(best.hits.end()));
  return made;
}

bool Asker::Impl::AskAll(const Question& question, Answer& answer, std::string& error) {
  Asked asked;
  if (!ReadQuestion(question, names, asked, error)) {
    return false;
  }

  const uint64_t offset = std::min(question.offset, MOST_HITS);
  const uint64_t limit = std::min(question.limit, MOST_HITS);
  const uint64_t wanted = limit == 0 ? 0 : offset + limit;
  const HitOrder order = {question.sort, question.reverse};
  Choose(asked.shares);
  // A slow share holds up no other.
  side_by_side.Run(shares.size(), [&](size_t i) { shares[i].Ask(question, asked, order, wanted); });

  Answer made = Gather(order, offset, wanted);
  if (question.shows) {
    Complete(made.hits);
  }
  const bool is_empty = made.total == 0 && made.failures.empty();
  const QueryNode* folder =
      is_empty && !question.shares.empty() ? UnknownFolder(asked.tree, question, shares) : nullptr;
  made.knows_under =
      !is_empty || question.under.empty() || IsKnown(question.under, question, shares);
  if (folder != nullptr) {
    for (AskedShare& share : shares) {
      share.Release();
    }
    error =
        QueryError{"the shares that are asked know no such folder", folder->start}.Line(asked.text);
    return false;
  }
  const bool suggests = made.knows_under && is_empty && question.suggests &&
                        (question.limit > 0 || question.count_all);
  std::vector<std::string> suggestions;
  if (suggests) {
    suggestions = Suggest(asked, shares, names);
  }
  for (AskedShare& share : shares) {
    share.Release();
  }
  made.small_operator = suggests ? SmallOperator(asked.tree) : "";
  made.suggestion = FirstWithHits(question, suggestions);
  if (suggests && made.suggestion.empty()) {
    made.word_like_field = WordLikeField(asked.tree);
  }
  answer = std::move(made);
  return true;
}

bool Understand(const Question& question, std::vector<std::string>& reached, std::string& error) {
  NameMarker names;
  Asked asked;
  if (!ReadQuestion(question, names, asked, error)) {
    return false;
  }
  reached = std::move(asked.shares);
  return true;
}

Asker::Asker() : impl(std::make_unique<Impl>()) {}

Asker::~Asker() = default;

bool Asker::Ask(const Question& question, Answer& answer, std::string& error) {
  return impl->AskAll(question, answer, error);
}

bool Ask(const Question& question, Answer& answer, std::string& error) {
  return Asker().Ask(question, answer, error);
}

}  // namespace fileindexd
