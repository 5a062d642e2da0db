// SPDX-License-Identifier: GPL-2.0-or-later
// Random questions, answered a second time in the plainest way: each file is looked at, and its
// words are compared one by one. Nothing of the engine takes part but the question's text.
#include <algorithm>
#include <cstdlib>
#include <functional>
#include <random>

#include "tests/unit/index/question_fixture.h"

namespace fileindexd {

namespace {

struct PlainFile {
  std::string name;
  std::string author;
  std::string text;
  int64_t size = 0;
  int64_t pages = -1;  // none
};

using Test = std::function<bool(const PlainFile&)>;

struct Made {
  std::string text;
  Test test;
  bool is_positive = true;
};

// Words none of which is a form of another, nor a beginning but for the last two. Few, so that they
// meet often.
const Names WORDS = {"kiwi", "lake", "mist", "plum", "star", "starch"};

Names WordsOf(const std::string& text) {
  Names words;
  std::string word;
  for (const char c : text + " ") {
    if (std::isalnum(static_cast<unsigned char>(c)) != 0) {
      word += c;
    } else if (!word.empty()) {
      words.push_back(word);
      word.clear();
    }
  }
  return words;
}

bool HasRow(const std::string& text, const Names& row, bool last_is_beginning) {
  const Names words = WordsOf(text);
  for (size_t at = 0; at + row.size() <= words.size(); ++at) {
    bool same = true;
    for (size_t i = 0; i < row.size(); ++i) {
      const bool begins = last_is_beginning && i + 1 == row.size();
      same = same && (begins ? words[at + i].starts_with(row[i]) : words[at + i] == row[i]);
    }
    if (same) {
      return true;
    }
  }
  return false;
}

class Maker {
 public:
  explicit Maker(unsigned seed) : random(seed) {}

  int Pick(int below) { return static_cast<int>(random() % static_cast<unsigned>(below)); }
  const std::string& Word() {
    return WORDS[static_cast<size_t>(Pick(static_cast<int>(WORDS.size())))];
  }

  PlainFile File(int number) {
    PlainFile file;
    file.name = "f" + std::to_string(number);
    for (int i = Pick(5); i > 0; --i) {
      file.name += (Pick(2) == 0 ? " " : "-") + Word();
    }
    file.name += Pick(2) == 0 ? ".txt" : ".md";
    for (int i = Pick(8); i > 0; --i) {
      file.text += Word() + " ";
    }
    if (Pick(3) == 0) {
      file.author = Word() + (Pick(2) == 0 ? " " + Word() : "");
    }
    file.size = Pick(3000);
    file.pages = Pick(2) == 0 ? Pick(20) : -1;
    return file;
  }

  Made Leaf() {
    const Names row = Pick(4) == 0 ? Names{Word(), Word()} : Names{Word()};
    const bool beginning = Pick(5) == 0;
    std::string cut = row.back();
    if (beginning) {
      cut = cut.substr(0, static_cast<size_t>(2 + Pick(3)));
    }
    Names asked = row;
    asked.back() = cut;
    std::string text = asked.size() > 1 ? "\"" + asked[0] + " " + asked[1] + "\"" : cut;
    text += beginning ? "*" : "";
    switch (Pick(9)) {
      case 0:
        if (asked.size() > 1) {  // in quotes it would be the whole name
          const std::string piece = asked[0] + " " + asked[1];
          return {"name:\"*" + piece + "*\"",
                  [=](const PlainFile& f) { return f.name.find(piece) != std::string::npos; }};
        }
        return {"name:" + text,
                [=](const PlainFile& f) { return HasRow(f.name, asked, beginning); }};
      case 1:
        return {"text:" + text,
                [=](const PlainFile& f) { return HasRow(f.text, asked, beginning); }};
      case 2:
        return {"author:" + text,
                [=](const PlainFile& f) { return HasRow(f.author, asked, beginning); }};
      case 3: {
        const std::string piece =
            Word().substr(static_cast<size_t>(Pick(2)), static_cast<size_t>(1 + Pick(4)));
        return {"name:*" + piece + "*",
                [=](const PlainFile& f) { return f.name.find(piece) != std::string::npos; }};
      }
      case 4: {
        const int64_t size = Pick(3000);
        return {"size:>" + std::to_string(size), [=](const PlainFile& f) { return f.size > size; }};
      }
      case 5: {
        const int64_t low = Pick(20);
        const int64_t high = low + Pick(10);
        return {"pages:" + std::to_string(low) + ".." + std::to_string(high),
                [=](const PlainFile& f) { return f.pages >= low && f.pages <= high; }};
      }
      case 6:
        if (Pick(2) == 0) {
          return {"ext:md", [](const PlainFile& f) { return f.name.ends_with(".md"); }};
        }
        return {"has:author", [](const PlainFile& f) { return !f.author.empty(); }};
      default:
        return {text, [=](const PlainFile& f) {
                  return HasRow(f.name, asked, beginning) || HasRow(f.text, asked, beginning) ||
                         HasRow(f.author, asked, beginning);
                }};
    }
  }

  Made Negated(const Made& made) {
    const bool is_plain = made.text.find(' ') == std::string::npos;
    const bool has_sign = made.text.front() == '-';  // "--" negates nothing
    return {
        (Pick(2) == 0 && !has_sign ? "-" : "NOT ") + (is_plain ? made.text : "(" + made.text + ")"),
        [=](const PlainFile& f) { return !made.test(f); }, false};
  }

  // Of two to four parts.
  Made Group(bool any, int depth) {
    Made group = Tree(depth);
    for (int more = 1 + Pick(3); more > 0; --more) {
      const Made part = Pick(4) == 0 && !any ? Negated(Tree(depth)) : Tree(depth);
      const Made before = group;
      group.text += (any ? " OR " : Pick(3) == 0 ? " AND " : " ") + part.text;
      group.test = [=](const PlainFile& f) {
        return any ? before.test(f) || part.test(f) : before.test(f) && part.test(f);
      };
      group.is_positive =
          any ? before.is_positive && part.is_positive : before.is_positive || part.is_positive;
    }
    group.text = "(" + group.text + ")";
    return group;
  }

  Made Tree(int depth) {
    if (depth == 0 || Pick(5) == 0) {
      return Leaf();
    }
    const int form = Pick(6);
    return form == 0 ? Negated(Tree(depth - 1)) : Group(form < 3, depth - 1);
  }

  std::mt19937 random;
};

int Questions() {
  const char* scale = std::getenv("FILEINDEXD_TEST_SCALE");
  return scale != nullptr && std::string(scale) == "long" ? 50'000 : 2'000;
}

}  // namespace

class QueryRandomTest : public QuestionTest {
 protected:
  std::vector<PlainFile> StoreFiles(Maker& maker) {
    std::vector<PlainFile> files;
    for (int i = 0; i < 120; ++i) {
      files.push_back(maker.File(i));
      WriteFile(At(files.back().name), std::string(static_cast<size_t>(files.back().size), 'x'));
      Add(files.back().name);
    }
    Commit();
    TakeIn();
    Jobs(1000);
    for (PlainFile& file : files) {
      Content content = TextContent(file.text);
      if (!file.author.empty()) {
        content.texts = {{ContentField::AUTHOR, file.author}};
      }
      if (file.pages >= 0) {
        content.numbers = {{ContentField::PAGES, file.pages}};
      }
      EXPECT_TRUE(contents->Finish(JobOf(file.name).file, content));
    }
    EXPECT_TRUE(contents->Commit());
    return files;
  }
};

TEST_F(QueryRandomTest, TheEngineAndThePlainWayAgree) {
  constexpr unsigned SEED = 20'261'121;
  Maker maker(SEED);
  const std::vector<PlainFile> files = StoreFiles(maker);
  question.limit = 1000;
  int asked = 0;
  int answered = 0;
  for (int i = 0; i < Questions(); ++i) {
    const Made made = maker.Tree(maker.Pick(4));
    if (!made.is_positive) {
      const Names refused = Hits(made.text);
      ASSERT_FALSE(refused.empty()) << made.text;
      ASSERT_TRUE(refused[0].starts_with("error: ")) << made.text;
      continue;
    }
    Names expected;
    for (const PlainFile& file : files) {
      if (made.test(file)) {
        expected.push_back(file.name);
      }
    }
    std::sort(expected.begin(), expected.end());
    question.sort = static_cast<SortBy>(maker.Pick(4));
    question.suggests = false;
    ASSERT_EQ(Sorted(made.text), expected) << made.text;
    ASSERT_EQ(answer.total, expected.size()) << made.text;
    if (i % 5 == 0) {
      question.limit = 3;
      question.count_all = maker.Pick(2) == 0;
      ASSERT_EQ(Hits(made.text).size(), std::min<size_t>(3, expected.size())) << made.text;
      question.limit = 1000;
      question.count_all = true;
    }
    ++asked;
    answered += expected.empty() || expected.size() == files.size() ? 0 : 1;
  }
  EXPECT_GT(asked, Questions() / 2);
  EXPECT_GT(answered, asked / 3) << "most questions tell files apart";
}

}  // namespace fileindexd
