// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/store.h"

#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <thread>

#include "tests/unit/state/fixture.h"

namespace fileindexd {
namespace {

class StoreTest : public StateTest {
 protected:
  StoreTest() : store(OpenStore()) {}

  std::shared_ptr<const Settings> Get(StateStore& from) {
    std::shared_ptr<const Settings> settings;
    EXPECT_TRUE(from.GetSettings(settings)) << from.Error();
    return settings;
  }

  std::unique_ptr<StateStore> store;
};

TEST_F(StoreTest, SharesAndFoldersComeBackInOrder) {
  const std::string odd = "/v/a/\xff\n x";
  ASSERT_TRUE(store->AddShare({"b", "/v/b", "fs2"})) << store->Error();
  ASSERT_TRUE(store->AddShare({"a", "/v/a", "fs1"})) << store->Error();
  ASSERT_TRUE(store->AddFolder(odd, {true, false, true, false})) << store->Error();
  ASSERT_TRUE(store->AddFolder("/v/a", {})) << store->Error();

  const auto settings = Get(*OpenStore());

  ASSERT_EQ(settings->shares.size(), 2U);
  EXPECT_EQ(settings->shares[0].name, "a");
  EXPECT_EQ(settings->shares[1].filesystem, "fs2");
  ASSERT_EQ(settings->folders.size(), 2U);
  EXPECT_EQ(settings->folders[1].path, odd);
  EXPECT_EQ(settings->folders[1].share, "a");
  EXPECT_EQ(settings->folders[1].wanted, (ContentFlags{true, false, true, false}));
  EXPECT_EQ(settings->state_root, state_root);
}

TEST_F(StoreTest, StateRootIsResolved) {
  const std::string link = folder + "/link";
  ASSERT_EQ(symlink(state_root.c_str(), link.c_str()), 0);
  setenv("FILEINDEXD_STATE_DIR", link.c_str(), 1);

  EXPECT_EQ(Get(*OpenStore())->state_root, state_root);
}

TEST_F(StoreTest, SharesThatOverlapAreRefusedWithBothNamed) {
  ASSERT_TRUE(store->AddShare({"a", "/v/a", ""}));
  for (const char* path : {"/v/a", "/v/a/b", "/v", "/"}) {
    EXPECT_FALSE(store->AddShare({"b", path, ""})) << path;
    EXPECT_NE(store->Error().find(path), std::string::npos) << store->Error();
    EXPECT_NE(store->Error().find("/v/a"), std::string::npos) << store->Error();
  }
  EXPECT_TRUE(store->AddShare({"b", "/v/ab", ""})) << store->Error();
}

TEST_F(StoreTest, BadSharesAreRefused) {
  ASSERT_TRUE(store->AddShare({"a", "/v/a", ""}));
  EXPECT_FALSE(store->AddShare({"a", "/v/b", ""}));
  EXPECT_FALSE(store->AddShare({"", "/v/b", ""}));
  EXPECT_FALSE(store->AddShare({".b", "/v/b", ""}));
  EXPECT_FALSE(store->AddShare({"b", "relative", ""}));
  EXPECT_FALSE(store->AddShare({"b", "/v/b/", ""}));
  EXPECT_FALSE(store->AddShare({"b", "/v/../b", ""}));
  EXPECT_FALSE(store->RemoveShare("b"));
  EXPECT_FALSE(store->SetShareFilesystem("b", "x"));
  EXPECT_EQ(Get(*store)->shares.size(), 1U);
}

TEST_F(StoreTest, FoldersAreAddedOnceAndOnlyInAShare) {
  ASSERT_TRUE(store->AddShare({"a", "/v/a", ""}));
  ASSERT_TRUE(store->AddFolder("/v/a/x", {}));
  EXPECT_FALSE(store->AddFolder("/v/a/x", {}));
  EXPECT_FALSE(store->AddFolder("/v", {}));
  EXPECT_FALSE(store->AddFolder("/v/ab", {}));
  EXPECT_FALSE(store->AddFolder("/v/a/y/", {}));
  EXPECT_FALSE(store->SetFolder("/v/a/y", {}));
  EXPECT_FALSE(store->RemoveFolder("/v/a"));

  ASSERT_TRUE(store->SetFolder("/v/a/x", {false, true, false, true}));
  EXPECT_EQ(Get(*store)->folders[0].wanted, (ContentFlags{false, true, false, true}));
  ASSERT_TRUE(store->RemoveFolder("/v/a/x"));
  EXPECT_TRUE(Get(*store)->folders.empty());
}

TEST_F(StoreTest, ExcludesAreKeptWithTheirFolderInOrder) {
  const std::vector<std::string> patterns = {"*.o", "!keep.o", "\xff\t[a]"};
  ASSERT_TRUE(store->AddShare({"a", "/v/a", ""}));
  ASSERT_TRUE(store->AddFolder("/v/a", {}, {"one"}));
  ASSERT_TRUE(store->AddFolder("/v/a/x", {}));
  ASSERT_TRUE(store->SetFolder("/v/a", {}, patterns)) << store->Error();
  ASSERT_TRUE(store->SetFolder("/v/a", {.audio = true}));

  const auto settings = Get(*OpenStore());
  EXPECT_EQ(settings->FolderAt("/v/a")->excludes.patterns, patterns);
  EXPECT_TRUE(settings->FolderAt("/v/a")->wanted.audio);
  EXPECT_TRUE(settings->FolderAt("/v/a/x")->excludes.patterns.empty());

  ASSERT_TRUE(store->RemoveFolder("/v/a"));
  ASSERT_TRUE(store->AddFolder("/v/a", {}));
  EXPECT_TRUE(Get(*store)->FolderAt("/v/a")->excludes.patterns.empty());
  ASSERT_TRUE(store->SetFolder("/v/a", {}, patterns));
  ASSERT_TRUE(store->RemoveShare("a") && store->AddShare({"a", "/v/a", ""}));
  ASSERT_TRUE(store->AddFolder("/v/a", {}));
  EXPECT_TRUE(Get(*store)->FolderAt("/v/a")->excludes.patterns.empty());
}

TEST_F(StoreTest, WhatIsNoPatternIsRefusedAndChangesNothing) {
  ASSERT_TRUE(store->AddShare({"a", "/v/a", ""}));
  ASSERT_TRUE(store->AddFolder("/v/a", {}, {"good"}));

  EXPECT_FALSE(store->SetFolder("/v/a", {.audio = true}, {"better", "a[b"}));
  EXPECT_NE(store->Error().find("a[b"), std::string::npos) << store->Error();
  EXPECT_FALSE(store->AddFolder("/v/a/x", {}, {""}));
  EXPECT_FALSE(store->SetFolder("/v/a/x", {}, {"x"}));

  const auto settings = Get(*store);
  ASSERT_EQ(settings->folders.size(), 1U);
  EXPECT_EQ(settings->folders[0].excludes.patterns, std::vector<std::string>{"good"});
  EXPECT_FALSE(settings->folders[0].wanted.audio);
}

TEST_F(StoreTest, AShareGoesWithAllThatIsKnownOfIt) {
  ASSERT_TRUE(store->AddShare({"a", "/v/a", ""}));
  ASSERT_TRUE(store->AddFolder("/v/a", {}));
  ASSERT_TRUE(store->UpdateStatus("a", [](ShareStatus& status) { status.missing = true; }));

  ASSERT_TRUE(store->RemoveShare("a")) << store->Error();

  EXPECT_TRUE(Get(*store)->folders.empty());
  ShareStatus status;
  EXPECT_FALSE(store->GetStatus("a", status));
  ASSERT_TRUE(store->AddShare({"a", "/v/a", ""}));
  ASSERT_TRUE(store->GetStatus("a", status));
  EXPECT_FALSE(status.missing);
}

TEST_F(StoreTest, SettingsAreTheSameObjectUntilSomethingChanges) {
  ASSERT_TRUE(store->AddShare({"a", "/v/a", ""}));
  const auto first = Get(*store);
  ASSERT_TRUE(store->UpdateStatus("a", [](ShareStatus& status) { status.no_space = true; }));
  EXPECT_EQ(Get(*store), first);

  ASSERT_TRUE(store->SetShareFilesystem("a", "other"));
  const auto second = Get(*store);
  EXPECT_EQ(second->shares[0].filesystem, "other");
  EXPECT_EQ(first->shares[0].filesystem, "");

  ASSERT_TRUE(OpenStore()->AddFolder("/v/a", {}));
  EXPECT_EQ(Get(*store)->folders.size(), 1U);
}

TEST_F(StoreTest, StatusIsChangedInPartAndWrittenOnlyWhenItChanges) {
  ASSERT_TRUE(store->AddShare({"a", "/v/a", ""}));
  ASSERT_TRUE(store->UpdateStatus("a", [](ShareStatus& status) { status.needs_reindex = true; }));
  ASSERT_TRUE(store->UpdateStatus("a", [](ShareStatus& status) { status.rebuild_wanted = true; }));
  const std::string copy = state_root + "/state.db.copy";
  struct stat before {};
  struct stat after {};
  ASSERT_EQ(stat(copy.c_str(), &before), 0);

  ASSERT_TRUE(store->UpdateStatus("a", [](ShareStatus& status) { status.needs_reindex = true; }));

  ASSERT_EQ(stat(copy.c_str(), &after), 0);
  EXPECT_EQ(before.st_ino, after.st_ino);
  ShareStatus status;
  ASSERT_TRUE(OpenStore()->GetStatus("a", status));
  EXPECT_TRUE(status.needs_reindex && status.rebuild_wanted);
  EXPECT_FALSE(status.reindex_begun || status.no_space || status.missing);
}

TEST_F(StoreTest, StatusOfAnUnknownShareFailsAndChangesNothing) {
  ShareStatus status;
  status.missing = true;
  EXPECT_FALSE(store->GetStatus("none", status));
  EXPECT_TRUE(status.missing);
  EXPECT_FALSE(store->UpdateStatus("none", [](ShareStatus& s) { s.missing = true; }));
  EXPECT_NE(store->Error().find("none"), std::string::npos);
}

TEST_F(StoreTest, PauseAndMarkersOutliveTheStore) {
  int64_t resume_time = 7;
  ASSERT_TRUE(store->GetPause(resume_time));
  EXPECT_EQ(resume_time, -1);
  for (const int64_t time : {int64_t{0}, int64_t{4102444800}, int64_t{-1}}) {
    ASSERT_TRUE(store->SetPause(time));
    ASSERT_TRUE(OpenStore()->GetPause(resume_time));
    EXPECT_EQ(resume_time, time);
  }

  bool has = true;
  ASSERT_TRUE(store->HasMarker("m", has));
  EXPECT_FALSE(has);
  ASSERT_TRUE(store->SetMarker("m") && store->SetMarker("m"));
  ASSERT_TRUE(OpenStore()->HasMarker("m", has));
  EXPECT_TRUE(has);
}

TEST_F(StoreTest, PauseIsClearedUnlessItWasChangedMeanwhile) {
  int64_t resume_time = 7;
  ASSERT_TRUE(store->ClearPause(5));
  ASSERT_TRUE(store->GetPause(resume_time));
  EXPECT_EQ(resume_time, -1);

  ASSERT_TRUE(store->SetPause(6));
  ASSERT_TRUE(store->ClearPause(5));
  ASSERT_TRUE(store->GetPause(resume_time));
  EXPECT_EQ(resume_time, 6);

  ASSERT_TRUE(store->ClearPause(6));
  ASSERT_TRUE(OpenStore()->GetPause(resume_time));
  EXPECT_EQ(resume_time, -1);
}

TEST_F(StoreTest, FilesArePrivateWhateverTheUmask) {
  store.reset();
  for (const mode_t mask : {mode_t{0}, mode_t{0777}}) {
    setenv("FILEINDEXD_STATE_DIR", (folder + "/" + std::to_string(mask)).c_str(), 1);
    const std::string database = folder + "/" + std::to_string(mask) + "/state.db";
    const mode_t before = umask(mask);
    const auto opened = OpenStore();
    const bool touched = opened->Touch();
    umask(before);
    ASSERT_TRUE(touched) << opened->Error();
    for (const char* ending : {"", "-wal", "-shm", ".copy"}) {
      EXPECT_EQ(ModeOf(database + ending), 0600U) << ending << " " << mask;
    }
  }
}

TEST_F(StoreTest, ThreadsAndProcessesShareOneStore) {
  ASSERT_TRUE(store->AddShare({"a", "/v/a", ""}));
  const pid_t other = Fork([] {
    std::string error;
    const auto own = StateStore::Open(error);
    for (int i = 0; own != nullptr && i < 20; ++i) {
      if (!own->AddFolder("/v/a/child" + std::to_string(i), {})) {
        return 1;
      }
    }
    return own == nullptr ? 2 : 0;
  });
  std::atomic<int> failures = 0;
  std::vector<std::thread> threads;
  for (int t = 0; t < 3; ++t) {
    threads.emplace_back([&, t] {
      for (int i = 0; i < 10; ++i) {
        std::shared_ptr<const Settings> settings;
        failures += store->AddFolder("/v/a/" + std::to_string(t * 100 + i), {}) ? 0 : 1;
        failures += store->GetSettings(settings) ? 0 : 1;
      }
    });
  }
  for (std::thread& thread : threads) {
    thread.join();
  }

  EXPECT_EQ(WaitFor(other), 0);
  EXPECT_EQ(failures, 0) << store->Error();
  EXPECT_EQ(Get(*store)->folders.size(), 50U);
}

}  // namespace
}  // namespace fileindexd
