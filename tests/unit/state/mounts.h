// SPDX-License-Identifier: GPL-2.0-or-later
// Real file systems, mounted in a namespace that only the test program sees.
#pragma once

#include <string>
#include <vector>

#include "state/settings.h"
#include "tests/unit/state/fixture.h"

namespace fileindexd {

// Skips without root. A share "s" at folder + "/share", an indexed folder itself.
class MountTest : public StateTest {
 protected:
  MountTest();
  ~MountTest() override;
  void SetUp() override;

  // Each fails the test when it cannot be done. Mounts are undone at the end, last first.
  void MountImage(const std::string& type, const std::string& at);  // a new one, "ext4" …
  void MountTmpfs(const std::string& at);
  void Bind(const std::string& from, const std::string& at);
  void MountOwnRun();  // for sockets and pid files of the test's own, by either of its names
  void Unmount(const std::string& at);
  void Run(const std::string& command);
  // Folders on the way are made.
  void MakeFolder(const std::string& path);
  void MakeFile(const std::string& path);

  std::string root;  // of the share
  Settings settings;
  std::vector<std::string> mounted;
  std::string last_image;  // of MountImage
  int images = 0;
};

}  // namespace fileindexd
