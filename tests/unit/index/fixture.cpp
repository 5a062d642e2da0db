// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/index/fixture.h"

#include <filesystem>
#include <fstream>

#include "index/disk_walk.h"
#include "state/filesystem.h"
#include "state/sqlite.h"

namespace fileindexd {

void IndexTest::SetUp() {
  MountTest::SetUp();
  if (IsSkipped()) {
    return;
  }
  MountRoot();
  store = OpenStore();
  ASSERT_NE(store, nullptr);
  ASSERT_TRUE(store->AddShare({"s", root, FilesystemIdentity(root)})) << store->Error();
  ASSERT_TRUE(store->AddFolder(root, wanted)) << store->Error();
  WantRebuild();
  OpenWriter();
  ASSERT_TRUE(writer->IsOpen()) << IndexErrorText(writer->last_error);
}

void IndexTest::MountRootAs(const std::string& type) {
  if (type == "tmpfs") {
    return MountTmpfs(root);
  }
  if (type == "ext4") {
    return MountImage(type, root);
  }

  last_image = folder + "/small_inodes.img";
  Run("truncate -s 120M " + last_image);
  Run("mkfs.ext4 -q -I 128 " + last_image);
  Run("mount -o loop " + last_image + " " + root);
  mounted.push_back(root);
}

void IndexTest::WantRebuild() {
  ASSERT_TRUE(store->UpdateStatus("s", [](ShareStatus& status) { status.rebuild_wanted = true; }));
}

void IndexTest::OpenWriter() {
  writer.reset();
  writer = std::make_unique<EntryWriter>("s", *store, [this] { ++slices; });
}

std::string IndexTest::At(std::string_view name) const {
  return name.empty() ? root : root + "/" + std::string(name);
}

std::unique_ptr<EntryReader> IndexTest::Read() {
  auto reader = std::make_unique<EntryReader>();
  const IndexError error = reader->Open("s");
  EXPECT_EQ(error, IndexError::NONE) << IndexErrorText(error);
  return error == IndexError::NONE ? std::move(reader) : nullptr;
}

void IndexTest::Add(std::string_view name) {
  EXPECT_TRUE(writer->Add(At(name), wanted)) << name << IndexErrorText(writer->last_error);
}

void IndexTest::AddAll() {
  std::shared_ptr<const Settings> in_force;
  ASSERT_TRUE(store->GetSettings(in_force));
  DiskWalk walk(*in_force);
  walk.StartAtFolders(*in_force->ShareByName("s"));
  std::string path;
  Look look;
  while (walk.Next(path, look) == DiskWalk::Step::FOUND) {
    ASSERT_TRUE(writer->Add(path, in_force->FolderOfPath(path)->wanted)) << path;
  }
  Commit();
}

void IndexTest::Refresh(std::string_view name) {
  EXPECT_TRUE(writer->Refresh(At(name), wanted, {})) << name << IndexErrorText(writer->last_error);
}

void IndexTest::Decide(std::string_view name, const ContentFlags& flags) {
  EXPECT_TRUE(writer->Refresh(At(name), flags, flags)) << name;
}

void IndexTest::Delete(std::string_view name, DeleteMode mode) {
  EXPECT_TRUE(writer->Delete(At(name), mode)) << name << IndexErrorText(writer->last_error);
}

void IndexTest::Commit() {
  EXPECT_TRUE(writer->Commit()) << IndexErrorText(writer->last_error);
}

Names IndexTest::Held() {
  Names names;
  const auto reader = Read();
  if (reader == nullptr) {
    return {"unreadable"};
  }
  EXPECT_TRUE(reader->ForEach(root, [&](const Entry& entry) {
    names.push_back(entry.path == root ? "" : entry.path.substr(root.size() + 1));
    return true;
  }));
  EntryReader::Summary summary;
  EXPECT_TRUE(reader->Summarise(summary));
  EXPECT_EQ(summary.entries, names.size());
  return names;
}

Names IndexTest::Differences() {
  Names differences;
  Comparison result;
  std::string error;
  EXPECT_TRUE(CompareShare(
      *store, "s",
      [&](Difference difference, const std::string& path) {
        differences.push_back(std::string(DifferenceText(difference)) + " " +
                              (path == root ? "" : path.substr(root.size() + 1)));
        return true;
      },
      result, error))
      << error;
  EXPECT_EQ(result.differences, differences.size());
  return differences;
}

Entry IndexTest::Find(std::string_view name) {
  std::optional<Entry> entry;
  const auto reader = Read();
  EXPECT_TRUE(reader != nullptr && reader->Find(At(name), entry) == IndexError::NONE) << name;
  EXPECT_TRUE(entry.has_value()) << name;
  return entry.value_or(Entry());
}

void RemoveTree(const std::string& path) {
  std::error_code failure;
  std::filesystem::remove_all(path, failure);
  EXPECT_FALSE(failure) << path;
}

void DamageTable(const std::string& database_file, const std::string& table) {
  int64_t page = 0;
  int64_t page_size = 0;
  sqlite3* db = nullptr;
  ASSERT_EQ(sqlite3_open(database_file.c_str(), &db), SQLITE_OK);
  {
    // What its log holds is in the file before.
    Statement checkpoint;
    ASSERT_EQ(checkpoint.Prepare(db, "PRAGMA wal_checkpoint(TRUNCATE)"), SQLITE_OK);
    ASSERT_EQ(checkpoint.Step(), SQLITE_ROW);
    ASSERT_EQ(checkpoint.Int(0), 0) << "somebody has it open";
    Statement find;
    ASSERT_EQ(find.Prepare(db,
                           "SELECT rootpage, page_size FROM sqlite_master, pragma_page_size"
                           " WHERE name = ?1"),
              SQLITE_OK);
    find.BindText(1, table);
    ASSERT_EQ(find.Step(), SQLITE_ROW) << table;
    page = find.Int(0);
    page_size = find.Int(1);
  }
  ASSERT_EQ(sqlite3_close(db), SQLITE_OK);
  std::fstream file(database_file, std::ios::in | std::ios::out | std::ios::binary);
  file.seekp((page - 1) * page_size);
  file << std::string(static_cast<size_t>(page_size), '\0') << std::flush;
  ASSERT_TRUE(file.good());
}

}  // namespace fileindexd
