// SPDX-License-Identifier: GPL-2.0-or-later
// Prints the microseconds of one Add, for new and for unchanged files.
#include <gtest/gtest.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>

#include "index/writer.h"
#include "state/filesystem.h"
#include "tests/unit/state/fixture.h"

namespace fileindexd {

namespace {

class Cost : public StateTest {
 public:
  int Measure(int files);
  void TestBody() override {}

 private:
  bool Round(const char* what, int files, EntryWriter& writer);
};

bool Cost::Round(const char* what, int files, EntryWriter& writer) {
  const auto begun = std::chrono::steady_clock::now();
  for (int i = 0; i < files; ++i) {
    const std::string name = folder + "/share/holiday picture " + std::to_string(i) + ".jpeg";
    if (!writer.Add(name, {true, true, true, true})) {
      return false;
    }
  }
  const auto added = std::chrono::steady_clock::now();
  if (!writer.Commit()) {
    return false;
  }
  const auto committed = std::chrono::steady_clock::now();
  const std::chrono::duration<double, std::micro> add = added - begun;
  const std::chrono::duration<double, std::milli> commit = committed - added;
  printf("%s: %.1f us each, commit %.1f ms\n", what, add.count() / files, commit.count());
  return true;
}

int Cost::Measure(int files) {
  const std::string root = folder + "/share";
  std::filesystem::create_directories(root);
  auto store = OpenStore();
  store->AddShare({"s", root, FilesystemIdentity(root)});
  store->AddFolder(root, {true, true, true, true});
  store->UpdateStatus("s", [](ShareStatus& status) { status.rebuild_wanted = true; });
  for (int i = 0; i < files; ++i) {
    WriteFile(root + "/holiday picture " + std::to_string(i) + ".jpeg", "");
  }
  EntryWriter writer("s", *store, [] {});
  return Round("new", files, writer) && Round("unchanged", files, writer) ? 0 : 1;
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  fileindexd::Cost cost;
  return cost.Measure(argc > 1 ? atoi(argv[1]) : 20000);
}
