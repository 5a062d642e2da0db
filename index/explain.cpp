// SPDX-License-Identifier: GPL-2.0-or-later
// Why one entry answers a question, or does not.
#include <cmath>
#include <ctime>
#include <exception>
#include <optional>
#include <utility>

#include "index/asked_share.h"
#include "index/kind.h"
#include "index/name_marker.h"
#include "index/query_fields.h"
#include "index/row_check.h"
#include "index/search.h"
#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

// `split`: localtime_r or gmtime_r.
std::string TimeText(int64_t seconds, tm* (*split)(const time_t*, tm*)) {
  const time_t time = seconds;
  tm broken{};
  char text[64];
  const bool made = split(&time, &broken) != nullptr &&
                    strftime(text, sizeof(text), "%Y-%m-%d %H:%M:%S", &broken) > 0;
  return made ? text : std::to_string(seconds);
}

std::string NumberText(const QueryNode& node, int64_t number) {
  constexpr int64_t SECOND = 1'000'000'000;
  switch (FormOf(node.column, node.field)) {
    case ValueForm::NANOSECONDS:
      return TimeText(number / SECOND - (number % SECOND < 0 ? 1 : 0), localtime_r);
    case ValueForm::SECONDS:
      return TimeText(number, localtime_r);
    case ValueForm::CAMERA_TIME:
      return TimeText(number, gmtime_r);  // what the camera's clock said
    case ValueForm::DURATION:
      return std::to_string(number / 1000) + " s";
    case ValueForm::BYTES:
      return std::to_string(number) + " bytes";
    case ValueForm::BITS:
      return std::to_string(number) + " bits/s";
    case ValueForm::NUMBER:
    case ValueForm::RATING:
      break;
  }
  return std::to_string(number);
}

class Explainer {
 public:
  Explainer(AskedShare& of_share, const Asked& in_question)
      : share(of_share),
        asked(in_question),
        rows(of_share.statements, of_share.has_contents),
        sets(of_share.statements, of_share.has_contents, in_question, of_share.name),
        check(rows, sets) {}

  int Run(const Entry& entry, Explanation& explanation) {
    Candidate candidate;
    candidate.entry = entry;
    int code = sets.ReadAll();
    code = code == SQLITE_OK ? AddReasons(asked.tree, candidate, explanation) : code;
    return code == SQLITE_OK ? check.Matches(asked.tree, candidate, explanation.matches) : code;
  }

 private:
  // Groups are told part by part; what is negated, as a whole.
  int AddReasons(const QueryNode& node, Candidate& candidate, Explanation& explanation) {
    if (node.part == Part::AND || node.part == Part::OR) {
      int code = SQLITE_OK;
      for (size_t i = 0; i < node.below.size() && code == SQLITE_OK; ++i) {
        code = AddReasons(node.below[i], candidate, explanation);
      }
      return code;
    }
    Reason reason;
    reason.part = PartText(node);
    int code = check.Matches(node, candidate, reason.matches);
    if (code == SQLITE_OK && (reason.matches || node.part == Part::RANGE ||
                              node.part == Part::NEAR || node.part == Part::KIND)) {
      code = Where(node, candidate, reason.where);
    }
    explanation.reasons.push_back(std::move(reason));
    return code;
  }

  // As it was written; what came from an option was not.
  std::string PartText(const QueryNode& node) const {
    if (node.end == node.start) {
      return QueryText(node);
    }
    const std::string written = asked.text.substr(node.start, node.end - node.start);
    return node.shared_field == nullptr ? written
                                        : std::string(node.shared_field) + ":(" + written + ")";
  }

  int Where(const QueryNode& node, Candidate& candidate, std::string& where) {
    switch (node.part) {
      case Part::WORD:
        return WhereWord(node, candidate, where);
      case Part::NAME_PATTERN:
      case Part::EXACT_NAME:
      case Part::EXT:
        where = "name";
        return SQLITE_OK;
      case Part::RANGE: {
        const std::optional<int64_t> number = NumberOf(node, candidate);
        where = number.has_value() ? NumberText(node, *number) : "none";
        return SQLITE_OK;
      }
      case Part::NEAR: {
        const std::optional<double> distance = DistanceOf(node, candidate);
        where = distance.has_value() ? std::to_string(std::llround(*distance)) + " m away" : "none";
        return SQLITE_OK;
      }
      case Part::KIND: {
        Kind kind = Kind::OTHER;
        const int code = rows.KindOf(candidate, kind);
        where = KindText(kind);
        return code;
      }
      default:
        return SQLITE_OK;
    }
  }

  // The fields of its content that hold it, after the name.
  int WhereWord(const QueryNode& node, Candidate& candidate, std::string& where) {
    bool in_name = false;
    bool in_text = false;
    int code = check.InName(node, candidate, in_name);
    where = in_name ? "name" : where;
    code = code == SQLITE_OK ? check.InText(node, candidate, in_text) : code;
    if (code != SQLITE_OK || !in_text) {
      return code;
    }
    Statement match;
    code = match.Prepare(share.reader.database.db,
                         "SELECT 1 FROM contents.words WHERE words MATCH ?1 AND rowid = ?2");
    for (size_t number = 1; number <= TEXT_FIELD_COUNT + 1 && code == SQLITE_OK; ++number) {
      QueryNode in_field = node;
      in_field.scope = number > TEXT_FIELD_COUNT ? Scope::TEXT : Scope::FIELD;
      in_field.field = static_cast<ContentField>(number);
      const bool is_asked =
          node.scope == Scope::ANY || (node.scope == in_field.scope &&
                                       (node.scope == Scope::TEXT || node.field == in_field.field));
      if (!is_asked) {
        continue;
      }
      const std::string query = TextQueryOf(in_field);
      match.BindText(1, query);
      match.BindInt(2, candidate.facts->text);
      bool found = false;
      code = match.ReadOne(found, [&] {
        where += where.empty() ? "" : ", ";
        where += number > TEXT_FIELD_COUNT ? "text" : FieldName(in_field.field);
      });
    }
    where += where.empty() ? "number" : "";
    return code;
  }

  AskedShare& share;
  const Asked& asked;
  CandidateRows rows;
  WordSets sets;
  RowCheck check;
};

IndexError ExplainIn(AskedShare& share, const Asked& asked, const std::string& path,
                     Explanation& explanation, std::string& error) {
  const IndexError opened = share.Open(true);
  if (opened != IndexError::NONE) {
    error = IndexErrorText(opened);
    return opened;
  }
  if (share.contents_error != IndexError::NONE &&
      share.contents_error != IndexError::PATH_NOT_FOUND) {
    error = std::string("contents: ") + IndexErrorText(share.contents_error);
    return share.contents_error;
  }
  std::optional<Entry> entry;
  const IndexError found = share.reader.Find(path, entry);
  if (found != IndexError::NONE) {
    error = IndexErrorText(found);
    return found;
  }
  if (!entry.has_value()) {
    error = "not in the index: " + path;
    return IndexError::PATH_NOT_FOUND;
  }
  Explanation made;
  const int code = Explainer(share, asked).Run(*entry, made);
  if (code != SQLITE_OK) {
    error = IndexErrorText(FromSqlite(code));
    return FromSqlite(code);
  }
  explanation = std::move(made);
  return IndexError::NONE;
}

}  // namespace

IndexError Explain(const Question& question, const std::string& path, Explanation& explanation,
                   std::string& error) {
  Asked asked;
  NameMarker names;
  if (!asked.Read(question, names, error)) {
    return IndexError::OTHER;
  }
  if (question.shares.empty()) {
    error = "in no share: " + path;
    return IndexError::PATH_NOT_FOUND;
  }
  AskedShare share(question.shares.front());
  try {
    return ExplainIn(share, asked, path, explanation, error);
  } catch (const std::exception& failure) {
    error = failure.what();
    return IndexError::NO_MEMORY;
  }
}

}  // namespace fileindexd
