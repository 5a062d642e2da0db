// SPDX-License-Identifier: GPL-2.0-or-later
// A Worker that runs, and its three walks over a small tree.
#pragma once

#include <string>
#include <vector>

#include "unit/worker/worker_fixture.h"

namespace fileindexd {

class WorkerWalksTest : public WorkerFixture {
 protected:
  WorkerWalksTest() {
    Create();
    worker->state = WORKER_RUNNING;
    descriptors = scripted::OpenDescriptors();
    script.Forget();
  }
  ~WorkerWalksTest() override { EXPECT_EQ(scripted::OpenDescriptors(), descriptors); }

  std::string Dir(const std::string& name) { return folder.MakeDir("share/" + name); }
  std::string File(const std::string& name) { return folder.Write("share/" + name, ""); }

  // The operations on the index, as "Add path"; paths without the share's own.
  std::vector<std::string> Touched() {
    std::vector<std::string> touched;
    for (const std::string& call : Changes()) {
      const size_t path = call.find(' ') + 1;
      const std::string whole = call.substr(path, call.find(' ', path) - path);
      touched.push_back(call.substr(0, 3) + " " + whole.substr(share_path.size()));
    }
    return touched;
  }

  static Json::Value Flags() {
    Json::Value flags(Json::objectValue);
    flags["audio"] = true;
    return flags;
  }

  // Each of the three walks, by number; the first two take entries in.
  static constexpr int WALKS = 3;
  static constexpr int TAKING_IN = 2;
  static constexpr const char* NAMES[] = {"IndexDirAdd", "IndexDirUpdate", "IndexDirClean"};
  static constexpr const char* TOUCHES[] = {"Add ", "Upd ", "Del "};
  int Walk(int which, const std::string& path) {
    return which == 0   ? worker->IndexDirAdd(path)
           : which == 1 ? worker->IndexDirUpdate(path, Flags())
                        : worker->IndexDirClean(path);
  }

  int descriptors = 0;
};

}  // namespace fileindexd
