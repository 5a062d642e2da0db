// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/hit_output.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <malloc.h>

#include <algorithm>
#include <cstdlib>
#include <new>

#include "ctl/terminal/cells.h"
#include "ctl/terminal/figures.h"
#include "ctl/terminal/table.h"

namespace {

size_t allocated = 0;  // by operator new of this program, in bytes
size_t most_allocated = 0;

}  // namespace

void* operator new(size_t size) {
  void* memory = malloc(size);
  if (memory == nullptr) {
    throw std::bad_alloc();
  }
  allocated += malloc_usable_size(memory);
  most_allocated = std::max(most_allocated, allocated);
  return memory;
}

void operator delete(void* memory) noexcept {
  allocated -= malloc_usable_size(memory);  // 0 of null
  free(memory);
}

void operator delete(void* memory, size_t /*size*/) noexcept {
  operator delete(memory);
}

namespace fileindexd {
namespace {

using testing::ElementsAre;

Hit FileAt(const std::string& path, int64_t size = 2048) {
  Hit hit;
  hit.share = "s";
  hit.entry.path = path;
  hit.entry.thing = Thing::FILE;
  hit.entry.size = size;
  hit.entry.mtime = int64_t{1767225600} * 1'000'000'000;
  return hit;
}

std::vector<std::string> HitLines(const std::vector<Hit>& hits, const Screen& screen) {
  const HitFormat format(hits, screen);
  std::vector<std::string> lines;
  for (const Hit& hit : hits) {
    for (std::string& line : format.Lines(hit)) {
      lines.push_back(std::move(line));
    }
  }
  return lines;
}

class HitLinesTest : public testing::Test {
 protected:
  void SetUp() override {
    setenv("TZ", "UTC", 1);
    tzset();
  }
  void TearDown() override {
    unsetenv("TZ");
    tzset();
  }
};

TEST_F(HitLinesTest, AHitIsOneLineAndItsContentAnother) {
  Hit hit = FileAt("/s/report.txt");
  hit.marks = {{3, 9}};
  hit.snippet = {"a word of it", {{2, 6}}};

  EXPECT_THAT(HitLines({hit}, {80, true}),
              ElementsAre("/s/\x1b[1;31mreport\x1b[0m.txt    2.0K  2026-01-01 00:00",
                          "    a \x1b[1;31mword\x1b[0m of it"));
  EXPECT_THAT(HitLines({hit}, {80, false}),
              ElementsAre("/s/report.txt    2.0K  2026-01-01 00:00", "    a word of it"));
}

TEST_F(HitLinesTest, FoldersHaveNoFigures) {
  Hit folder = FileAt("/s/d", 0);
  folder.entry.kind = Kind::FOLDER;

  EXPECT_THAT(HitLines({folder, FileAt("/s/longer")}, {80, false}),
              ElementsAre("/s/d            -  -", "/s/longer    2.0K  2026-01-01 00:00"));
}

TEST_F(HitLinesTest, TheLastColumnOfTheScreenStaysFree) {
  const Hit hit = FileAt("/" + std::string(300, 'x'));
  for (size_t columns = 2; columns < 400; ++columns) {
    for (const std::string& line : HitLines({hit}, {columns, false})) {
      EXPECT_LT(ColumnsOf(CellsOf(line)), columns);
    }
  }
}

TEST_F(HitLinesTest, ALongAnswerTakesNoMemoryBesideItsHits) {
  const std::vector<Hit> hits(20000, FileAt("/s/" + std::string(60, 'x')));
  const size_t before = allocated;
  most_allocated = before;

  const HitFormat format(hits, {200, false});
  EXPECT_EQ(format.Lines(hits.front()).size(), 1u);

  EXPECT_GT(most_allocated, before);
  EXPECT_LT(most_allocated, before + 100'000);
}

TEST_F(HitLinesTest, WideAndCombinedNamesStandInOneColumn) {
  const std::vector<std::string> lines =
      HitLines({FileAt("/s/\u6771\u4eac"), FileAt("/s/u\u0308"), FileAt("/s/plain")}, {80, false});

  ASSERT_EQ(lines.size(), 3u);
  EXPECT_EQ(ColumnsOf(CellsOf(lines[0])), ColumnsOf(CellsOf(lines[2])));
  EXPECT_EQ(ColumnsOf(CellsOf(lines[1])), ColumnsOf(CellsOf(lines[2])));
}

TEST(HitObjectTest, TellsBytesOfTheMarks) {
  Hit hit = FileAt("/s/report.txt");
  hit.marks = {{3, 9}};
  hit.snippet = {"a word", {{2, 6}}};

  const Json::Value object = HitObject(hit);

  EXPECT_EQ(object["marks"][0][0].asUInt(), 3u);
  EXPECT_EQ(object["marks"][0][1].asUInt(), 9u);
  EXPECT_EQ(object["snippet_marks"][0][1].asUInt(), 6u);
  EXPECT_EQ(object["snippet"].asString(), "a word");
}

TEST(ShortSizeTest, IsNeverLongerThanFiveColumns) {
  const struct {
    int64_t bytes;
    const char* text;
  } cases[] = {{0, "0B"},         {1, "1B"},          {1023, "1023B"},    {1024, "1.0K"},
               {10188, "9.9K"},   {10200, "10K"},     {1047551, "1023K"}, {1048064, "1.0M"},
               {1048575, "1.0M"}, {INT64_MAX, "8.0E"}};
  for (const auto& one : cases) {
    EXPECT_EQ(ShortSize(one.bytes), one.text) << one.bytes;
  }
}

TEST(TableTest, IsColumnsOnAScreenAndTabulatorsElsewhere) {
  const std::vector<TableRow> rows = {{"1", "name"}, {"12345", "a\nb"}};

  EXPECT_THAT(TableLines({"N", "NAME"}, rows, Screen{80, false}),
              ElementsAre("    N  NAME", "    1  name", "12345  a\\x0ab"));
  EXPECT_THAT(TableLines({"N", "NAME"}, rows, std::nullopt),
              ElementsAre("1\tname", "12345\ta\\x0ab"));
  EXPECT_THAT(TableLines({"N", "NAME"}, {{"1", "a long name"}}, Screen{9, false}),
              ElementsAre("N  NAME", "1  a…ame"));
}

TEST(TableTest, OnANarrowScreenFiguresGoButTheFirst) {
  const TableRow headings = {"BYTES", "FILES", "LINKS", "SHARE"};
  const std::vector<TableRow> rows = {{"1.0K", "2", "3", "a long name of a share"}};

  EXPECT_THAT(TableLines(headings, rows, Screen{34, false}),
              ElementsAre("BYTES  FILES  LINKS  SHARE", " 1.0K      2      3  a l… a share"));
  EXPECT_THAT(TableLines(headings, rows, Screen{33, false}),
              ElementsAre("BYTES  FILES  SHARE", " 1.0K      2  a lon…e of a share"));
  EXPECT_THAT(TableLines(headings, rows, Screen{14, false}),
              ElementsAre("BYTES  SHARE", " 1.0K  a…hare"));
  for (size_t columns = 1; columns < 60; ++columns) {
    for (const std::string& line : TableLines(headings, rows, Screen{columns, false})) {
      EXPECT_LE(ColumnsOf(CellsOf(line)), std::max<size_t>(columns - 1, 1)) << line;
    }
  }
}

}  // namespace
}  // namespace fileindexd
