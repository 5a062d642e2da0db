// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/index/plain_world.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>

#include "index/contents_writer.h"
#include "index/entry_table.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr int64_t SECOND = 1'000'000'000;
constexpr int64_t YEAR_BEGIN = 1'704'067'200;  // 2024
constexpr int64_t YEAR_END = 1'735'689'599;
constexpr size_t FILES_IN_A_FOLDER = 40;

const std::vector<std::string> ENDINGS = {".txt", ".md", ".jpg", ".mp3", ".mkv", ".zzz", ""};

Kind KindFor(const std::string& ending) {
  return ending == ".txt" || ending == ".md" ? Kind::DOCUMENT
         : ending == ".jpg"                  ? Kind::PHOTO
         : ending == ".mp3"                  ? Kind::AUDIO
         : ending == ".mkv"                  ? Kind::VIDEO
                                             : Kind::OTHER;
}

}  // namespace

const std::vector<SpeltWord>& SpeltWords() {
  static const std::vector<SpeltWord> WORDS = {
      {"kiwi", {"kiwi", "Kiwi"}},
      {"lake", {"lake", "LAKE", "l\u00e0ke"}},
      {"mist", {"mist"}},
      {"plum", {"plum", "Plum"}},
      {"star", {"star", "st\u00e4r"}},
      {"starch", {"starch"}},
      {"ubung", {"\u00dcbung", "u\u0308bung", "ubung"}},
      {"fine", {"fine", "\ufb01ne"}},
      {"\u6771\u4eac", {"\u6771\u4eac"}},
  };
  return WORDS;
}

const int64_t* PlainFile::Number(ContentField field) const {
  const auto found =
      std::find_if(content.numbers.begin(), content.numbers.end(),
                   [field](const NumberField& number) { return number.field == field; });
  return WasRead() && found != content.numbers.end() ? &found->number : nullptr;
}

struct PlainWorld::Line {
  std::string spelt;
  std::string plain;

  void Add(const std::string& separator, const std::string& spelling, const std::string& word) {
    spelt += (spelt.empty() ? "" : separator) + spelling;
    plain += (plain.empty() ? "" : separator) + word;
  }
};

PlainWorld::PlainWorld(unsigned seed, size_t count) : shares({"a", "b", "c"}), chance(seed) {
  setenv("FILEINDEXD_STATE_DIR", state.path.c_str(), 1);  // NOLINT(concurrency-mt-unsafe)
  MakeShare("a", count * 7 / 10);
  MakeShare("b", count * 2 / 10);
  MakeShare("c", count / 10);
}

PlainWorld::Line PlainWorld::Words(size_t most, const std::string& separators) {
  Line line;
  for (size_t left = chance.Below(most + 1); left > 0; --left) {
    const SpeltWord& word = chance.Word();
    const std::string separator(1, separators[chance.Below(separators.size())]);
    line.Add(separator, chance.Spell(word), word.plain);
  }
  return line;
}

// One word is so common that most names have it.
PlainWorld::Line PlainWorld::Name(bool with_ending) {
  Line name = Words(3, " -_");
  if (!chance.OneOf(5)) {
    name.Add(" ", "plum", "plum");
  }
  if (name.plain.empty() || !chance.OneOf(3)) {
    const std::string number = "f" + std::to_string(chance.Below(100'000));
    name.Add("-", number, number);
  }
  if (chance.OneOf(20)) {
    name.spelt.insert(0, ".");
    name.plain.insert(0, ".");
  }
  const std::string& ending = chance.Of(ENDINGS);
  name.spelt += with_ending ? ending : "";
  name.plain += with_ending ? ending : "";
  return name;
}

bool PlainWorld::Place(PlainFile& file, const std::string& folder, const Line& name) {
  file.entry.path = folder + "/" + name.spelt;
  file.plain_path = plain_folders[folder] + "/" + name.plain;
  return taken.insert(file.entry.path).second;
}

void PlainWorld::Describe(PlainFile& file) {
  Entry& entry = file.entry;
  entry.inode = ++last_inode;
  entry.birth_time = YEAR_BEGIN * SECOND;
  entry.ctime = chance.Between(YEAR_BEGIN * SECOND, YEAR_END * SECOND);
  entry.first_seen = chance.Between(YEAR_BEGIN * SECOND, YEAR_END * SECOND);
  entry.owner = static_cast<uint32_t>(1000 + chance.Below(4));
  entry.group = static_cast<uint32_t>(chance.Below(1 << 16));
  entry.mode = static_cast<uint32_t>(chance.Below(1 << 12));
  if (entry.thing == Thing::DIRECTORY) {
    return;
  }
  entry.mtime = chance.Between(YEAR_BEGIN * SECOND, YEAR_END * SECOND);
  entry.size = chance.OneOf(10)  ? 0
               : chance.OneOf(2) ? chance.Between(1, 40) * 100
                                 : chance.Between(1, 64) << 16;
}

void PlainWorld::MakeFolders(const std::string& share, size_t count) {
  const std::string root = "/world/" + share;
  folders.push_back(root);
  plain_folders[root] = root;
  const size_t first = folders.size() - 1;
  for (size_t i = 0; i < count; ++i) {
    PlainFile folder;
    folder.share = share;
    folder.entry.thing = Thing::DIRECTORY;
    folder.entry.kind = Kind::FOLDER;
    const std::string above = folders[first + chance.Below(folders.size() - first)];
    if (Place(folder, above, Name(chance.OneOf(4)))) {
      Describe(folder);
      folders.push_back(folder.entry.path);
      plain_folders[folder.entry.path] = folder.plain_path;
      files.push_back(std::move(folder));
    }
  }
}

void PlainWorld::MakeShare(const std::string& share, size_t count) {
  const size_t first = files.size();
  const size_t first_folder = folders.size();
  MakeFolders(share, count / FILES_IN_A_FOLDER + 3);
  while (files.size() - first < count) {
    PlainFile file;
    file.share = share;
    const std::string& folder = folders[first_folder + chance.Below(folders.size() - first_folder)];
    const PlainFile& other = files[first + chance.Below(files.size() - first)];
    const bool is_other_name = chance.OneOf(15) && other.entry.thing == Thing::FILE;
    const Line name = Name(true);
    if (is_other_name) {  // a hard link: the same file, and what was read of it
      file = other;
    }
    if (!Place(file, folder, name)) {
      continue;
    }
    const size_t dot = name.plain.rfind('.');
    const std::string ending = dot == std::string::npos ? "" : name.plain.substr(dot);
    file.entry.kind = KindFor(ending);
    if (!is_other_name) {
      file.entry.thing = chance.OneOf(25) ? Thing::LINK : Thing::FILE;
      Describe(file);
      MakeContent(file);
    }
    files.push_back(std::move(file));
  }
}

void PlainWorld::MakeContent(PlainFile& file) {
  if (file.entry.thing != Thing::FILE || chance.OneOf(4)) {
    return;
  }
  file.entry.content_wanted = true;
  file.stage = chance.OneOf(10)   ? PlainStage::WAITING
               : chance.OneOf(10) ? PlainStage::FAILED
                                  : PlainStage::DONE;
  if (!file.WasRead()) {
    return;
  }
  Content& content = file.content;
  content.kind =
      file.entry.kind != Kind::OTHER ? file.entry.kind : static_cast<Kind>(chance.Below(5));
  content.sample = chance.OneOf(3) ? 0 : chance.Below(30);
  if (content.sample != 0 && file.entry.size != 0) {
    sampled[{file.share, file.entry.size, content.sample}].insert(file.entry.inode);
  }
  const Line text = Words(8, " ");
  content.text = text.spelt;
  file.text = text.plain;
  for (const ContentField field :
       {ContentField::TITLE, ContentField::AUTHOR, ContentField::KEYWORDS, ContentField::CAMERA}) {
    const Line line = Words(2, field == ContentField::KEYWORDS ? "," : " ");
    if (chance.OneOf(3) && !line.plain.empty()) {
      content.texts.push_back({field, line.spelt});
      file.texts[field] = line.plain;
    }
  }
  const auto number = [&](ContentField field, int64_t low, int64_t high) {
    content.numbers.push_back({field, chance.Between(low, high)});
  };
  if (chance.OneOf(2)) {
    number(ContentField::PAGES, 1, 20);
    number(ContentField::DURATION, 0, 200'000);
  }
  for (const ContentField field :
       {ContentField::CREATED, ContentField::SENT, ContentField::RECORDED}) {
    if (chance.OneOf(4)) {
      number(field, YEAR_BEGIN, YEAR_END);
    }
  }
  if (chance.OneOf(3)) {
    number(ContentField::TAKEN, YEAR_BEGIN, YEAR_END);
    number(ContentField::WIDTH, 1, 40);
    number(ContentField::HEIGHT, 1, 40);
    number(ContentField::LATITUDE, 520'000'000, 530'000'000);
    number(ContentField::LONGITUDE, 130'000'000, 140'000'000);
  }
}

bool PlainWorld::HasTwin(const PlainFile& file) const {
  const auto same = sampled.find({file.share, file.entry.size, file.content.sample});
  return file.WasRead() && same != sampled.end() && same->second.size() > 1;
}

void PlainWorld::Store() {
  for (const std::string& share : shares) {
    StoreShare(share);
  }
}

void PlainWorld::StoreShare(const std::string& share) {
  std::string error;
  ASSERT_TRUE(MakeShareFolder(share, error)) << error;
  std::map<uint64_t, const PlainFile*> by_inode;
  {
    IndexDatabase database;
    EntryTable table;
    ASSERT_EQ(database.OpenForWriting(IndexPath(share), true), IndexError::NONE);
    ASSERT_EQ(table.Prepare(database.db), SQLITE_OK);
    ASSERT_EQ(table.Begin(), SQLITE_OK);
    for (const PlainFile& file : files) {
      if (file.share == share) {
        ASSERT_EQ(table.Insert(file.entry), SQLITE_OK) << file.entry.path;
        by_inode[file.entry.inode] = &file;
      }
    }
    ASSERT_EQ(table.Commit(1), SQLITE_OK);
  }

  ContentsWriter writer;
  ASSERT_EQ(writer.Open({share, "/world/" + share, "fs"}, 1), IndexError::NONE);
  for (bool more = true; more;) {
    ASSERT_TRUE(writer.TakeIn(1000, more));
  }
  std::vector<ContentJob> jobs;
  bool more = false;
  ASSERT_TRUE(writer.NextJobs(files.size(), jobs, more));
  for (const ContentJob& job : jobs) {
    const PlainFile& file = *by_inode.at(job.identity.inode);
    if (file.stage == PlainStage::DONE) {
      ASSERT_TRUE(writer.Finish(job.file, file.content));
    } else if (file.stage == PlainStage::FAILED) {
      ASSERT_TRUE(writer.Fail(job.file, "broken", file.content, false));
    }
  }
  ASSERT_TRUE(writer.Commit());
}

}  // namespace fileindexd
