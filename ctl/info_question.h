// SPDX-License-Identifier: GPL-2.0-or-later
// Why a question finds a path or not, as info shows it; and the words that it could be found by.
#pragma once

#include <json/value.h>

#include <string>
#include <utility>
#include <vector>

#include "ctl/info_facts.h"
#include "index/search.h"

namespace fileindexd {

using FactLines = std::vector<std::pair<std::string, std::string>>;

struct QuestionFacts {
  std::string text;
  std::string problem;  // why there is nothing to explain; empty: there is
  Explanation explanation;
};

// The exit code, its line written; the answer to a question that makes no sense is EXIT_USAGE.
int CheckQuestion(const std::string& text, const std::vector<Share>& shares);
void ExplainPath(const std::string& text, const PathFacts& facts, QuestionFacts& question);

Json::Value QuestionObject(const QuestionFacts& question);
FactLines QuestionLines(const QuestionFacts& question);

Json::Value TermsList(const EntryContent& content);
FactLines TermLines(const EntryContent& content);

}  // namespace fileindexd
