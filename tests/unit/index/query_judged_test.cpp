// SPDX-License-Identifier: GPL-2.0-or-later
// The files of a small office and of those who work there, questions to them, and what people would
// expect to see first.
#include <algorithm>

#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

namespace {

using C = ContentField;

struct JudgedFile {
  std::string name;
  int days;  // since it was changed
  std::string text;
  std::vector<TextField> fields;
};

std::string Long(const std::string& text, int words) {
  std::string all = text;
  for (int i = 0; i < words; ++i) {
    all += " filler" + std::to_string(i % 70);
  }
  return all;
}

std::vector<JudgedFile> OfficeFiles() {
  return {
      {"budget.xlsx", 40, "income and expenses by month", {}},
      {"Budget 2024.xlsx", 60, "income and expenses of the year", {}},
      {"Budget 2023.xlsx", 420, "income and expenses of the year", {}},
      {"draft budget 2023 old copy.xlsx", 430, "income and expenses", {}},
      {"household budget template.ods", 900, "rent, food, savings", {}},
      {"cost plan.pdf",
       100,
       "tents, music, lights",
       {{C::TITLE, "Budget of the Harbour Festival"}}},
      {"minutes of march.txt", 250, "the budget was discussed, the budget was approved", {}},
      {"minutes of january.txt", 310, Long("costs of travel, and the budget stays open", 900), {}},
      {"letter to the bank.docx", 200, Long("we ask for a loan, our budget is attached", 200), {}},
      {"Annual Report.pdf", 300, "figures and outlook", {}},
      {"Annual Report 2023.pdf", 330, "figures and outlook", {}},
      {"Annual Report 2022.pdf", 700, "figures and outlook", {}},
      {"report annual figures.xlsx", 310, "sums", {}},
      {"shareholders.pdf", 320, "dear all", {{C::TITLE, "Annual Report to Shareholders"}}},
      {"press release.txt", 305, "our annual report is out, and the annual report is good", {}},
      {"notes.txt", 20, Long("ask Anna for annual numbers, then send a report", 400), {}},
      {"invoice.pdf", 400, "an empty form", {}},
      {"invoice 1001.pdf", 30, "to Miller and Sons for one crane", {}},
      {"invoice 1002.pdf", 10, "to Anderson for paint", {}},
      {"invoice template form.odt", 1000, "our letterhead", {}},
      {"invoices 2024.csv", 15, "1001 Miller 1002 Anderson", {}},
      {"reminder Miller.txt", 8, "the invoice is not paid yet", {}},
      {"contract.pdf", 700, "general terms", {}},
      {"Miller contract.pdf", 200, "between us and Miller on the use of a crane", {}},
      {"rental contract Hamburg.pdf", 2000, "two rooms by the water", {}},
      {"employment contract Anna Schmidt.pdf", 1200, "forty hours a week", {}},
      {"Anna Schmidt CV.pdf", 1250, "schools and work", {}},
      {"photo of Anna.jpg", 70, "", {{C::CAMERA, "Lumix"}}},
      {"mail from Anna.eml",
       5,
       "it is on monday now",
       {{C::SUBJECT, "Crane inspection moved"}, {C::FROM, "Anna Schmidt"}}},
      {"crane inspection.pdf", 180, "no defects", {{C::TITLE, "Inspection of the Harbour Crane"}}},
      {"harbour festival.jpg", 95, "", {{C::CAMERA, "Lumix"}}},
      {"weather.txt", 4, "storm over the harbour", {}},
      {"tide table.txt", 2, "harbour gauge in metres", {}},
      {"holiday 2024.mp4", 150, "", {}},
      {"IMG_20240612_101500.jpg", 160, "", {{C::CAMERA, "Lumix"}}},
      {"IMG_20240612_101502.jpg", 160, "", {{C::CAMERA, "Lumix"}}},
      {"Urlaub \u00d6sterreich 2023.pdf", 480, "zwei Wochen in den Bergen", {}},
      {"\u00f6sterreich.txt", 470, "Wien, Graz, Salzburg", {}},
      {"Packliste.txt", 155, "Zelt und Schuhe f\u00fcr \u00d6sterreich", {}},
      {"\u6771\u4eac\u65c5\u884c.txt", 380, "x", {}},
      {"\u8a08\u753b.txt", 390, "\u6771\u4eac\u65c5\u884c\u306e\u8a08\u753b", {}},
      {"Moby Dick.epub",
       1500,
       Long("call me ishmael", 3000),
       {{C::TITLE, "Moby Dick, or the Whale"}, {C::AUTHOR, "Herman Melville"}}},
      {"Herman Melville - Typee.epub",
       1400,
       Long("six months at sea", 2000),
       {{C::TITLE, "Typee"}}},
      {"blue whale.jpg", 90, "", {{C::CAMERA, "Lumix"}}},
      {"sea mammals.pdf", 800, "the blue whale is a whale, and the largest whale", {}},
      {"zoo trip.txt", 500, Long("lions, and the bone of a whale", 1500), {}},
      {"readme.md", 50, "how to build main and the parser", {}},
      {"README", 900, "old hints", {}},
      {"parser.cpp", 25, "reads questions", {}},
      {"query_parser_test.cpp", 24, "tables of questions", {}},
      {"main.cpp", 25, "runs the parser", {}},
      {"lexer.cpp", 26, "tokens for the parser", {}},
      {"Makefile", 26, "main and lexer and parser", {}},
      {"Bohemian Rhapsody.mp3",
       3000,
       "",
       {{C::ARTIST, "Queen"}, {C::ALBUM, "A Night at the Opera"}}},
      {"Queen - Somebody to Love.mp3", 2900, "", {{C::ARTIST, "Queen"}}},
      {"queen bee.txt", 600, "a hive has one, and she lays eggs", {}},
      {"playlist.m3u", 100, Long("queen and others", 60), {}},
      {"apple pie.jpg", 1000, "", {{C::CAMERA, "Lumix"}}},
      {"apple pie recipe.txt", 1100, Long("apples, flour, sugar, an oven", 60), {}},
      {"cake recipes.pdf", 500, "apple pie, cherry pie, cheese cake", {{C::TITLE, "Cakes"}}},
      {"shopping list.txt", 3, "apples, flour, milk", {}},
      {"shopping list old.txt", 1500, "apples, flour, milk", {}},
      {"backup-2024-06-01.tar.gz", 170, "", {}},
      {"backup-2024-05-01.tar.gz", 200, "", {}},
      {"backup.sh", 60, "packs all", {}},
      {"printer manual.pdf", 1300, Long("put in the toner cartridge", 800), {{C::TITLE, "Guide"}}},
      {"toner order.txt", 12, "four cartridges", {}},
      {"status a.txt", 900, "all systems nominal", {}},
      {"status b.txt", 2, "all systems nominal", {}},
      {"status c.txt", 100, "all systems nominal", {}},
      {"eggs and bacon.jpg", 800, "", {{C::CAMERA, "Lumix"}}},
  };
}

// A question, and its first hits: the names of each line come before those of the next, in any
// order among themselves.
struct Judged {
  std::string question;
  std::vector<Names> first;
};

std::vector<Judged> Judgements() {
  return {
      // The whole name above a part of it, and names above titles above texts.
      {"budget",
       {{"budget.xlsx"},
        {"Budget 2024.xlsx"},
        {"Budget 2023.xlsx"},
        {"household budget template.ods", "draft budget 2023 old copy.xlsx"},
        {"cost plan.pdf"},
        {"minutes of march.txt"}}},
      {"budget 2024", {{"Budget 2024.xlsx"}}},
      {"budget OR invoice", {{"budget.xlsx", "invoice.pdf"}}},
      {"budget 2023", {{"Budget 2023.xlsx"}, {"draft budget 2023 old copy.xlsx"}}},
      {"annual report",
       {{"Annual Report.pdf"},
        {"Annual Report 2023.pdf"},
        {"Annual Report 2022.pdf"},
        {"report annual figures.xlsx"},
        {"shareholders.pdf"},
        {"press release.txt"},
        {"notes.txt"}}},
      {"\"annual report\"",
       {{"Annual Report.pdf"},
        {"Annual Report 2023.pdf"},
        {"Annual Report 2022.pdf"},
        {"shareholders.pdf"},
        {"press release.txt"}}},
      {"report",
       {{"report annual figures.xlsx"},
        {"Annual Report.pdf"},
        {"Annual Report 2023.pdf"},
        {"Annual Report 2022.pdf"},
        {"shareholders.pdf"}}},
      {"invoice",
       {{"invoice.pdf"},
        {"invoice 1002.pdf"},
        {"invoice 1001.pdf"},
        {"invoice template form.odt"},
        {"reminder Miller.txt"}}},
      {"invoice*", {{"invoice.pdf"}}},
      {"miller",
       {{"Miller contract.pdf"},
        {"reminder Miller.txt"},
        {"invoice 1001.pdf", "invoices 2024.csv"}}},
      {"miller invoice", {{"invoice 1001.pdf", "reminder Miller.txt"}}},
      {"contract",
       {{"contract.pdf"},
        {"Miller contract.pdf"},
        {"rental contract Hamburg.pdf"},
        {"employment contract Anna Schmidt.pdf"}}},
      {"contract anna", {{"employment contract Anna Schmidt.pdf"}}},
      {"anna",
       {{"Anna Schmidt CV.pdf"},
        {"photo of Anna.jpg", "mail from Anna.eml"},
        {"employment contract Anna Schmidt.pdf"},
        {"notes.txt"}}},
      {"schmidt",
       {{"Anna Schmidt CV.pdf", "employment contract Anna Schmidt.pdf"}, {"mail from Anna.eml"}}},
      {"hamburg", {{"rental contract Hamburg.pdf"}}},
      {"crane inspection", {{"crane inspection.pdf"}, {"mail from Anna.eml"}}},
      {"crane",
       {{"crane inspection.pdf"},
        {"mail from Anna.eml"},
        {"invoice 1001.pdf", "Miller contract.pdf"}}},
      {"harbour",
       {{"harbour festival.jpg"},
        {"cost plan.pdf", "crane inspection.pdf"},
        {"weather.txt", "tide table.txt"}}},
      {"harbour festival", {{"harbour festival.jpg"}, {"cost plan.pdf"}}},
      // In any spelling, and in any script.
      {"\u00f6sterreich",
       {{"\u00f6sterreich.txt"}, {"Urlaub \u00d6sterreich 2023.pdf"}, {"Packliste.txt"}}},
      {"osterreich",
       {{"\u00f6sterreich.txt"}, {"Urlaub \u00d6sterreich 2023.pdf"}, {"Packliste.txt"}}},
      {"\u6771\u4eac", {{"\u6771\u4eac\u65c5\u884c.txt"}, {"\u8a08\u753b.txt"}}},
      {"whale", {{"blue whale.jpg"}, {"Moby Dick.epub"}, {"sea mammals.pdf"}, {"zoo trip.txt"}}},
      {"blue whale", {{"blue whale.jpg"}, {"sea mammals.pdf"}}},
      {"moby dick", {{"Moby Dick.epub"}}},
      {"melville", {{"Herman Melville - Typee.epub"}, {"Moby Dick.epub"}}},
      {"readme", {{"README"}, {"readme.md"}}},
      {"parser",
       {{"parser.cpp"},
        {"query_parser_test.cpp"},
        {"main.cpp", "lexer.cpp", "Makefile", "readme.md"}}},
      {"main", {{"main.cpp"}, {"Makefile", "readme.md"}}},
      {"queen",
       {{"queen bee.txt"},
        {"Queen - Somebody to Love.mp3"},
        {"Bohemian Rhapsody.mp3"},
        {"playlist.m3u"}}},
      {"artist:queen", {{"Bohemian Rhapsody.mp3", "Queen - Somebody to Love.mp3"}}},
      {"apple pie", {{"apple pie.jpg"}, {"apple pie recipe.txt"}, {"cake recipes.pdf"}}},
      {"backup", {{"backup.sh"}, {"backup-2024-06-01.tar.gz"}, {"backup-2024-05-01.tar.gz"}}},
      {"toner", {{"toner order.txt"}, {"printer manual.pdf"}}},
      {"toner cartridge", {{"toner order.txt"}, {"printer manual.pdf"}}},
      {"title:budget", {{"cost plan.pdf"}}},
      // The younger of equals.
      {"nominal", {{"status b.txt"}, {"status c.txt"}, {"status a.txt"}}},
      {"status", {{"status b.txt"}, {"status c.txt"}, {"status a.txt"}}},
      {"apples flour",
       {{"shopping list.txt"}, {"shopping list old.txt"}, {"apple pie recipe.txt"}}},
      // The rarer word.
      {"text:storm OR text:parser", {{"weather.txt"}}},
      {"bacon OR contract", {{"eggs and bacon.jpg", "contract.pdf"}}},
      {"miller OR crane", {{"Miller contract.pdf"}}},
      {"anna OR cv", {{"Anna Schmidt CV.pdf"}}},
  };
}

}  // namespace

class QueryJudgedTest : public QuestionTest {
 protected:
  void SetUp() override {
    QuestionTest::SetUp();
    constexpr time_t DAY = 86400;
    const time_t now = time(nullptr);
    files = OfficeFiles();
    for (const JudgedFile& file : files) {
      WriteFile(At(file.name), file.name);
      SetTime(At(file.name), now - file.days * DAY);
      Add(file.name);
    }
    Commit();
    TakeIn();
    Jobs();
    for (const JudgedFile& file : files) {
      Content content = TextContent(file.text);
      content.texts = file.fields;
      EXPECT_TRUE(contents->Finish(JobOf(file.name).file, content)) << file.name;
    }
    EXPECT_TRUE(contents->Commit());
  }

  std::vector<JudgedFile> files;
};

TEST_F(QueryJudgedTest, WhatPeopleExpectComesFirst) {
  EXPECT_GE(files.size(), 60U);
  for (const Judged& judged : Judgements()) {
    const Names hits = Hits(judged.question);
    auto at = hits.begin();
    for (Names line : judged.first) {
      const auto count = std::min<std::ptrdiff_t>(std::ssize(line), hits.end() - at);
      Names found(at, at + count);
      at += count;
      std::sort(line.begin(), line.end());
      std::sort(found.begin(), found.end());
      EXPECT_EQ(found, line) << judged.question << ": " << testing::PrintToString(hits);
    }
  }
}

}  // namespace fileindexd
