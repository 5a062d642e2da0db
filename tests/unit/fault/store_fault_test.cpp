// SPDX-License-Identifier: GPL-2.0-or-later
// A change of the state database with one call failing: what it claims is what a program that opens
// the database afterwards finds, and later changes work.
#include <gtest/gtest.h>
#include <sqlite3.h>

#include <cerrno>
#include <filesystem>
#include <functional>
#include <ostream>
#include <utility>
#include <vector>

#include "state/store.h"
#include "unit/fault/each.h"

namespace fileindexd::fault {

void PrintTo(const Fault& fault, std::ostream* stream);

namespace {

struct Change {
  const char* name;
  std::function<bool(StateStore&)> make;
  std::function<bool(StateStore&)> is_made;
};

bool HasFolder(StateStore& store, const std::string& path) {
  std::shared_ptr<const Settings> settings;
  EXPECT_TRUE(store.GetSettings(settings)) << store.Error();
  return settings != nullptr && settings->FolderAt(path) != nullptr;
}

bool HasShare(StateStore& store, const std::string& name) {
  std::shared_ptr<const Settings> settings;
  EXPECT_TRUE(store.GetSettings(settings)) << store.Error();
  return settings != nullptr && settings->ShareByName(name) != nullptr;
}

const std::vector<Change>& Changes() {
  static const std::vector<Change> changes = {
      {"add a share",
       [](StateStore& store) {
         return store.AddShare({"b", "/b", "there"});
       },
       [](StateStore& store) { return HasShare(store, "b"); }},
      {"add a folder", [](StateStore& store) { return store.AddFolder("/a/more", {}); },
       [](StateStore& store) { return HasFolder(store, "/a/more"); }},
      {"remove a folder", [](StateStore& store) { return store.RemoveFolder("/a/old"); },
       [](StateStore& store) { return !HasFolder(store, "/a/old"); }},
      {"set a flag",
       [](StateStore& store) {
         return store.UpdateStatus("a", [](ShareStatus& status) { status.needs_reindex = true; });
       },
       [](StateStore& store) {
         ShareStatus status;
         EXPECT_TRUE(store.GetStatus("a", status)) << store.Error();
         return status.needs_reindex;
       }},
      {"set the pause", [](StateStore& store) { return store.SetPause(42); },
       [](StateStore& store) {
         int64_t until = 0;
         EXPECT_TRUE(store.GetPause(until)) << store.Error();
         return until == 42;
       }},
      {"set a marker", [](StateStore& store) { return store.SetMarker("done"); },
       [](StateStore& store) {
         bool has = false;
         EXPECT_TRUE(store.HasMarker("done", has)) << store.Error();
         return has;
       }},
      {"remove a share", [](StateStore& store) { return store.RemoveShare("gone"); },
       [](StateStore& store) { return !HasShare(store, "gone"); }},
  };
  return changes;
}

std::unique_ptr<StateStore> OpenStore() {
  std::string error;
  auto store = StateStore::Open(error);
  EXPECT_NE(store, nullptr) << error;
  return store;
}

void ExpectClaimsHold(const std::vector<bool>& claims) {
  const auto store = OpenStore();
  for (size_t i = 0; i < claims.size(); ++i) {
    // A commit whose sync failed may be found all the same.
    EXPECT_TRUE(!claims[i] || Changes()[i].is_made(*store)) << Changes()[i].name;
  }
}

// As the daemon does, or as programs do that open the database for one change and close it.
enum class By { ONE_STORE, STORES_OF_THEIR_OWN };

bool MakeAlone(const Change& change) {
  std::string error;
  const auto store = StateStore::Open(error);
  return store != nullptr && change.make(*store);
}

void ChangeAll(const Fault& fault, int nth, By by) {
  auto store = OpenStore();
  ASSERT_TRUE(store->AddShare({"a", "/a", "here"}) && store->AddShare({"gone", "/gone", ""}) &&
              store->AddFolder("/a/old", {}))
      << store->Error();
  std::vector<bool> claims;
  if (by == By::STORES_OF_THEIR_OWN) {
    store.reset();
  }
  Arm(fault, nth);
  for (const Change& change : Changes()) {
    claims.push_back(store != nullptr ? change.make(*store) : MakeAlone(change));
  }
  Disarm();

  ExpectClaimsHold(claims);
  store = store != nullptr ? std::move(store) : OpenStore();
  for (size_t i = 0; i < claims.size(); ++i) {
    const bool made = Changes()[i].is_made(*store);
    EXPECT_TRUE(made || Changes()[i].make(*store)) << Changes()[i].name << store->Error();
  }
  store.reset();
  ExpectClaimsHold(std::vector<bool>(claims.size(), true));
}

}  // namespace

class StoreFaultTest : public testing::TestWithParam<Fault> {};

TEST_P(StoreFaultTest, ClaimsHold) {
  const Fault fault = GetParam();
  ForEachCall(fault, [&fault](int nth) { ChangeAll(fault, nth, By::ONE_STORE); });
}

class OwnStoreFaultTest : public testing::TestWithParam<Fault> {};

TEST_P(OwnStoreFaultTest, ClaimsHold) {
  const Fault fault = GetParam();
  ForEachCall(fault, [&fault](int nth) { ChangeAll(fault, nth, By::STORES_OF_THEIR_OWN); });
}

INSTANTIATE_TEST_SUITE_P(
    Once, StoreFaultTest,
    testing::Values(Fault{Call::WRITE, SQLITE_IOERR_WRITE}, Fault{Call::HALF_WRITE, SQLITE_FULL},
                    Fault{Call::SYNC, SQLITE_IOERR_FSYNC},
                    Fault{Call::SHARED_LOCK, SQLITE_IOERR_SHMLOCK},
                    Fault{Call::STATEMENT, SQLITE_IOERR}, Fault{Call::STATEMENT, SQLITE_FULL},
                    Fault{Call::PREPARE, SQLITE_NOMEM}, Fault{Call::MEMORY, SQLITE_NOMEM},
                    Fault{Call::FILE_OPEN, EIO}, Fault{Call::FILE_WRITE, ENOSPC},
                    Fault{Call::FILE_SYNC, EIO}, Fault{Call::FILE_RENAME, EROFS}));

// Whoever closes the database last writes the log back, and cuts or removes it.
INSTANTIATE_TEST_SUITE_P(
    Own, OwnStoreFaultTest,
    testing::Values(Fault{Call::TRUNCATE, SQLITE_IOERR_TRUNCATE, Target::STATE},
                    Fault{Call::REMOVE, SQLITE_IOERR_DELETE, Target::STATE},
                    Fault{Call::WRITE, SQLITE_FULL, Target::STATE},
                    Fault{Call::SYNC, SQLITE_IOERR_FSYNC, Target::STATE},
                    Fault{Call::TRUNCATE, SQLITE_IOERR_TRUNCATE, Target::STATE, FOR_EVER},
                    Fault{Call::REMOVE, SQLITE_IOERR_DELETE, Target::STATE, FOR_EVER}));

INSTANTIATE_TEST_SUITE_P(
    Lasting, StoreFaultTest,
    testing::Values(Fault{Call::WRITE, SQLITE_FULL, Target::BOTH, FOR_EVER},
                    Fault{Call::SYNC, SQLITE_IOERR_FSYNC, Target::BOTH, FOR_EVER},
                    Fault{Call::STATEMENT, SQLITE_IOERR, Target::BOTH, FOR_EVER},
                    Fault{Call::MEMORY, SQLITE_NOMEM, Target::BOTH, FOR_EVER},
                    Fault{Call::FILE_WRITE, EROFS, Target::BOTH, FOR_EVER}));

}  // namespace fileindexd::fault
