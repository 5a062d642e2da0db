// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/info_question.h"

#include "base/utf8.h"
#include "ctl/output.h"
#include "index/content_terms.h"

namespace fileindexd {

namespace {

std::vector<ContentTerm> Terms(const EntryContent& content) {
  return content.is_known ? TermsOf(content.stored.content, content.stored.language)
                          : std::vector<ContentTerm>();
}

}  // namespace

int CheckQuestion(const std::string& text, const std::vector<Share>& shares) {
  Question question;
  question.text = text;
  question.limit = 0;
  for (const Share& share : shares) {
    question.known.push_back(share.name);
  }
  Answer answer;  // of no share: only the question is looked at
  std::string error;
  if (!Ask(question, answer, error)) {
    return Fail(EXIT_USAGE, "info: --query: %s", error.c_str());
  }
  return EXIT_DONE;
}

void ExplainPath(const std::string& text, const PathFacts& facts, QuestionFacts& question) {
  question.text = text;
  if (!facts.in_index || facts.share == nullptr) {
    question.problem =
        facts.index_read ? "not in the index: no search finds it" : "the index cannot be read";
    return;
  }

  Question asked;
  asked.text = text;
  asked.shares = {facts.share->name};
  std::string error;
  if (Explain(asked, facts.path, question.explanation, error) != IndexError::NONE) {
    question.problem = error;
  }
}

Json::Value QuestionObject(const QuestionFacts& question) {
  Json::Value object(Json::objectValue);
  object["text"] = ToUtf8(question.text);
  object["matches"] = question.problem.empty() && question.explanation.matches;
  object["problem"] = ToUtf8(question.problem);
  Json::Value& reasons = object["reasons"] = Json::Value(Json::arrayValue);
  for (const Reason& reason : question.explanation.reasons) {
    Json::Value item(Json::objectValue);
    item["part"] = ToUtf8(reason.part);
    item["matches"] = reason.matches;
    item["where"] = ToUtf8(reason.where);
    reasons.append(item);
  }
  return object;
}

FactLines QuestionLines(const QuestionFacts& question) {
  FactLines lines = {{"query", question.text}};
  if (!question.problem.empty()) {
    lines.emplace_back("answer", question.problem);
    return lines;
  }
  lines.emplace_back("answer", question.explanation.matches ? "found" : "not found");
  for (const Reason& reason : question.explanation.reasons) {
    const std::string where = reason.where.empty() ? "" : " (" + reason.where + ")";
    lines.emplace_back(reason.matches ? "  matches" : "  no match", reason.part + where);
  }
  return lines;
}

Json::Value TermsList(const EntryContent& content) {
  Json::Value list(Json::arrayValue);
  for (const ContentTerm& term : Terms(content)) {
    Json::Value item(Json::objectValue);
    item["term"] = ToUtf8(term.term);
    item["count"] = static_cast<Json::UInt64>(term.count);
    list.append(item);
  }
  return list;
}

FactLines TermLines(const EntryContent& content) {
  FactLines lines;
  for (const ContentTerm& term : Terms(content)) {
    lines.emplace_back("  term", term.term + " (" + std::to_string(term.count) + ")");
  }
  if (lines.empty()) {
    lines.emplace_back("  terms", "none");
  }
  return lines;
}

}  // namespace fileindexd
