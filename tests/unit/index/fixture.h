// SPDX-License-Identifier: GPL-2.0-or-later
// One share "s" at folder + "/share", an indexed folder as a whole, and a writer of its index.
#pragma once

#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "index/compare.h"
#include "index/reader.h"
#include "index/writer.h"
#include "tests/unit/state/mounts.h"

namespace fileindexd {

using Names = std::vector<std::string>;

class IndexTest : public MountTest {
 protected:
  void SetUp() override;
  virtual void MountRoot() {}  // before the share is registered
  // "tmpfs", "ext4", or "no_birth_times": ext4 with inodes that have no room for them.
  void MountRootAs(const std::string& type);

  void OpenWriter();                            // anew, as after each commit of the daemon
  void WantRebuild();                           // the next opening may create
  std::string At(std::string_view name) const;  // below the root; "" is the root
  std::unique_ptr<EntryReader> Read();

  // Relative to the root. They expect success.
  void Add(std::string_view name);
  void AddAll();  // every thing on disk, and commits
  void Refresh(std::string_view name);
  void Decide(std::string_view name, const ContentFlags& wanted);
  void Delete(std::string_view name, DeleteMode mode = DeleteMode::ENTRY);
  void Commit();

  // Relative to the root, in order. Of what is committed.
  Names Held();
  Names Differences();  // "missing a/b"
  Entry Find(std::string_view name);

  ContentFlags wanted;
  int slices = 0;  // calls of between_slices
  std::unique_ptr<StateStore> store;
  std::unique_ptr<EntryWriter> writer;
};

// Removes what stands there, whatever it is.
void RemoveTree(const std::string& path);

// Puts zeros where a table or an index of that database begins: nobody has it open.
void DamageTable(const std::string& database_file, const std::string& table);

}  // namespace fileindexd
