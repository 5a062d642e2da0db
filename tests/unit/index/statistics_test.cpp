// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/statistics.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <filesystem>
#include <map>
#include <random>
#include <set>

#include "index/entry_table.h"
#include "index/statistics_scan.h"
#include "state/layout.h"
#include "tests/unit/index/fixture.h"

namespace fileindexd {
namespace {

using testing::ElementsAre;

constexpr int64_t SECOND = 1'000'000'000;
constexpr int64_t DAY = 24 * 60 * 60 * SECOND;
constexpr int64_t NOW = 2'000'000'000 * SECOND;

// Entries that need no disk.
class StatisticsTest : public IndexTest {
 protected:
  Entry Make(const std::string& name, int64_t size, uint64_t inode) {
    Entry entry;
    entry.path = At(name);
    entry.thing = Thing::FILE;
    entry.kind = KindOfName(name);
    entry.inode = inode;
    entry.size = size;
    entry.mtime = NOW - DAY / 2;
    entry.birth_time = entry.first_seen = NOW - DAY / 2;
    return entry;
  }

  void Put(const std::vector<Entry>& entries) {
    writer.reset();
    IndexDatabase database;
    ASSERT_EQ(database.OpenForWriting(IndexPath("s"), false), IndexError::NONE);
    EntryTable table;
    ASSERT_EQ(table.Prepare(database.db), SQLITE_OK);
    ASSERT_EQ(table.Begin(), SQLITE_OK);
    for (const Entry& entry : entries) {
      ASSERT_EQ(table.Insert(entry), SQLITE_OK);
    }
    ASSERT_EQ(table.Commit(NOW / SECOND), SQLITE_OK);
  }

  StatisticsWish Wish() {
    StatisticsWish wish;
    Share share;
    share.name = "s";
    share.path = root;
    wish.shares = {share};
    wish.now = NOW;
    return wish;
  }

  Statistics Ask(const StatisticsWish& wish) {
    Statistics statistics;
    Gather(wish, statistics);
    EXPECT_TRUE(statistics.failures.empty());
    return statistics;
  }
};

// name, entries, bytes
using Rows = std::vector<std::tuple<std::string, uint64_t, int64_t>>;

Rows RowsOf(const std::vector<EntryGroup>& groups) {
  Rows rows;
  for (const EntryGroup& group : groups) {
    rows.emplace_back(group.name, group.entries, group.bytes);
  }
  return rows;
}

// The same once more, the long way: from a list in the order of the paths.
class Slowly {
 public:
  Slowly(std::vector<Entry> all, std::string share_root)
      : entries(std::move(all)), root(std::move(share_root)) {
    std::sort(entries.begin(), entries.end(),
              [](const Entry& a, const Entry& b) { return a.path < b.path; });
    for (const Entry& entry : entries) {
      const bool counts =
          entry.thing == Thing::DIRECTORY || seen.emplace(entry.inode, entry.birth_time).second;
      bytes.push_back(counts ? entry.size : 0);
    }
  }

  template <typename Name>
  Rows By(bool with_folders, const Name& name_of) const {
    std::map<std::string, std::pair<uint64_t, int64_t>> groups;
    for (size_t i = 0; i < entries.size(); ++i) {
      if (with_folders || entries[i].thing != Thing::DIRECTORY) {
        const std::optional<std::string> name = name_of(entries[i]);
        if (name.has_value()) {
          groups[*name].first += 1;
          groups[*name].second += bytes[i];
        }
      }
    }
    Rows rows;
    for (const auto& [name, numbers] : groups) {
      rows.emplace_back(name, numbers.first, numbers.second);
    }
    std::sort(rows.begin(), rows.end(), [](const auto& a, const auto& b) {
      return std::tuple(-std::get<2>(a), -static_cast<int64_t>(std::get<1>(a)), std::get<0>(a)) <
             std::tuple(-std::get<2>(b), -static_cast<int64_t>(std::get<1>(b)), std::get<0>(b));
    });
    return rows;
  }

  std::string Folder(const Entry& entry) const {
    if (entry.path == root) {
      return root;
    }
    const std::string below = entry.path.substr(root.size() + 1);
    const size_t slash = below.find('/');
    if (slash != std::string::npos) {
      return root + "/" + below.substr(0, slash);
    }
    return entry.thing == Thing::DIRECTORY ? entry.path : root;
  }

  std::vector<std::string> Largest(size_t number) const {
    std::vector<std::pair<int64_t, std::string>> files;
    for (size_t i = 0; i < entries.size(); ++i) {
      if (entries[i].thing == Thing::FILE && (bytes[i] > 0 || entries[i].size == 0)) {
        files.emplace_back(-entries[i].size, entries[i].path);
      }
    }
    std::sort(files.begin(), files.end());
    std::vector<std::string> paths;
    for (size_t i = 0; i < std::min(number, files.size()); ++i) {
      paths.push_back(files[i].second);
    }
    return paths;
  }

 private:
  std::vector<Entry> entries;
  std::vector<int64_t> bytes;
  std::set<std::pair<uint64_t, int64_t>> seen;
  std::string root;
};

std::vector<Entry> RandomEntries(unsigned seed, const std::string& root) {
  std::mt19937 random(seed);
  const auto up_to = [&random](uint32_t most) -> uint32_t {
    return static_cast<uint32_t>(random() % (most + 1));
  };
  const char* const endings[] = {"", ".pdf", ".PDF", ".c", ".mp3", ".tar.gz", ".x y", "."};
  std::map<std::string, Entry> entries;
  for (int i = 0; i < 400; ++i) {
    Entry entry;
    entry.path = root;
    for (uint32_t depth = up_to(3); depth > 0; --depth) {
      entry.path += "/d" + std::to_string(up_to(4));
    }
    entry.path += "/n" + std::to_string(i) + endings[up_to(7)];
    const uint32_t thing = up_to(9);
    entry.thing = thing == 0 ? Thing::DIRECTORY : thing == 1 ? Thing::LINK : Thing::FILE;
    entry.inode = entry.thing == Thing::FILE ? 1 + up_to(300) : 1000 + static_cast<uint64_t>(i);
    // By the inode alone: names of one file have these in common. Few inodes come with two births.
    entry.birth_time = entry.inode % 7 == 0 ? static_cast<int64_t>(up_to(1)) * DAY
                                            : NOW - static_cast<int64_t>(entry.inode) * DAY / 10;
    entry.size =
        entry.thing == Thing::DIRECTORY
            ? 0
            : static_cast<int64_t>(
                  (entry.inode * 7919 + static_cast<uint64_t>(entry.birth_time / DAY)) % 1000);
    entry.kind = entry.thing == Thing::DIRECTORY ? Kind::FOLDER : KindOfName(entry.path);
    entry.mtime = entry.thing == Thing::DIRECTORY ? 0 : NOW - DAY * (int64_t{up_to(6000)} - 10);
    entry.first_seen = NOW - DAY * up_to(20);
    entry.owner = up_to(3);
    entries.emplace(entry.path, entry);
  }
  std::vector<Entry> list;
  for (const auto& [path, entry] : entries) {
    list.push_back(entry);
  }
  std::shuffle(list.begin(), list.end(), random);
  return list;
}

class RandomStatisticsTest : public StatisticsTest, public testing::WithParamInterface<unsigned> {};

TEST_P(RandomStatisticsTest, AgreesWithCountingTheLongWay) {
  const std::vector<Entry> entries = RandomEntries(GetParam(), root);
  Put(entries);
  const Slowly slowly(entries, root);
  StatisticsWish wish = Wish();
  wish.largest = 25;
  wish.born_since = NOW - 5 * DAY;
  const auto by = [&](GroupBy group) {
    wish.by = group;
    return RowsOf(Ask(wish).groups);
  };
  using Name = std::optional<std::string>;

  EXPECT_EQ(by(GroupBy::KIND),
            slowly.By(true, [](const Entry& entry) -> Name { return KindText(entry.kind); }));
  EXPECT_EQ(by(GroupBy::OWNER), slowly.By(true, [](const Entry& entry) -> Name {
    return std::to_string(entry.owner);
  }));
  EXPECT_EQ(by(GroupBy::FOLDER),
            slowly.By(true, [&](const Entry& entry) -> Name { return slowly.Folder(entry); }));
  EXPECT_EQ(by(GroupBy::EXTENSION),
            slowly.By(false, [](const Entry& entry) -> Name { return ExtensionOf(entry.path); }));
  EXPECT_EQ(by(GroupBy::AGE),
            slowly.By(false, [](const Entry& entry) -> Name { return AgeName(entry.mtime, NOW); }));
  const Statistics last = Ask(wish);
  EXPECT_EQ(RowsOf(last.born), slowly.By(true, [&](const Entry& entry) -> Name {
    const int64_t born = entry.birth_time == 0 ? entry.first_seen : entry.birth_time;
    return born >= *wish.born_since ? Name(slowly.Folder(entry)) : Name();
  }));
  std::vector<std::string> largest;
  for (const LargeFile& file : last.largest) {
    largest.push_back(file.path);
  }
  EXPECT_EQ(largest, slowly.Largest(25));
}

INSTANTIATE_TEST_SUITE_P(Seeds, RandomStatisticsTest, testing::Range(1U, 9U));

TEST_F(StatisticsTest, BytesOfAFileCountAtTheFirstOfItsPaths) {
  Put({Make("b.mp3", 100, 1), Make("a.pdf", 100, 1), Make("c.mp3", 10, 2)});
  StatisticsWish wish = Wish();
  wish.by = GroupBy::EXTENSION;
  wish.largest = 5;
  wish.totals = true;

  const Statistics statistics = Ask(wish);

  EXPECT_EQ(RowsOf(statistics.groups), (Rows{{"pdf", 1, 100}, {"mp3", 2, 10}}));
  ASSERT_EQ(statistics.largest.size(), 2u);
  EXPECT_EQ(statistics.largest[0].path, At("a.pdf"));
  EXPECT_EQ(statistics.totals[0].bytes, 110);
  EXPECT_EQ(statistics.totals[0].files, 3u);
}

TEST_F(StatisticsTest, SumsStopWhereTheyWouldTurnAround) {
  Put({Make("a.c", INT64_MAX, 1), Make("b.c", 1, 2), Make("c.c", INT64_MAX, 3)});
  StatisticsWish wish = Wish();
  wish.totals = true;
  wish.by = GroupBy::EXTENSION;
  wish.born_since = 0;
  wish.shares.push_back(wish.shares[0]);

  const Statistics statistics = Ask(wish);

  EXPECT_EQ(statistics.totals[0].bytes, INT64_MAX);
  EXPECT_EQ(RowsOf(statistics.groups), (Rows{{"c", 6, INT64_MAX}}));
  EXPECT_EQ(RowsOf(statistics.born), (Rows{{root, 6, INT64_MAX}}));
}

TEST_F(StatisticsTest, TwoFilesThatHadOneInodeInTurnAreTwo) {
  Entry later = Make("b", 100, 1);
  later.birth_time += 1;
  Put({Make("a", 100, 1), later});
  StatisticsWish wish = Wish();
  wish.totals = true;

  EXPECT_EQ(Ask(wish).totals[0].bytes, 200);
}

TEST_F(StatisticsTest, AShareThatCannotBeReadIsNamedAndTheOthersCounted) {
  Put({Make("a", 100, 1)});
  StatisticsWish wish = Wish();
  wish.totals = true;
  Share broken = wish.shares[0];
  broken.name = "none";
  std::filesystem::create_directories(IndexPath("none"));
  wish.shares.insert(wish.shares.begin(), broken);

  Statistics statistics;
  Gather(wish, statistics);

  ASSERT_EQ(statistics.failures.size(), 1u);
  EXPECT_THAT(statistics.failures[0], testing::HasSubstr("none"));
  ASSERT_EQ(statistics.totals.size(), 1u);
  EXPECT_EQ(statistics.totals[0].bytes, 100);
}

TEST_F(StatisticsTest, OfVeryManyNamesTheLargestAreTold) {
  std::vector<Entry> entries;
  for (size_t i = 0; i < 2 * MOST_GROUPS + 10; ++i) {
    const std::string name = "x.e" + std::to_string(i);
    entries.push_back(Make(name, i == 2 * MOST_GROUPS + 5 ? 1000 : 1, i + 1));
    entries.back().kind = Kind::OTHER;
  }
  entries.push_back(Make("y.e" + std::to_string(2 * MOST_GROUPS + 5), 5, entries.size() + 1));
  Put(entries);
  StatisticsWish wish = Wish();
  wish.by = GroupBy::EXTENSION;
  wish.totals = true;

  const Statistics statistics = Ask(wish);

  ASSERT_EQ(statistics.groups.size(), MOST_GROUPS + 1);
  EXPECT_EQ(statistics.groups[0].name, OTHER_NAMES);
  EXPECT_EQ(statistics.groups[0].entries, MOST_GROUPS + 10);
  EXPECT_EQ(statistics.groups[1].name, "e" + std::to_string(2 * MOST_GROUPS + 5));
  EXPECT_EQ(statistics.groups[1].bytes, 1005);
  EXPECT_EQ(statistics.totals[0].files, 2 * MOST_GROUPS + 11);
}

}  // namespace
}  // namespace fileindexd
