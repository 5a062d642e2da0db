// SPDX-License-Identifier: GPL-2.0-or-later
// A pass that exercises everything, once for every call of every operation: that call fails, or
// says yes, or throws. Whatever it is, the thread ends, nothing leaks and every lock is free.
#include <cerrno>
#include <filesystem>
#include <functional>
#include <stdexcept>

#include "unit/worker/worker_fixture.h"

namespace fileindexd {
namespace {

// What is asked inside a node; nothing else may throw.
const std::vector<std::string> IN_NODES = {"IsDirExist",
                                           "IsFullPathIndexed",
                                           "IsSkipIndex",
                                           "GetMostSuitableCfg",
                                           "CanFullPathBeIndexed",
                                           "AddFSDocument",
                                           "UpdateFSDocument",
                                           "DelFSDocument",
                                           "TALOFSDirIsMntPoint",
                                           "QLIBFhsPathInSnapshot",
                                           "IsSystemPreservedFileName",
                                           "GetFullPath"};
const std::vector<std::string> AROUND_NODES = {"IsFileExist",
                                               "Commit",
                                               "Indexer",
                                               "IsShareSpaceEnough",
                                               "ShareIsNeedReindex",
                                               "StringStartWith",
                                               "RetrieveBoolFromJsonObj"};

class WorkerFaultTest : public WorkerFixture {
 protected:
  // Events for every code, over a small tree with a mount point and a merge of flags.
  void Prepare() {
    script.Reset();
    script.shares.push_back({"s", share_path, queue_path, db_path});
    script.removable_below = folder.path;
    AddFolder(share_path);
    AddFolder(In("d/own"));
    folder.Write("share/d/f", "");
    folder.Write("share/d/e/g", "");
    const std::string mount = folder.MakeDir("share/d/#snapshot");
    script.Say("CanFullPathBeIndexed", mount, 0);
    script.Say("TALOFSDirIsMntPoint", mount, 1);
    const std::string flags = R"("data":{"photo":true})";
    Queue({Event(64, In("d/f")), Event(128, In("x")), Event(2, In("d/e/g")),
           Event(131072, In("d"), flags), Event(131072, In("d"), flags), Event(65536, In("z")),
           Event(256, In("d/e"), "\"path_old\":\"" + In("old") + "\""), Event(1024, In("n")),
           "malformed"});
    ASSERT_NE(Create(), nullptr);
    worker->op_count = 1997;  // a commit in the middle
  }

  void RunAndCheck() {
    const int descriptors = scripted::OpenDescriptors();
    RunThread();
    EXPECT_EQ(worker->state, WORKER_FINISHED);
    EXPECT_EQ(scripted::OpenDescriptors(), descriptors);
    EXPECT_FALSE(script.rules_overlapped);
    ExpectMutexesFree();
    Delete();
    EXPECT_EQ(script.live_indexers, indexers_before);
    std::filesystem::remove(queue_path);
    std::filesystem::remove(queue_path + ".tmp");
  }

  // Lets each call have its fault, one run for each, until a run makes no such call any more.
  void ForEachCall(const std::string& operation, const std::function<void(int)>& arm) {
    SCOPED_TRACE(operation);
    for (int nth = 1;; ++nth) {
      SCOPED_TRACE(nth);
      Prepare();
      const int call = script.CallCount(operation) + nth;
      arm(call);
      RunAndCheck();
      if (script.CallCount(operation) < call) {
        ASSERT_GT(nth, 1) << "never called";
        return;
      }
    }
  }
};

TEST_F(WorkerFaultTest, AnyCallMayFail) {
  for (const auto& operations : {IN_NODES, AROUND_NODES}) {
    for (const std::string& operation : operations) {
      ForEachCall(operation, [&](int nth) { script.Fail(operation, nth); });
    }
  }
}

TEST_F(WorkerFaultTest, AnyCallMaySayYes) {
  for (const std::string& operation : IN_NODES) {
    ForEachCall(operation, [&](int nth) { script.Answer(operation, nth, 1); });
  }
  ForEachCall("IsFileExist", [&](int nth) { script.Answer("IsFileExist", nth, 1); });
  ForEachCall("ShareIsNeedReindex", [&](int nth) { script.Answer("ShareIsNeedReindex", nth, 1); });
}

TEST_F(WorkerFaultTest, AnyCallInsideANodeMayThrow) {
  for (const std::string& operation : IN_NODES) {
    ForEachCall(operation, [&](int nth) {
      script.Run(operation, nth, [] { throw std::runtime_error("host"); });
    });
  }
}

TEST_F(WorkerFaultTest, AnyDirectoryCallMayFail) {
  for (const char* operation : {"opendir", "readdir64_r"}) {
    ForEachCall(operation, [&](int nth) { script.Answer(operation, nth, EIO); });
  }
}

}  // namespace
}  // namespace fileindexd
