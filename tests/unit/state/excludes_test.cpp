// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/excludes.h"

#include <gtest/gtest.h>

#include <thread>

namespace fileindexd {
namespace {

Excludes Read(const std::vector<std::string>& patterns) {
  Excludes excludes;
  std::string error;
  for (const std::string& pattern : patterns) {
    EXPECT_TRUE(excludes.Add(pattern, error)) << error;
  }
  return excludes;
}

bool IsOut(const std::vector<std::string>& patterns, const std::string& path) {
  const bool directory = path.ends_with('/');
  const std::string below = directory ? path.substr(0, path.size() - 1) : path;
  return Read(patterns).KeepOut(below, directory ? Leaf::DIRECTORY : Leaf::OTHER).pattern !=
         nullptr;
}

// A path that ends in "/" is a directory.
struct Row {
  std::vector<std::string> patterns;
  std::vector<std::string> out;
  std::vector<std::string> in;
};

void Check(const std::vector<Row>& rows) {
  for (const Row& row : rows) {
    for (const std::string& path : row.out) {
      EXPECT_TRUE(IsOut(row.patterns, path)) << row.patterns.back() << " keeps out " << path;
    }
    for (const std::string& path : row.in) {
      EXPECT_FALSE(IsOut(row.patterns, path)) << row.patterns.back() << " lets in " << path;
    }
  }
}

TEST(ExcludesTest, ANameMatchesAtAnyDepthWithAllBelowIt) {
  Check({
      {{"foo"}, {"foo", "foo/", "a/foo", "a/b/foo/", "foo/x", "a/foo/x/y"}, {"food", "a", "fo"}},
      {{"foo/"}, {"foo/", "a/foo/", "foo/x", "a/foo/x/"}, {"foo", "a/foo", "food/"}},
      {{"*.o"}, {"a.o", ".o", "d/a.o", "d.o/x", "a.b.o"}, {"a.oo", "o", "a.o.c", "a.O"}},
      {{"a*b*c"}, {"abc", "axbyc", "aabbcc"}, {"ab", "acb", "abcd", "xabc"}},
      {{"**"}, {"a", "a/b", ".x"}, {}},
      {{"f**o"}, {"fo", "fxyo", "d/foo"}, {"f/o", "fox"}},
  });
}

TEST(ExcludesTest, ASlashAtTheBeginningOrInTheMiddleBindsToTheFolder) {
  Check({
      {{"/foo"}, {"foo", "foo/", "foo/x"}, {"a/foo", "a/foo/"}},
      {{"/foo/"}, {"foo/", "foo/x"}, {"foo", "a/foo/"}},
      {{"doc/frotz/"}, {"doc/frotz/", "doc/frotz/x"}, {"a/doc/frotz/", "doc/frotz", "frotz/"}},
      {{"doc/*.txt"}, {"doc/a.txt"}, {"doc/x/a.txt", "a.txt", "x/doc/a.txt"}},
      {{"/*"}, {"a", "a/b", "a/"}, {}},
      {{"/*.c"}, {"cat.c"}, {"mozilla/sha1.c"}},
      {{"foo/*"}, {"foo/test.json", "foo/bar/", "foo/bar/hello.c"}, {"foo/", "foo", "a/foo/x"}},
      {{"a\\/b"}, {"a/b", "a/b/c"}, {"x/a/b", "a"}},
      {{"a//b"}, {}, {"a/b", "a"}},
  });
}

TEST(ExcludesTest, TwoAsterisksAloneStandForAnyNumberOfDirectories) {
  Check({
      {{"**/foo"}, {"foo", "a/foo", "a/b/foo/", "foo/x"}, {"afoo", "a/food"}},
      {{"**/foo/bar"}, {"foo/bar", "a/foo/bar", "a/foo/bar/x"}, {"foo", "foo/x/bar", "bar"}},
      {{"abc/**"}, {"abc/x", "abc/x/y", "abc/d/"}, {"abc", "abc/", "x/abc/y"}},
      {{"a/**/b"}, {"a/b", "a/x/b", "a/x/y/b", "a/b/c"}, {"a", "b", "x/a/b", "a/xb", "ab"}},
      {{"a/**/b/**/c"}, {"a/b/c", "a/x/b/y/z/c", "a/b/b/c/c"}, {"a/c", "a/b", "b/c", "a/c/b"}},
      {{"**/a/**"}, {"a/x", "p/q/a/x/y"}, {"a", "p/a/", "pa/x"}},
      {{"a/***/b"}, {"a/b", "a/x/y/b"}, {"b"}},
      {{"a/**b"}, {"a/b", "a/xb"}, {"a/x/b", "a/x/yb"}},
      {{"a**/b"}, {"a/b", "axy/b"}, {"a/x/b", "ax/y/b"}},
      {{"/**"}, {"a", "a/b"}, {}},
      {{"a/**/"}, {"a/b/", "a/b/c", "a/b/c/"}, {"a/", "a/b"}},
  });
}

TEST(ExcludesTest, OneByteIsAnyOrOfASet) {
  Check({
      {{"?"}, {"a", "d/x", "\xff"}, {"ab", "ab/cd"}},
      {{"a?c"}, {"abc", "a?c"}, {"ac", "a/c", "abbc"}},
      {{"x[a-c]"}, {"xa", "xb", "xc"}, {"x", "xd", "x-", "xab"}},
      {{"x[!a-c]"}, {"xd", "x-"}, {"xa", "x", "xb"}},
      {{"x[^a]"}, {"xb"}, {"xa"}},
      {{"[]a]"}, {"]", "a"}, {"b", "[]"}},
      {{"[!]a]"}, {"b"}, {"]", "a"}},
      {{"[a-]"}, {"a", "-"}, {"b"}},
      {{"[-a]"}, {"-", "a"}, {"b"}},
      {{"[\\]]"}, {"]"}, {"\\", "a"}},
      {{"[\\a-\\c]"}, {"b"}, {"\\", "-"}},
      {{"[z-a]"}, {"z"}, {"a", "b", "-"}},
      {{"[[:digit:]x]"}, {"7", "x"}, {":", "d", "[7]"}},
      {{"[![:upper:]]"}, {"a", "1"}, {"A"}},
      {{"[[:]"}, {"[", ":"}, {"]"}},
      {{"[\xe0-\xff]"}, {"\xe4"}, {"a", "\x80"}},
      {{"a[/]b"}, {}, {"a/b", "a[/]b", "ab"}},
      {{"a[!x]b/c"}, {"ayb/c"}, {"axb/c", "a/b/c"}},
  });
}

TEST(ExcludesTest, ABackslashTakesTheNextByteAsItIs) {
  Check({
      {{"\\!x"}, {"!x"}, {"x", "\\!x"}},
      {{"\\#x"}, {"#x"}, {"x"}},
      {{"#x#"}, {"#x#"}, {"x"}},
      {{"a\\*b"}, {"a*b"}, {"axb", "a\\b"}},
      {{"\\?"}, {"?"}, {"a"}},
      {{"\\[a]"}, {"[a]"}, {"a"}},
      {{"\\a\\\\"}, {"a\\"}, {"a"}},
      {{"foo "}, {"foo"}, {"foo "}},
      {{"foo   "}, {"foo"}, {"foo "}},
      {{"foo\\ "}, {"foo "}, {"foo"}},
      {{"foo\\  "}, {"foo "}, {"foo", "foo  "}},
      {{"foo\\\\ "}, {"foo\\"}, {"foo\\ "}},
      {{" a b"}, {" a b"}, {"a b"}},
      {{"a\tb\r"}, {"a\tb\r"}, {"a"}},
  });
}

TEST(ExcludesTest, TheLastPatternThatMatchesDecides) {
  Check({
      {{"*.txt", "!keep.txt"}, {"a.txt", "d/a.txt"}, {"keep.txt", "d/keep.txt", "a"}},
      {{"!keep.txt", "*.txt"}, {"keep.txt"}, {"a"}},
      {{"*", "!*.c"}, {"a", "d/", "d/a.c"}, {"a.c"}},
      {{"a", "!a", "a"}, {"a"}, {}},
      {{"!a"}, {}, {"a"}},
      {{"foo/*", "!foo/bar"}, {"foo/x"}, {"foo/", "foo/bar", "foo/bar/x"}},
      {{"x", "!x/"}, {"x", "d/x"}, {"x/", "d/x/", "x/y"}},
  });
}

TEST(ExcludesTest, WhatLiesInADirectoryThatIsOutStaysOut) {
  Check({
      {{"build", "!build/keep.txt"}, {"build/", "build/keep.txt"}, {"keep.txt"}},
      {{"build/", "!keep.txt"}, {"build/keep.txt", "build/d/keep.txt"}, {"keep.txt"}},
      {{"/*", "!/foo", "/foo/*", "!/foo/bar"},
       {"a", "foo/a", "a/foo/bar"},
       {"foo/", "foo/bar/", "foo/bar/x"}},
      {{"a/**", "!a/b/"}, {"a/x", "a/b"}, {"a/", "a/b/"}},
  });
}

TEST(ExcludesTest, TheMatchSaysWhichPatternAndHowMuchOfThePath) {
  const Excludes excludes = Read({"*.tmp", "build/", "out"});

  const Excludes::Match match = excludes.KeepOut("src/build/out/a.tmp", Leaf::OTHER);

  ASSERT_NE(match.pattern, nullptr);
  EXPECT_EQ(*match.pattern, "build/");
  EXPECT_EQ(match.length, std::string("src/build").size());
  EXPECT_EQ(excludes.KeepOut("", Leaf::DIRECTORY).pattern, nullptr);
  EXPECT_EQ(Read({}).KeepOut("a", Leaf::OTHER).pattern, nullptr);
}

TEST(ExcludesTest, WhatIsNoPatternIsRefusedByName) {
  for (const auto& [pattern, named] : std::vector<std::pair<std::string, std::string>>{
           {"", "\"\""},
           {"   ", "nothing"},
           {"!", "\"!\""},
           {"/", "\"/\""},
           {"!/", "\"!/\""},
           {"//", "\"//\""},
           {"a[b", "a[b"},
           {"[", "bracket"},
           {"[]", "bracket"},
           {"[!]", "bracket"},
           {"[a\\", "bracket"},
           {"[a\\]", "bracket"},
           {"[[:digit:", "bracket"},
           {"[[:digits:]]", "class"},
           {"a\\", "backslash"},
           {"a\nb", "newline"},
           {std::string("a\0b", 3), "NUL"},
           {std::string(MAX_EXCLUDE_LENGTH + 1, 'a'), "longer than 4096"},
       }) {
    Excludes excludes;
    std::string error;
    EXPECT_FALSE(excludes.Add(pattern, error)) << pattern;
    EXPECT_NE(error.find(named), std::string::npos) << error;
    EXPECT_TRUE(excludes.patterns.empty());
    EXPECT_LT(error.size(), 300U);
  }
}

TEST(ExcludesTest, LengthAndNumberHaveTheirLimits) {
  Excludes excludes;
  std::string error;
  EXPECT_TRUE(excludes.Add(std::string(MAX_EXCLUDE_LENGTH, 'a'), error)) << error;
  for (size_t i = 1; i < MAX_EXCLUDES; ++i) {
    ASSERT_TRUE(excludes.Add("x" + std::to_string(i), error)) << error;
  }
  EXPECT_FALSE(excludes.Add("one more", error));
  EXPECT_NE(error.find("one more"), std::string::npos) << error;
  EXPECT_NE(excludes.KeepOut("x999", Leaf::OTHER).pattern, nullptr);
}

TEST(ExcludesTest, WhatIsNotKnownToBeAFileIsKeptOutOnlyIfADirectoryIsToo) {
  const auto is_out = [](const std::vector<std::string>& patterns, const std::string& path) {
    return Read(patterns).KeepOut(path, Leaf::UNKNOWN).pattern != nullptr;
  };
  EXPECT_TRUE(is_out({"x"}, "x"));
  EXPECT_FALSE(is_out({"x/"}, "x"));
  EXPECT_TRUE(is_out({"x/"}, "x/y"));
  EXPECT_FALSE(is_out({"*", "!*/"}, "x"));
  EXPECT_FALSE(is_out({"*", "!*/"}, "x/y"));
  EXPECT_TRUE(is_out({"*", "!*/", "x"}, "x"));
  EXPECT_TRUE(is_out({"*", "!y/"}, "x"));
  EXPECT_TRUE(is_out({"*", "!y/"}, "x/y"));
}

// Each of these takes longer than the age of the world where every way to match is tried.
TEST(ExcludesTest, HostilePatternsCostNoMoreThanTheirLength) {
  std::string stars;
  std::string depths = "/";
  for (int i = 0; i < 1000; ++i) {
    stars += "*a";
    depths += "**/a/";
  }
  std::string deep;
  for (int i = 0; i < 2000; ++i) {
    deep += "a/";
  }
  EXPECT_FALSE(IsOut({stars.substr(0, 200) + "b"}, std::string(255, 'a')));
  EXPECT_FALSE(IsOut({stars + "b"}, std::string(4000, 'a')));
  EXPECT_FALSE(IsOut({depths.substr(0, 1501) + "b"}, deep + "a"));
  EXPECT_TRUE(IsOut({depths.substr(0, 1501) + "b"}, deep + "b"));
}

TEST(ExcludesTest, ThreadsUseOneObject) {
  const Excludes excludes = Read({"*.o", "!keep.o", "build/", "a/**/b"});
  std::vector<int> wrong(4, 0);
  std::vector<std::thread> threads;
  for (int& count : wrong) {
    threads.emplace_back([&excludes, &count] {
      for (int i = 0; i < 1000; ++i) {
        count += excludes.KeepOut("x/y.o", Leaf::OTHER).pattern == nullptr ? 1 : 0;
        count += excludes.KeepOut("x/keep.o", Leaf::OTHER).pattern != nullptr ? 1 : 0;
        count += excludes.KeepOut("a/q/b", Leaf::OTHER).pattern == nullptr ? 1 : 0;
      }
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
  EXPECT_EQ(wrong, std::vector<int>(4, 0));
}

}  // namespace
}  // namespace fileindexd
