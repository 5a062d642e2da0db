// SPDX-License-Identifier: GPL-2.0-or-later
// Shares that have no index yet, and folders that questions name.
#include <sys/stat.h>

#include <filesystem>

#include "index/statistics.h"
#include "state/layout.h"
#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

class QueryPlacesTest : public QuestionTest {
 protected:
  void SetUp() override {
    QuestionTest::SetUp();
    fresh = folder + "/fresh";
    MakeFolder(fresh);
    MakeFolder(fresh + "/new");
    WriteFile(fresh + "/new/whale.txt", "");
    question.roots = {{"s", root}, {"fresh", fresh}};
  }

  Names PathsIn(const Names& shares, const std::string& text) {
    question.shares = shares;
    return Paths(text);
  }

  std::string fresh;  // folder of a share that was never indexed
};

TEST_F(QueryPlacesTest, ShareWithoutAnIndexYetHoldsNothingToFind) {
  Store({{"whale.txt", TextContent("x")}});

  EXPECT_EQ(PathsIn({"fresh"}, "whale"), Names());
  EXPECT_EQ(answer.failures, Names());
  EXPECT_EQ(PathsIn({"s", "fresh"}, "whale"), Names({At("whale.txt")}));
  EXPECT_EQ(answer.failures, Names());
  std::string error;
  ASSERT_TRUE(MakeShareFolder("fresh", error)) << error;
  EXPECT_EQ(PathsIn({"fresh", "s"}, "whale"), Names({At("whale.txt")}))
      << "its queue is there alone";
  EXPECT_EQ(answer.failures, Names());
}

TEST_F(QueryPlacesTest, IndexFolderWithoutItsDatabaseIsNamed) {
  std::string error;
  ASSERT_TRUE(MakeShareFolder("fresh", error)) << error;
  MakeFolder(IndexPath("fresh"));

  EXPECT_EQ(PathsIn({"fresh"}, "whale"), Names());
  ASSERT_EQ(answer.failures.size(), 1U);
  EXPECT_TRUE(answer.failures[0].starts_with("share fresh: ")) << answer.failures[0];
}

TEST_F(QueryPlacesTest, StatisticsCountNothingOfAShareWithoutAnIndexYet) {
  AddAll();
  StatisticsWish wish;
  wish.totals = wish.duplicates = true;
  for (const auto& [name, path] : question.roots) {
    wish.shares.push_back({name, path, ""});
  }

  Statistics statistics;
  Gather(wish, statistics);
  EXPECT_EQ(statistics.failures, Names());
  ASSERT_EQ(statistics.totals.size(), 1U);
  EXPECT_EQ(statistics.totals[0].share, "s");
}

TEST_F(QueryPlacesTest, FoldersThatNoShareKnowsAreRefused) {
  Store({{"whale.txt", TextContent("x")}});

  EXPECT_EQ(Hits("whale under:/no/such"),
            Names({"error: whale under:/no/such: the shares that are asked know no such folder "
                   "(character 7, at: under:/no/such)"}));
  EXPECT_EQ(Hits("under:" + root + "/whale.tx")[0].substr(0, 6), "error:");
  EXPECT_EQ(Hits("whale under:" + root), Names({"whale.txt"}));
  EXPECT_EQ(Hits("none under:" + root), Names());
  EXPECT_EQ(Hits("whale -under:/no/such"), Names({"whale.txt"}));
  EXPECT_EQ(Hits("whale OR under:/no/such"), Names({"whale.txt"}));
  question.under = "/no/such";
  EXPECT_EQ(Hits("whale type:doc"), Names()) << "an option is its caller's matter";
  EXPECT_FALSE(answer.knows_under);
  EXPECT_EQ(answer.word_like_field, "") << "other words would find nothing either";
  for (const std::string& known : {root, folder}) {
    question.under = known;
    EXPECT_EQ(Hits("none"), Names());
    EXPECT_TRUE(answer.knows_under) << known;
  }
}

// What a share will hold that was never indexed is known by the disk alone.
TEST_F(QueryPlacesTest, FoldersOfAShareWithoutAnIndexYetAreKnownByTheDisk) {
  const auto is_refused = [this](const Names& shares, const std::string& path) {
    const Names hits = PathsIn(shares, "whale under:" + path);
    EXPECT_LE(hits.size(), 1U) << path;
    return !hits.empty();
  };
  const struct {
    std::string path;
    bool is_refused;
  } cases[] = {
      {fresh, false},
      {fresh + "/new", false},
      {folder, false},
      {fresh + "/nwe", true},
      {fresh + "/new/nothing", true},
      {fresh + "/new/whale.txt", true},
      {fresh + "x", true},
      {"/proc", true},
      {"/no/such", true},
  };
  for (const auto& one : cases) {
    EXPECT_EQ(is_refused({"fresh"}, one.path), one.is_refused) << one.path;
    EXPECT_EQ(is_refused({"fresh", "s"}, one.path), one.is_refused) << one.path;
  }
  EXPECT_TRUE(is_refused({"s"}, fresh + "/new")) << "that share is not asked";
  EXPECT_FALSE(is_refused({}, "/no/such")) << "where nobody is asked, nobody can tell";
}

TEST_F(QueryPlacesTest, SharesThatTheQuestionRulesOutAreNotAsked) {
  Store({{"whale.txt", TextContent("x")}});
  std::string error;
  ASSERT_TRUE(MakeShareFolder("fresh", error)) << error;
  MakeFolder(IndexPath("fresh"));  // nothing in it: whoever asks this share fails
  const std::string here = "under:" + root;
  const std::string there = "under:" + fresh;

  for (const std::string& text :
       {std::string("share:s whale"), std::string("whale -share:fresh"), "whale " + here,
        "(share:s OR " + here + ") whale", "whale -(share:fresh OR " + there + ")",
        "(whale share:s) OR (whale share:fresh " + here + ")"}) {
    EXPECT_EQ(PathsIn({"s", "fresh"}, text), Names({At("whale.txt")})) << text;
    EXPECT_EQ(answer.failures, Names()) << text;
  }
  for (const std::string& text :
       {std::string("whale"), std::string("whale share:s,fresh"), std::string("whale OR share:s"),
        "whale under:" + folder, "whale OR " + here, "whale -" + there + "/new",
        std::string("whale -(share:fresh x)")}) {
    EXPECT_EQ(PathsIn({"s", "fresh"}, text), Names({At("whale.txt")})) << text;
    EXPECT_EQ(answer.failures.size(), 1U) << text;
  }
  question.roots.clear();
  EXPECT_EQ(PathsIn({"s", "fresh"}, "whale " + here), Names({At("whale.txt")}));
  EXPECT_EQ(answer.failures.size(), 1U) << "nobody knows where it lies";
}

TEST_F(QueryPlacesTest, FolderOfAShareThatIsRuledOutIsNoUnknownOne) {
  Store({{"whale.txt", TextContent("x")}});

  EXPECT_EQ(PathsIn({"s", "fresh"}, "share:fresh under:" + root), Names());
  EXPECT_EQ(PathsIn({"s", "fresh"}, "share:fresh under:/no/such")[0].substr(0, 6), "error:");
}

// Text that is not UTF-8 is shown and looked for in another form. A path is its bytes.
TEST_F(QueryPlacesTest, PathsMayHoldAnyByte) {
  const std::string name = "bad\xff\xfe name";
  for (const std::string& each : {name, std::string("bad\xff\xfd name"), std::string("plain")}) {
    MakeFolder(At(each));
    WriteFile(At(each + "/whale.txt"), "");
    Add(each);
    Add(each + "/whale.txt");
  }
  Commit();

  const Names hit = {At(name + "/whale.txt")};
  const std::string written = "under:\"" + At(name) + "\"";
  EXPECT_EQ(PathsIn({"s"}, "whale " + written), hit);
  EXPECT_EQ(PathsIn({"s"}, "(x\xff\xe2\x82 OR wh\u00e4le* OR whale) " + written + " ext:txt"), hit);
  EXPECT_EQ(PathsIn({"s"}, "whale under:" + At("plain")), Names({At("plain/whale.txt")}));
  EXPECT_EQ(PathsIn({"s"}, "whale under:\"" + At("bad\ufffd\ufffd name") + "\"")[0].substr(0, 6),
            "error:");
}

TEST_F(QueryPlacesTest, FolderOfAnEmptyShareIsKnown) {
  AddAll();

  EXPECT_EQ(PathsIn({"s"}, "whale under:" + root), Names());
  EXPECT_EQ(PathsIn({"s"}, "whale under:" + folder), Names());
  EXPECT_EQ(PathsIn({"s"}, "whale under:" + root + "/none")[0].substr(0, 6), "error:");
}

}  // namespace fileindexd
