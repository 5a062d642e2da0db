// SPDX-License-Identifier: GPL-2.0-or-later
// The manual's examples mean something, and what it says of them is so.
#include <sys/stat.h>
#include <unistd.h>

#include <ctime>
#include <fstream>
#include <set>

#include "index/query.h"
#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

namespace {

// Noon of the day before today.
time_t Yesterday() {
  const time_t now = time(nullptr);
  tm day{};
  (void)localtime_r(&now, &day);
  --day.tm_mday;
  day.tm_hour = 12;
  day.tm_isdst = -1;
  return mktime(&day);
}

}  // namespace

class QueryManualTest : public QuestionTest {
 protected:
  static Names Examples() {
    std::ifstream manual(FILEINDEXD_QUERY_MANUAL);
    Names examples;
    bool inside = false;
    for (std::string line; std::getline(manual, line);) {
      if (line.starts_with("```")) {
        inside = !inside;
      } else if (inside) {
        examples.push_back(line);
      }
    }
    return examples;
  }

  // Something for each example.
  void StoreAll() {
    Content book = TextContent("the annual report of whales");
    book.texts = {{ContentField::TITLE, "Moby Dick"}, {ContentField::AUTHOR, "Melville"}};
    book.numbers = {{ContentField::PAGES, 300},
                    {ContentField::CREATED, 1'690'000'000},
                    {ContentField::SENT, time(nullptr) - 86400}};
    book.sample = 5;
    Content song = Tagged(ContentField::ARTIST, "x");
    song.kind = Kind::AUDIO;
    song.numbers = {{ContentField::DURATION, 200'000},
                    {ContentField::YEAR, 1994},
                    {ContentField::BIT_RATE, 320'000},
                    {ContentField::TRACK, 1},
                    {ContentField::RATING, 5}};
    const auto photo = [](double latitude, double longitude) {
      return Numbered({{ContentField::WIDTH, 4000},
                       {ContentField::TAKEN, 1'704'412'900},
                       {ContentField::RECORDED, 1'670'500'000},
                       {ContentField::LATITUDE, static_cast<int64_t>(latitude * 1e7)},
                       {ContentField::LONGITUDE, static_cast<int64_t>(longitude * 1e7)}},
                      Kind::PHOTO);
    };
    Store({{"annual report 2024.pdf", book},
           {"annual report copy.pdf", book},
           {"report.pdf", book},
           {"invoice 2024.txt", TextContent("paid")},
           {"song.mp3", song},
           {"img_2024.jpg", photo(52.5164, 13.3778)},
           {"paris.png", photo(48.8585, 2.2946)},
           {"film.mkv", Numbered({{ContentField::DURATION, 5'000'000}}, Kind::VIDEO)},
           {"backup.tar.gz", Tagged(ContentField::MEMBERS, "a")},
           {".hidden", TextContent("x")}});
  }

  // The example, of this share, its folder and users that there are.
  std::string Here(std::string example) const {
    const std::map<std::string, std::string> changed = {{"share:data", "share:s"},
                                                        {"/srv/data", root},
                                                        {"owner:root", "owner:" + Own()},
                                                        {"owner:1000", "owner:" + Other()}};
    for (const auto& [there, here] : changed) {
      const size_t at = example.find(there);
      if (at != std::string::npos) {
        example.replace(at, there.size(), here);
      }
    }
    return example;
  }
  static std::string Own() { return std::to_string(geteuid()); }
  // Without root no file can be given away.
  static std::string Other() { return geteuid() == 0 ? "1000" : Own(); }

  // What the other examples are for: places, sizes, times, and contents that were not read.
  void StoreTheRest() {
    constexpr time_t DAY_OF_2024 = 1'704'370'000;  // the 4th of January
    ASSERT_EQ(mkdir(At("projects").c_str(), 0755), 0);
    ASSERT_EQ(mkdir(At("projects/2024").c_str(), 0755), 0);
    ASSERT_EQ(mkdir(At("old projects").c_str(), 0755), 0);
    ASSERT_EQ(symlink("report.pdf", At("link").c_str()), 0);
    for (const char* name : {"projects/2024/plan", "old projects/plan", "given away"}) {
      WriteFile(At(name), "");
    }
    if (geteuid() == 0) {
      ASSERT_EQ(chown(At("given away").c_str(), 1000, static_cast<gid_t>(-1)), 0);
    }
    for (const char* name : {"projects", "projects/2024", "projects/2024/plan", "old projects",
                             "old projects/plan", "given away", "link"}) {
      Add(name);
    }
    OldFile("old.txt", DAY_OF_2024);
    OldFile("of yesterday.txt", Yesterday());
    for (const auto& [name, size] :
         std::map<std::string, off_t>{{"empty", 0}, {"15M", 15 << 20}, {"2G", off_t{2} << 30}}) {
      WriteFile(At(name), "");
      ASSERT_EQ(truncate(At(name).c_str(), size), 0);  // a hole
      Add(name);
    }
    StoreOne("song of an album.mp3", Tagged(ContentField::ALBUM, "x"), "bytes");
    File("broken.pdf");
    Jobs();
    EXPECT_TRUE(contents->Fail(JobOf("broken.pdf").file, "broken", Content(), false));
    File("waits.txt");
  }
};

TEST_F(QueryManualTest, EveryExampleIsUnderstood) {
  const Names examples = Examples();
  EXPECT_GT(examples.size(), 60U);
  for (const std::string& example : examples) {
    QueryNode query;
    QueryError error;
    EXPECT_TRUE(ParseQuery(example, time(nullptr), query, error))
        << example << ": " << error.Line(example);
  }
}

TEST_F(QueryManualTest, EveryExampleHasAnAnswer) {
  StoreAll();
  ASSERT_NO_FATAL_FAILURE(StoreTheRest());
  for (const std::string& example : Examples()) {
    const Names hits = Hits(Here(example));
    ASSERT_FALSE(hits.empty()) << example;
    EXPECT_FALSE(hits[0].starts_with("error")) << example << ": " << hits[0];
  }
}

TEST_F(QueryManualTest, ExamplesOfPlacesAndUsersFindWhatIsTheirs) {
  StoreAll();
  ASSERT_NO_FATAL_FAILURE(StoreTheRest());
  question.limit = 1000;
  const Names all = Sorted("is:folder OR is:file OR is:link");
  EXPECT_GT(all.size(), 20U);
  Names own = all;
  if (geteuid() == 0) {
    std::erase(own, "given away");
  }

  const std::map<std::string, Names> found = {
      {"share:data", all},
      {"under:/srv/data/projects", {"projects", "projects/2024", "projects/2024/plan"}},
      {"under:\"/srv/data/old projects\"", {"old projects", "old projects/plan"}},
      {"owner:root", own},
      {"owner:root,1000", all},
      {"owner:1000", geteuid() == 0 ? Names{"given away"} : all},
  };
  for (const std::string& example : Examples()) {
    if (example.starts_with("share:") || example.starts_with("under:") ||
        example.starts_with("owner:")) {
      ASSERT_TRUE(found.contains(example)) << example;
      EXPECT_EQ(Sorted(Here(example)), found.at(example)) << example;
    }
  }
}

TEST_F(QueryManualTest, ExamplesFindWhatTheyAreFor) {
  StoreAll();
  const std::map<std::string, Names> found = {
      {"annual report", {"annual report 2024.pdf", "annual report copy.pdf", "report.pdf"}},
      {"invoice OR receipt", {"invoice 2024.txt"}},
      {"(invoice OR receipt) 2024 -(copy OR draft)", {"invoice 2024.txt"}},
      {"title:\"moby dick\"", {"annual report 2024.pdf", "annual report copy.pdf", "report.pdf"}},
      {"name:*port*", {"annual report 2024.pdf", "annual report copy.pdf", "report.pdf"}},
      {"name:*.tar.gz", {"backup.tar.gz"}},
      {"name:img*2024*", {"img_2024.jpg"}},
      {"name:\"report.pdf\"", {"report.pdf"}},
      {"kind:photo,video", {"film.mkv", "img_2024.jpg", "paris.png"}},
      {"is:hidden", {".hidden"}},
      {"duration:3m..5m", {"song.mp3"}},
      {"duration:200", {"song.mp3"}},
      {"year:1990..1999", {"song.mp3"}},
      {"bitrate:>=320K", {"song.mp3"}},
      {"taken:2024-01-05", {"img_2024.jpg", "paris.png"}},
      {"has:content -has:text",
       {"backup.tar.gz", "film.mkv", "img_2024.jpg", "paris.png", "song.mp3"}},
      {"near:52.5163,13.3777,2km", {"img_2024.jpg"}},
      {"near:48.8584,2.2945,500m", {"paris.png"}},
      {"has:artist -has:album", {"song.mp3"}},
      {"name:(invoice OR receipt)", {"invoice 2024.txt"}},
      {"title:(moby -\"white whale\")",
       {"annual report 2024.pdf", "annual report copy.pdf", "report.pdf"}},
  };
  const Names examples = Examples();
  const std::set<std::string> known(examples.begin(), examples.end());
  for (const auto& [example, names] : found) {
    EXPECT_TRUE(known.contains(example)) << example;
    EXPECT_EQ(Sorted(example), names) << example;
  }
}

TEST_F(QueryManualTest, WhatItSaysIsRefusedIsRefused) {
  const Names refused = {"-draft",
                         "OR a",
                         "\"moby dick\"s",
                         "inv*ce",
                         "\u0301",
                         "\u200b",
                         "report\"",
                         "report)",
                         "report --draft",
                         "report OR -draft",
                         "sise:1G",
                         "undr:/srv",
                         "size>1G",
                         "ext=pdf",
                         "ext!=pdf",
                         "size > 1G",
                         "text : whale",
                         "title:-moby",
                         "camera:>5",
                         "name:(a title:b)",
                         "name:a/b",
                         "size: 1G",
                         "share:data",
                         "under:/srv/data/projects",
                         "size:<0",
                         "rating:>5",
                         "modified:2024-06..2024-01",
                         "near:52.5,13.4,0"};
  for (const std::string& text : refused) {
    const Names hits = Hits(text);
    ASSERT_EQ(hits.size(), 1U) << text;
    EXPECT_TRUE(hits[0].starts_with("error: ")) << text;
  }
  EXPECT_EQ(Hits("Kind:DOCUMENT -draft"), Names());
  for (const char* text :
       {"12:30", "http://example.org", "fs::path", "go:generate", "\"sise:1G\""}) {
    EXPECT_EQ(Hits(text), Names()) << text;
  }
}

TEST_F(QueryManualTest, WhatItSaysAsksForAllDoes) {
  StoreAll();
  ASSERT_NO_FATAL_FAILURE(StoreTheRest());
  question.limit = 1000;
  const Names videos = Sorted("kind:video");
  EXPECT_EQ(videos, Names({"film.mkv"}));
  const Names below = Sorted("under:" + At("projects"));

  question.kind = Kind::VIDEO;
  EXPECT_EQ(Sorted("is:file"), videos);
  question.kind.reset();
  question.under = At("projects");
  EXPECT_EQ(Sorted("is:file OR is:folder"), below);
}

TEST_F(QueryManualTest, WhatItSaysHoldsTogetherIsFoundWholeAndByItsParts) {
  Store({{"joined.txt", TextContent("an annual_report of v1.2.3")},
         {"parted.txt", TextContent("an annual report, and 1 of 2")},
         {"name annual_report", TextContent("x")},
         {"name annual report", TextContent("x")}});
  const Names both = {"joined.txt", "parted.txt"};
  const Names joined = {"joined.txt"};
  for (const auto& [text, found] : std::map<std::string, Names>{
           {"text:annual_report", joined},
           {"text:report", both},
           {"text:(annual report)", both},
           {"text:\"annual report\"", {"parted.txt"}},
           {"v1.2.3", joined},
           {"1.2.3", joined},
           {"v1", joined},
           {"1.2", {}},
           {"1.2*", joined},
           {"name:annual_report", {"name annual report", "name annual_report"}}}) {
    EXPECT_EQ(Sorted(text), found) << text;
  }
}

TEST_F(QueryManualTest, WhatItSaysIsTheSameIsTheSame) {
  StoreAll();
  ASSERT_NO_FATAL_FAILURE(StoreTheRest());
  question.limit = 1000;
  for (const Names& same : std::vector<Names>{
           {"size:10M..20M", "size:10MB..20mb", "size:10MiB..20MiB", "size:10240K..0.01953125G"},
           {"size:15728640", "size:15M"},
           {"size:2G..", "size:>=2G", "size:>=2048M", "size:2G..1P"},
           {"duration:200", "duration:200s", "duration:3m20s"},
           {"bitrate:>=320K", "bitrate:320000.."},
           {"ext:gz", "ext:tar.gz", "ext:.GZ", "ext:\"tar.gz\",zip"},
           {"kind:photo", "Kind:PHOTO"},
           {"has:artist", "HAS:Artist"},
           {"near:48.8584,2.2945,500m", "near:48.8584,2.2945,500", "near:48.8584,2.2945,0.5km"},
           {"modified:-400d..now", "modified:-400d", "modified:>=-400d", "modified:>=-9600h"},
           {"modified:(-400d OR 2024)", "modified:-400d OR modified:2024"},
           {"path:projects/2024", "path:projects*2024"},
           {"annual report", "annual AND report", "annual\u3000report"},
           {"name:(annual OR invoice)", "name:annual OR name:invoice"},
           {"ext:(pdf OR jpg)", "ext:pdf,jpg"},
           {"name:report -draft", "name:report NOT draft"}}) {
    const Names hits = Sorted(same.front());
    EXPECT_FALSE(hits.empty()) << same.front();
    for (const std::string& other : same) {
      EXPECT_EQ(Sorted(other), hits) << other;
    }
  }
}

}  // namespace fileindexd
