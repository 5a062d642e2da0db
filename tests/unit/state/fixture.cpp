// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/state/fixture.h"

#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <climits>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>

namespace fileindexd {

StateTest::StateTest() {
  std::string pattern = testing::TempDir() + "state_test_XXXXXX";
  char resolved[PATH_MAX];
  folder = realpath(mkdtemp(pattern.data()), resolved);
  state_root = folder + "/state";
  setenv("FILEINDEXD_STATE_DIR", state_root.c_str(), 1);
}

StateTest::~StateTest() {
  unsetenv("FILEINDEXD_STATE_DIR");
  std::error_code ignored;
  std::filesystem::remove_all(folder, ignored);
}

std::unique_ptr<StateStore> StateTest::OpenStore() {
  std::string error;
  auto store = StateStore::Open(error);
  EXPECT_NE(store, nullptr) << error;
  return store;
}

std::string ReadFile(const std::string& path) {
  std::ifstream file(path, std::ios::binary);
  std::stringstream text;
  text << file.rdbuf();
  return text.str();
}

std::vector<std::string> ReadLines(const std::string& path) {
  std::istringstream text(ReadFile(path));
  std::vector<std::string> lines;
  for (std::string line; std::getline(text, line);) {
    lines.push_back(line);
  }
  return lines;
}

void WriteFile(const std::string& path, const std::string& text) {
  std::ofstream file(path, std::ios::binary | std::ios::trunc);
  file << text;
  ASSERT_TRUE(file.flush()) << path;
}

bool Exists(const std::string& path) {
  struct stat st {};
  return lstat(path.c_str(), &st) == 0;
}

mode_t ModeOf(const std::string& path) {
  struct stat st {};
  return stat(path.c_str(), &st) == 0 ? st.st_mode & 07777 : 0;
}

pid_t Fork(const std::function<int()>& body) {
  const pid_t child = fork();
  if (child == 0) {
    _exit(body());
  }
  return child;
}

int WaitFor(pid_t child) {
  int status = 0;
  waitpid(child, &status, 0);
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

}  // namespace fileindexd
