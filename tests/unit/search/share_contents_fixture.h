// SPDX-License-Identifier: GPL-2.0-or-later
// One share's contents, driven step by step: files on disk, a scripted database, time that only the
// test moves.
#pragma once

#include <gmock/gmock.h>

#include <algorithm>
#include <chrono>
#include <filesystem>
#include <string>
#include <utility>
#include <vector>

#include "search/share_contents.h"
#include "tests/unit/search/scripted.h"
#include "tests/unit/state/fixture.h"

namespace fileindexd {

constexpr int64_t WALL = 1'900'000'000;

class ShareContentsTest : public StateTest {
 protected:
  using Turn = ShareContents::Turn;

  ShareContentsTest() : root(folder + "/share"), contents({"a", root, ""}) {
    ForgetScripted();
    std::filesystem::create_directory(root);
    std::filesystem::create_directory(state_root);
  }
  ~ShareContentsTest() override {
    FilesystemHangs() = false;
    SideWorkTakesTime() = false;
    SideWorkFails() = false;
  }

  // A file of the share that the entries know.
  std::string AddFile(int64_t row) {
    std::string path = root + "/f" + std::to_string(row);
    WriteFile(path, "text " + std::to_string(row));
    AddEntry(row, path);
    return path;
  }
  void AddEntry(int64_t row, const std::string& path) {
    Scripted().entries[row].job.identity = IdentityOf(path);
    Scripted().entries[row].job.paths = {path};
  }

  // Works until the share waits for something else than its next slice.
  void Settle() {
    for (int slices = 0; slices < 100 && contents.Due() <= now; ++slices) {
      contents.Work(now, Wall());
    }
  }
  void Pass(std::chrono::milliseconds time) {
    now += time;
    Settle();
  }
  // The clock on the wall goes along.
  int64_t Wall() const {
    return WALL + std::chrono::duration_cast<std::chrono::seconds>(now - BEGIN).count();
  }
  void ReadTheOne() {
    const auto ids = GiveOut();
    ASSERT_EQ(ids.size(), 1U);
    End(ids[0], ExtractOutcome::Result::DONE);
    Pass(std::chrono::seconds(1));
    EXPECT_EQ(Kept(1).state, ScriptedFile::State::DONE);
  }
  // Second by second, with nothing to read.
  void Wait(int seconds_long) {
    for (int second = 0; second < seconds_long; ++second) {
      Pass(std::chrono::seconds(1));
      EXPECT_THAT(GiveOut(), testing::IsEmpty());
    }
    Settle();
  }
  // Until what may have been told of too early would have been seen.
  void Quieten() { Wait(180); }
  // The rows that are given out.
  std::vector<uint64_t> GiveOut(size_t most = 100) {
    std::vector<uint64_t> ids;
    while (ids.size() < most) {
      ExtractJob job;
      if (!contents.Next(Turn::NEW, now, last_id + 1, job) &&
          !contents.Next(Turn::AGAIN, now, last_id + 1, job)) {
        break;
      }
      ids.push_back(++last_id);
      names.push_back(job.name);
    }
    return ids;
  }
  void End(uint64_t id, ExtractOutcome::Result result, const std::string& text = "words") {
    ExtractOutcome outcome;
    outcome.id = id;
    outcome.result = result;
    outcome.content.text = text;
    outcome.reason = "the reason";
    contents.End(std::move(outcome), now);
  }

  // With what it was about, or whatever it was.
  size_t Count(const std::string& call) {
    return static_cast<size_t>(std::count_if(
        Scripted().calls.begin(), Scripted().calls.end(),
        [&call](const std::string& one) { return (one + " ").starts_with(call + " "); }));
  }
  ScriptedFile Kept(int64_t row) {
    const auto found = Scripted().kept.find(row);
    return found != Scripted().kept.end() ? found->second : ScriptedFile();
  }

  std::string root;
  ShareContents contents;
  static constexpr Time BEGIN{std::chrono::hours(1)};
  Time now = BEGIN;
  uint64_t last_id = 0;
  std::vector<std::string> names;
};

}  // namespace fileindexd
