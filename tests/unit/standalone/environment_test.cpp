// SPDX-License-Identifier: GPL-2.0-or-later
// What the process keeps on the platform that is shipped: failures of the store are told once.
#include "platform/standalone/environment.h"

#include <gmock/gmock.h>
#include <sqlite3.h>

#include <filesystem>
#include <functional>
#include <iterator>
#include <memory>
#include <ostream>

#include "state/filesystem.h"
#include "tests/unit/standalone/read_log.h"
#include "tests/unit/state/mounts.h"

namespace fileindexd {
namespace {

namespace fs = std::filesystem;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

struct Use {
  const char* name;
  std::function<void()> ask;
  const char* told;  // when it fails
};

void PrintTo(const Use& use, std::ostream* out) {
  *out << use.name;
}

const Use USES[] = {
    {"Settings", [] { (void)CurrentSettings(); }, "Failed to read settings"},
    {"Status", [] { (void)StatusOf("s"); }, "Failed to read status of share[s]"},
    {"Change", [] { (void)ChangeStatus("s", [](ShareStatus& status) { status.missing ^= true; }); },
     "Failed to store status of share[s]"},
};

// The store's folder is taken away, and something else that cannot be used stands there.
class StoreFailureTest : public MountTest, public testing::WithParamInterface<Use> {
 protected:
  void SetUp() override {
    MountTest::SetUp();
    if (IsSkipped()) {
      return;
    }
    const auto store = OpenStore();
    ASSERT_NE(store, nullptr);
    ASSERT_TRUE(store->AddShare({"s", root, FilesystemIdentity(root)})) << store->Error();
    MakeNewerState();
    log = std::make_unique<LogSocket>();
    ASSERT_TRUE(log->ready);
    ASSERT_NE(Store(), nullptr);
    ASSERT_THAT(Told(), IsEmpty());
  }

  void MakeNewerState() {
    fs::create_directory(newer);
    sqlite3* db = nullptr;
    EXPECT_EQ(sqlite3_open((newer + "/state.db").c_str(), &db), SQLITE_OK);
    EXPECT_EQ(sqlite3_exec(db, "PRAGMA user_version=99", nullptr, nullptr, nullptr), SQLITE_OK);
    sqlite3_close(db);
  }

  void TakeAway() {
    fs::rename(state_root, folder + "/away");
    PutFile();
  }

  void PutBack() {
    fs::remove_all(state_root);
    fs::rename(folder + "/away", state_root);
  }

  void PutFile() {
    fs::remove_all(state_root);
    WriteFile(state_root, "no folder");
  }

  void PutNewer() {
    fs::remove_all(state_root);
    fs::copy(newer, state_root, fs::copy_options::recursive);
  }

  // What is told when it is asked for several times.
  std::vector<std::string> Told() {
    for (int i = 0; i < 3; ++i) {
      GetParam().ask();
    }
    return log->Take();
  }

  auto Says(const char* reason) {
    return ElementsAre(AllOf(HasSubstr(GetParam().told), HasSubstr(reason)));
  }

  const std::string newer = folder + "/newer";
  std::unique_ptr<LogSocket> log;
};

constexpr const char* NO_FOLDER = "cannot create";
constexpr const char* NEWER = "has version 99";

TEST_P(StoreFailureTest, IsToldAnewForAnotherReason) {
  TakeAway();
  EXPECT_THAT(Told(), Says(NO_FOLDER));
  PutNewer();
  EXPECT_THAT(Told(), Says(NEWER));
  PutFile();
  EXPECT_THAT(Told(), Says(NO_FOLDER));
  PutBack();
  EXPECT_THAT(Told(), IsEmpty());
}

TEST_P(StoreFailureTest, IsToldAgainForTheSameReasonOnceItWentWell) {
  for (int i = 0; i < 3; ++i) {
    TakeAway();
    EXPECT_THAT(Told(), Says(NO_FOLDER));
    PutBack();
    EXPECT_THAT(Told(), IsEmpty());
  }
}

TEST_P(StoreFailureTest, IsToldThoughAnotherUseFailedForTheSameReason) {
  TakeAway();
  for (const Use& use : USES) {
    use.ask();
  }
  EXPECT_EQ(log->Take().size(), std::size(USES));
  EXPECT_THAT(Told(), IsEmpty());
  PutBack();
  EXPECT_THAT(Told(), IsEmpty());
}

INSTANTIATE_TEST_SUITE_P(Of, StoreFailureTest, testing::ValuesIn(USES),
                         [](const auto& tested) { return tested.param.name; });

}  // namespace
}  // namespace fileindexd
