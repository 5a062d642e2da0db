// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/settings.h"

#include <gtest/gtest.h>

namespace fileindexd {
namespace {

Settings Example() {
  Settings settings;
  settings.shares = {{"a", "/v/a", ""}, {"b", "/v/b", ""}};
  settings.folders = {
      {"a", "/v/a", {}}, {"a", "/v/a/x", {}}, {"a", "/v/a/x/y", {}}, {"b", "/v/b/z", {}}};
  return settings;
}

TEST(SettingsTest, ShareIsFoundByNameAndByPath) {
  const Settings settings = Example();
  EXPECT_EQ(settings.ShareByName("b"), &settings.shares[1]);
  EXPECT_EQ(settings.ShareOfPath("/v/b"), &settings.shares[1]);
  EXPECT_EQ(settings.ShareOfPath("/v/a/q"), &settings.shares[0]);
  EXPECT_EQ(settings.ShareByName("c"), nullptr);
  EXPECT_EQ(settings.ShareByName(""), nullptr);
  EXPECT_EQ(settings.ShareOfPath("/v"), nullptr);
  EXPECT_EQ(settings.ShareOfPath("/v/ab"), nullptr);
}

TEST(SettingsTest, TheDeepestFolderCoversAPath) {
  const Settings settings = Example();
  EXPECT_EQ(settings.FolderOfPath("/v/a/q"), &settings.folders[0]);
  EXPECT_EQ(settings.FolderOfPath("/v/a/x"), &settings.folders[1]);
  EXPECT_EQ(settings.FolderOfPath("/v/a/x/yy"), &settings.folders[1]);
  EXPECT_EQ(settings.FolderOfPath("/v/a/x/y/1/2"), &settings.folders[2]);
  EXPECT_EQ(settings.FolderOfPath("/v/b"), nullptr);
  EXPECT_EQ(settings.FolderOfPath("/v/b/zz"), nullptr);
}

TEST(SettingsTest, AFolderIsFoundAtItsOwnPathOnly) {
  const Settings settings = Example();
  EXPECT_EQ(settings.FolderAt("/v/a/x"), &settings.folders[1]);
  EXPECT_EQ(settings.FolderAt("/v/a/x/q"), nullptr);
  EXPECT_EQ(settings.FolderAt("/v/b"), nullptr);
}

}  // namespace
}  // namespace fileindexd
