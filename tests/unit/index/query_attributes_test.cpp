// SPDX-License-Identifier: GPL-2.0-or-later
// Parts of questions that are not words, and the order of answers.
#include <sys/stat.h>
#include <sys/time.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>

#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

class QueryAttributesTest : public QuestionTest {
 protected:
  // A file of that size and age, added.
  void Make(const std::string& name, off_t size, time_t modified = 1'700'000'000) {
    WriteFile(At(name), "");
    ASSERT_EQ(truncate(At(name).c_str(), size), 0);
    const timeval times[2] = {{modified, 0}, {modified, 0}};
    ASSERT_EQ(utimes(At(name).c_str(), times), 0);
    Add(name);
    Commit();
  }
};

TEST_F(QueryAttributesTest, SizesAndTimesAreRanges) {
  setenv("TZ", "UTC", 1);
  tzset();
  MakeFolder(At("d"));
  Add("d");
  Make("small", 10, 1'704'412'799);     // the last second of 2024-01-04
  Make("middle", 2048, 1'704'412'800);  // 2024-01-05
  Make("large", 5 << 20, time(nullptr));

  EXPECT_EQ(Sorted("size:>1K"), Names({"large", "middle"}));
  EXPECT_EQ(Sorted("size:2K"), Names({"middle"}));
  EXPECT_EQ(Sorted("size:..2K"), Names({"middle", "small"}));
  EXPECT_EQ(Sorted("size:10..2047"), Names({"small"}));
  EXPECT_EQ(Sorted("size:>=0"), Names({"large", "middle", "small"})) << "a folder has no size";
  EXPECT_EQ(Sorted("modified:2024-01-05"), Names({"middle"}));
  EXPECT_EQ(Sorted("modified:2024"), Names({"middle", "small"}));
  EXPECT_EQ(Sorted("modified:<2024-01-05"), Names({"small"}));
  EXPECT_EQ(Sorted("modified:>-1d"), Names({"large"}));
  EXPECT_EQ(Sorted("modified:2024-01-05.. size:<1M"), Names({"middle"}));
  EXPECT_EQ(Sorted("added:>-1d is:folder"), Names({"d"}));
  EXPECT_EQ(Sorted("added:<2024"), Names());
}

TEST_F(QueryAttributesTest, KindsEndingsPlacesAndProperties) {
  MakeFolder(At("d"));
  MakeFolder(At("d!x"));
  Add("d");
  Empty({"d/a.JPG", "d/b.pdf", "d!x/c.jpg", ".hidden.jpg", "jpg", "no jpg"});
  Make("d/full.bin", 3);
  ASSERT_EQ(symlink("a.JPG", At("d/link").c_str()), 0);
  Add("d/link");
  Commit();

  EXPECT_EQ(Sorted("ext:jpg"), Names({".hidden.jpg", "d!x/c.jpg", "d/a.JPG"}));
  EXPECT_EQ(Sorted("ext:pdf,bin"), Names({"d/b.pdf", "d/full.bin"}));
  EXPECT_EQ(Sorted("kind:photo"), Names({".hidden.jpg", "d!x/c.jpg", "d/a.JPG"}));
  EXPECT_EQ(Sorted("kind:photo,document -is:hidden"), Names({"d!x/c.jpg", "d/a.JPG", "d/b.pdf"}));
  EXPECT_EQ(Sorted("under:" + At("d")), Names({"d", "d/a.JPG", "d/b.pdf", "d/full.bin", "d/link"}));
  EXPECT_EQ(Sorted("jpg under:" + At("d")), Names({"d/a.JPG"}));
  EXPECT_EQ(Sorted("path:D/B"), Names({"d/b.pdf"}));
  EXPECT_EQ(Sorted("path:share*x/*jpg"), Names({"d!x/c.jpg"}));
  EXPECT_EQ(Sorted("jpg path:!x"), Names({"d!x/c.jpg"}));
  EXPECT_EQ(Sorted("is:hidden"), Names({".hidden.jpg"}));
  EXPECT_EQ(Sorted("is:link"), Names({"d/link"}));
  EXPECT_EQ(Sorted("is:file -is:empty"), Names({"d/full.bin"}));
  EXPECT_EQ(Sorted("owner:" + std::to_string(getuid()) + " ext:bin"), Names({"d/full.bin"}));
  EXPECT_EQ(Sorted("owner:4294967294"), Names());
}

TEST_F(QueryAttributesTest, NumbersOfContentsAreRanges) {
  Store({{"a.mp3", Numbered({{ContentField::DURATION, 200'500},
                             {ContentField::YEAR, 1994},
                             {ContentField::BIT_RATE, 128'000},
                             {ContentField::TRACK, 3}})},
         {"b.mp3", Numbered({{ContentField::DURATION, 60'000}, {ContentField::RATING, 0}})},
         {"c.jpg", Numbered({{ContentField::WIDTH, 4000}, {ContentField::TAKEN, 1'704'412'800}})},
         {"d.txt", TextContent("x")}});

  EXPECT_EQ(Hits("duration:>90s"), Names({"a.mp3"}));
  EXPECT_EQ(Hits("duration:3m20s"), Names({"a.mp3"}));
  EXPECT_EQ(Hits("duration:..1m"), Names({"b.mp3"}));
  EXPECT_EQ(Hits("year:1990..1999"), Names({"a.mp3"}));
  EXPECT_EQ(Hits("bitrate:128K"), Names({"a.mp3"}));
  EXPECT_EQ(Hits("rating:0"), Names({"b.mp3"})) << "what has none is not 0";
  EXPECT_EQ(Hits("width:>=4000"), Names({"c.jpg"}));
  EXPECT_EQ(Hits("taken:2024-01-05"), Names({"c.jpg"}));
  EXPECT_EQ(Hits("has:track"), Names({"a.mp3"}));
  EXPECT_EQ(Hits("mp3 -has:track"), Names({"b.mp3"}));
  EXPECT_EQ(Hits("has:text"), Names({"d.txt"}));
  EXPECT_EQ(Sorted("has:content"), Names({"a.mp3", "b.mp3", "c.jpg", "d.txt"}));
}

TEST_F(QueryAttributesTest, ATitleIsNoText) {
  Content scan = Tagged(ContentField::TITLE, "Deed of 1851");
  scan.numbers = {{ContentField::PAGES, 2}};
  Content book = TextContent("Call me Ishmael");
  book.texts = {{ContentField::TITLE, "Whales"}};
  Store({{"scan.pdf", scan},
         {"book.pdf", book},
         {"year.mp3", Numbered({{ContentField::YEAR, 1994}})},
         {"plain.txt", TextContent("x")}});

  EXPECT_EQ(Sorted("has:text"), Names({"book.pdf", "plain.txt"}));
  EXPECT_EQ(Sorted("has:content -has:text"), Names({"scan.pdf", "year.mp3"}));
  EXPECT_EQ(Sorted("pdf NOT has:text"), Names({"scan.pdf"}));
  EXPECT_EQ(Sorted("has:title"), Names({"book.pdf", "scan.pdf"}));
}

TEST_F(QueryAttributesTest, PicturesAreAsWideAndAsHighAsTheirNumbersSay) {
  Store({{"wide.jpg",
          Numbered({{ContentField::WIDTH, 4000}, {ContentField::HEIGHT, 3000}}, Kind::PHOTO)},
         {"high.jpg",
          Numbered({{ContentField::WIDTH, 3000}, {ContentField::HEIGHT, 4000}}, Kind::PHOTO)},
         {"film.mkv",
          Numbered({{ContentField::WIDTH, 3840}, {ContentField::HEIGHT, 2160}}, Kind::VIDEO)},
         {"song.mp3", Numbered({{ContentField::DURATION, 3000}}, Kind::AUDIO)}});

  EXPECT_EQ(Sorted("height:3000"), Names({"wide.jpg"}));
  EXPECT_EQ(Sorted("height:>3000"), Names({"high.jpg"}));
  EXPECT_EQ(Sorted("height:>=3000"), Names({"high.jpg", "wide.jpg"}));
  EXPECT_EQ(Sorted("height:<3000"), Names({"film.mkv"}));
  EXPECT_EQ(Sorted("height:2160..3000"), Names({"film.mkv", "wide.jpg"}));
  EXPECT_EQ(Sorted("width:3000"), Names({"high.jpg"}));
  EXPECT_EQ(Sorted("width:<=3840"), Names({"film.mkv", "high.jpg"}));
  EXPECT_EQ(Sorted("width:>=3840 height:<3000"), Names({"film.mkv"}));
  EXPECT_EQ(Sorted("width:>=0"), Names({"film.mkv", "high.jpg", "wide.jpg"}))
      << "what has none is not 0";
  EXPECT_EQ(Sorted("has:height -kind:video"), Names({"high.jpg", "wide.jpg"}));
}

// Each is stored in seconds, and its days are those of the local time zone.
TEST_F(QueryAttributesTest, DocumentsMailsAndFilmsHaveTheirOwnTimes) {
  setenv("TZ", "CET-1", 1);
  tzset();
  constexpr int64_t MIDNIGHT = 1'704'409'200;  // where 2024-01-05 begins there
  const std::vector<std::pair<std::string, ContentField>> times = {
      {"created", ContentField::CREATED},
      {"sent", ContentField::SENT},
      {"recorded", ContentField::RECORDED}};
  for (const auto& [name, field] : times) {
    Store({{name + " before", Numbered({{field, MIDNIGHT - 1}})},
           {name + " first", Numbered({{field, MIDNIGHT}})},
           {name + " last", Numbered({{field, MIDNIGHT + 86399}})},
           {name + " after", Numbered({{field, MIDNIGHT + 86400}})}});
  }
  for (const auto& [name, field] : times) {
    const std::string after = name + " after";
    const std::string before = name + " before";
    const std::string first = name + " first";
    const std::string last = name + " last";
    EXPECT_EQ(Sorted(name + ":2024-01-05"), Names({first, last}));
    EXPECT_EQ(Sorted(name + ":<2024-01-05"), Names({before}));
    EXPECT_EQ(Sorted(name + ":<=2024-01-05"), Names({before, first, last}));
    EXPECT_EQ(Sorted(name + ":>2024-01-05"), Names({after}));
    EXPECT_EQ(Sorted(name + ":>=2024-01-05"), Names({after, first, last}));
    EXPECT_EQ(Sorted(name + ":2024-01-04..2024-01-05"), Names({before, first, last}));
    EXPECT_EQ(Sorted(name + ":2024-01-05T00:00"), Names({first}));
    EXPECT_EQ(Sorted(name + ":2023"), Names());
    EXPECT_EQ(Sorted("has:" + name), Names({after, before, first, last}));
  }
  setenv("TZ", "UTC", 1);
  tzset();
}

TEST_F(QueryAttributesTest, KeywordsAreWordsOfTheirOwnField) {
  Store({{"paper.pdf", Tagged(ContentField::KEYWORDS, "old ships, sea")},
         {"photo.jpg", Tagged(ContentField::KEYWORDS, "Sea, beach")},
         {"sea.txt", TextContent("a keyword of the sea")},
         {"title.pdf", Tagged(ContentField::TITLE, "sea")}});

  for (const std::string name : {"keyword", "keywords", "tag", "TAG"}) {
    EXPECT_EQ(Sorted(name + ":sea"), Names({"paper.pdf", "photo.jpg"}));
    EXPECT_EQ(Sorted(name + ":\"old ships\""), Names({"paper.pdf"}));
    EXPECT_EQ(Sorted(name + ":ship"), Names({"paper.pdf"})) << "another form of the word";
    EXPECT_EQ(Sorted(name + ":bea*"), Names({"photo.jpg"}));
    EXPECT_EQ(Sorted(name + ":sea -" + name + ":beach"), Names({"paper.pdf"}));
    EXPECT_EQ(Sorted("has:" + name), Names({"paper.pdf", "photo.jpg"}));
  }
}

TEST_F(QueryAttributesTest, NearIsACircleOnTheGlobe) {
  const auto at = [](double latitude, double longitude) {
    return Numbered({{ContentField::LATITUDE, static_cast<int64_t>(latitude * 1e7)},
                     {ContentField::LONGITUDE, static_cast<int64_t>(longitude * 1e7)}},
                    Kind::PHOTO);
  };
  Store({{"berlin.jpg", at(52.5200, 13.4050)},
         {"potsdam.jpg", at(52.3906, 13.0645)},
         {"suva.jpg", at(-18.1248, 178.4501)},
         {"apia.jpg", at(-13.8507, -171.7514)},
         {"pole.jpg", at(89.9, 0)},
         {"other pole side.jpg", at(89.9, 180)},
         {"half.jpg", Numbered({{ContentField::LATITUDE, 525'200'000}})},
         {"none.jpg", Numbered({})}});

  EXPECT_EQ(Sorted("near:52.52,13.405,100m"), Names({"berlin.jpg"}));
  EXPECT_EQ(Sorted("near:52.52,13.405,26km"), Names({"berlin.jpg"}));
  EXPECT_EQ(Sorted("near:52.52,13.405,28km"), Names({"berlin.jpg", "potsdam.jpg"}));
  EXPECT_EQ(Sorted("near:-16,-178,800km"), Names({"apia.jpg", "suva.jpg"})) << "over the date line";
  EXPECT_EQ(Sorted("near:90,0,12km"), Names({"other pole side.jpg", "pole.jpg"}));
  EXPECT_EQ(Sorted("near:0,0,99999km").size(), 6U);
  EXPECT_EQ(Sorted("has:location").size(), 6U);
}

TEST_F(QueryAttributesTest, DuplicatesAreOtherFilesOfTheSameBytes) {
  const auto sampled = [](uint64_t sample) {
    Content content = TextContent("");
    content.sample = sample;
    return content;
  };
  StoreOne("a.bin", sampled(7), "12345");
  StoreOne("b.bin", sampled(7), "12346");
  StoreOne("c.bin", sampled(7), "123");
  StoreOne("d.bin", sampled(8), "12345");
  StoreOne("e.bin", sampled(9), "1");
  StoreOne("f.bin", sampled(0), "xx");
  StoreOne("g.bin", sampled(0), "xy");
  StoreOne("h.bin", sampled(5), "");
  StoreOne("i.bin", sampled(5), "");
  std::filesystem::create_hard_link(At("e.bin"), At("e2.bin"));
  std::filesystem::create_hard_link(At("a.bin"), At("a2.bin"));
  Add("e2.bin");
  Add("a2.bin");
  Commit();

  EXPECT_EQ(Sorted("is:duplicate"), Names({"a.bin", "a2.bin", "b.bin"}));
  RemoveTree(At("b.bin"));
  Delete("b.bin");
  Commit();
  EXPECT_EQ(Sorted("is:duplicate"), Names());
}

TEST_F(QueryAttributesTest, StatesOfContentsAreTold) {
  Store({{"done.txt", TextContent("x")}});
  File("bad.txt", "bad");
  Jobs();
  EXPECT_TRUE(contents->Fail(JobOf("bad.txt").file, "damaged", Content(), false));
  EXPECT_TRUE(contents->Commit());
  File("waiting.txt", "waits");
  Empty({"unseen.txt"});
  MakeFolder(At("d"));
  Add("d");
  Commit();

  EXPECT_EQ(Sorted("content:done"), Names({"done.txt"}));
  EXPECT_EQ(Sorted("content:failed"), Names({"bad.txt"}));
  EXPECT_EQ(Sorted("content:waiting"), Names({"unseen.txt", "waiting.txt"}));
}

TEST_F(QueryAttributesTest, AnswersComeInTheOrderAskedFor) {
  Make("b x", 30, 1'700'000'300);
  Make("a x", 20, 1'700'000'100);
  Make("c x", 10, 1'700'000'200);
  MakeFolder(At("y"));
  Add("y");
  Make("y/a x", 20, 1'700'000'100);

  question.sort = SortBy::NAME;
  EXPECT_EQ(Hits("x"), Names({"a x", "y/a x", "b x", "c x"}));
  question.sort = SortBy::SIZE;
  EXPECT_EQ(Hits("x"), Names({"b x", "a x", "y/a x", "c x"}));
  question.sort = SortBy::MODIFIED;
  EXPECT_EQ(Hits("x"), Names({"b x", "c x", "a x", "y/a x"}));
  question.reverse = true;
  EXPECT_EQ(Hits("x"), Names({"a x", "y/a x", "c x", "b x"}));
  EXPECT_GT(answer.hits[0].score, 1) << "whatever the order";
}

TEST_F(QueryAttributesTest, IndexesInOrderGiveTheSameAsAllRows) {
  // Some hundreds in each of three weeks: thirty of the last time, six of each other.
  constexpr int64_t BEGIN = 2646LL * 7 * 24 * 3600;
  for (int i = 1; i < 600; ++i) {
    Make("b x " + std::to_string(100 + i), i % 2 == 0 ? i % 60 * 100'000 : 2'000'000,
         BEGIN + std::min(i * 7919 % 100, 95) * 18'000);
  }
  for (const SortBy sort : {SortBy::SIZE, SortBy::MODIFIED, SortBy::SCORE}) {
    for (const size_t limit : {7, 40}) {
      question.sort = sort;
      question.limit = limit;
      question.count_all = true;
      question.offset = 0;
      const Names slowly = Hits("is:file");
      question.count_all = false;
      EXPECT_EQ(Hits("is:file"), slowly);
      question.offset = 5;
      const Names page = Hits("is:file");
      EXPECT_EQ(page[0], slowly[5]);
      EXPECT_EQ(page[1], slowly[6]);
    }
  }
}

TEST_F(QueryAttributesTest, OptionsNarrowLikeParts) {
  MakeFolder(At("d"));
  Empty({"d/a.jpg", "a.jpg", "d/a.pdf"});

  question.kind = Kind::PHOTO;
  question.under = At("d");
  EXPECT_EQ(Hits("a OR b"), Names({"d/a.jpg"}));
  EXPECT_EQ(Hits("-b"),
            Names({"error: -b: this says only what not to find; add what to find, as in "
                   "kind:document (character 1, at: -b)"}));
  EXPECT_EQ(
      Hits("a OR (b OR -c -d)"),
      Names({"error: a OR (b OR -c -d): this side of OR says only what not to find; add to it what "
             "to find, as in kind:document (character 12, at: -c -d))"}));
}

}  // namespace fileindexd
