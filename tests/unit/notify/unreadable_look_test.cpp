// SPDX-License-Identifier: GPL-2.0-or-later
// What the file system does not answer for: the daemon looks itself.
#include <cerrno>

#include "tests/unit/index/broken_paths.h"
#include "tests/unit/notify/gatherer_fixture.h"

namespace fileindexd {

class UnreadableLookTest : public GathererTest {
 protected:
  void TearDown() override { MendAll(); }
};

TEST_F(UnreadableLookTest, WhatHasComeMayBeADirectoryAndIsReindexed) {
  for (const uint32_t what : {CREATED, MOVED_TO, DELETED, MODIFIED, WRITTEN, ATTRIBUTES}) {
    const std::string name = std::to_string(what);
    MakeDirectory(name);
    BreakLooks(home + "/" + name, EIO);
    Add(File(what, name));
    const bool has_come = what == CREATED || what == MOVED_TO || what == DELETED;
    EXPECT_EQ(All(), Texts({(has_come ? "REINDEX " : "MODIFY ") + name}));
  }
}

}  // namespace fileindexd
