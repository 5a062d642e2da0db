// SPDX-License-Identifier: GPL-2.0-or-later
// Questions and what they are read as, in tables.
#pragma once

#include <gtest/gtest.h>

#include <cstdlib>
#include <ctime>
#include <string>
#include <vector>

#include "index/query.h"

namespace fileindexd {

constexpr time_t NOW = 1'705'320'000;  // 2024-01-15 12:00 UTC

// The tree as text, or "?" and the byte at which the question makes no sense.
inline std::string Parsed(const std::string& text) {
  QueryNode query;
  QueryError error;
  if (ParseQuery(text, NOW, query, error)) {
    EXPECT_TRUE(error.what.empty());
    return QueryText(query);
  }
  EXPECT_FALSE(error.what.empty()) << text;
  EXPECT_EQ(error.Line(text).find('\n'), std::string::npos);
  EXPECT_LE(error.at, text.size()) << text;
  return "?" + std::to_string(error.at);
}

// What is wrong with a question that makes no sense.
inline QueryError ErrorOf(const std::string& text) {
  QueryNode query;
  QueryError error;
  EXPECT_FALSE(ParseQuery(text, NOW, query, error)) << text;
  return error;
}

inline std::string LineOf(const std::string& text) {
  return ErrorOf(text).Line(text);
}

struct Case {
  std::string text;
  std::string parsed;
};

inline void ExpectAll(const std::vector<Case>& cases) {
  for (const Case& one : cases) {
    EXPECT_EQ(Parsed(one.text), one.parsed) << one.text;
  }
}

class QueryParseTest : public testing::Test {
 protected:
  void SetUp() override { Zone("UTC"); }
  static void Zone(const char* name) {
    setenv("TZ", name, 1);
    tzset();
  }
};

}  // namespace fileindexd
