// SPDX-License-Identifier: GPL-2.0-or-later
// A folder of its own for each test, with the state root in it.
#pragma once

#include <gtest/gtest.h>
#include <sys/types.h>

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "state/store.h"

namespace fileindexd {

class StateTest : public testing::Test {
 protected:
  StateTest();
  ~StateTest() override;

  std::unique_ptr<StateStore> OpenStore();

  std::string folder;      // resolved; removed at the end
  std::string state_root;  // folder + "/state"
};

std::string ReadFile(const std::string& path);
std::vector<std::string> ReadLines(const std::string& path);
void WriteFile(const std::string& path, const std::string& text);
bool Exists(const std::string& path);
mode_t ModeOf(const std::string& path);  // permission bits
// Runs it in a child process, which ends with its result.
pid_t Fork(const std::function<int()>& body);
int WaitFor(pid_t child);  // its exit status, -1 if it was killed

}  // namespace fileindexd
