// SPDX-License-Identifier: GPL-2.0-or-later
// Random patterns, compared with what git makes of them.
#include <sys/stat.h>

#include <cstdlib>
#include <filesystem>
#include <random>
#include <set>

#include "state/excludes.h"
#include "tests/unit/state/fixture.h"

namespace fileindexd {
namespace {

constexpr int LISTS = 60;
constexpr int LISTS_LONG = 3000;

bool IsLong() {
  const char* scale = getenv("FILEINDEXD_TEST_SCALE");  // NOLINT: nothing here calls setenv later
  return scale != nullptr && std::string(scale) == "long";
}

class ExcludesGitTest : public StateTest {
 protected:
  void SetUp() override {
    if (std::system("git --version >/dev/null 2>&1") != 0) {  // NOLINT: no thread runs yet
      GTEST_SKIP() << "there is no git";
    }
    tree = folder + "/tree";
    std::filesystem::create_directories(tree);
    ASSERT_TRUE(Git("init -q ."));
    MakeTree("", 0);
  }

  bool Git(const std::string& arguments) {
    const std::string command =
        "cd '" + tree + "' && GIT_CONFIG_NOSYSTEM=1 HOME=/nonexistent git " + arguments;
    const int status = std::system(command.c_str());  // NOLINT: as above
    return WIFEXITED(status) && WEXITSTATUS(status) <= 1;
  }

  // Three directories and three files at each of three levels.
  void MakeTree(const std::string& below, int depth) {
    for (const char* name : {"a", "ab", "b.c"}) {
      const std::string path = below + name;
      paths.push_back(path + "/");
      std::filesystem::create_directory(tree + "/" + path);
      if (depth < 2) {
        MakeTree(path + "/", depth + 1);
      }
    }
    for (const char* name : {"c", "a.c", "]-!"}) {
      paths.push_back(below + name);
      WriteFile(tree + "/" + below + name, "");
    }
  }

  std::string RandomPattern() {
    static constexpr const char* PIECES[] = {
        "a", "b", "c",   ".c",  "ab",          "*",     "*",    "**",   "?",   "/",
        "/", "/", "**/", "/**", "\\a",         "[a-b]", "[!a]", "[]-]", "\\]", "[^c.]",
        " ", "!", "-",   "a/b", "[[:alpha:]]", "\\/",   "b.c",  "\\ "};
    std::string pattern = random() % 4 == 0 ? "!" : "";
    for (size_t count = 1 + random() % 5; count > 0; --count) {
      pattern += PIECES[random() % std::size(PIECES)];
    }
    return pattern;
  }

  // git compares the bytes before the first wildcard on their own, and so takes the asterisks of
  // "ab**/c" for ones that begin the pattern. Its manual says that they are ordinary there.
  static bool IsTakenOtherwise(const std::string& pattern) {
    for (size_t at = pattern.find("**"); at != std::string::npos; at = pattern.find("**", at + 1)) {
      const bool begins = at == 0 || (at == 1 && pattern[0] == '!');
      if (!begins && pattern[at - 1] != '/' && pattern.find('/') != std::string::npos) {
        return true;
      }
    }
    return false;
  }

  std::set<std::string> ByGit(const std::vector<std::string>& patterns) {
    std::string text;
    for (const std::string& pattern : patterns) {
      text += pattern + "\n";
    }
    WriteFile(tree + "/.git/info/exclude", text);
    std::string asked;
    for (const std::string& path : paths) {
      asked += Plain(path) + '\0';
    }
    WriteFile(folder + "/asked", asked);
    EXPECT_TRUE(Git("check-ignore --no-index -z --stdin <../asked >../answers"));
    const std::string answers = ReadFile(folder + "/answers");
    std::set<std::string> out;
    for (size_t at = 0; at < answers.size();) {
      const size_t end = answers.find('\0', at);
      out.insert(answers.substr(at, end - at));
      at = end + 1;
    }
    return out;
  }

  static std::string Plain(const std::string& path) {
    return path.ends_with('/') ? path.substr(0, path.size() - 1) : path;
  }

  std::mt19937 random{20240229};
  std::string tree;
  std::vector<std::string> paths;
};

TEST_F(ExcludesGitTest, RandomListsKeepOutTheSamePaths) {
  size_t kept_out = 0;
  for (int list = IsLong() ? LISTS_LONG : LISTS; list > 0 && !HasFailure(); --list) {
    Excludes excludes;
    for (size_t count = 1 + random() % 4; count > 0; --count) {
      std::string error;
      const std::string pattern = RandomPattern();
      if (!IsTakenOtherwise(pattern)) {
        (void)excludes.Add(pattern, error);  // what is no pattern is left out
      }
    }

    const std::set<std::string> expected = ByGit(excludes.patterns);

    kept_out += expected.size();
    for (const std::string& path : paths) {
      const Leaf leaf = path.ends_with('/') ? Leaf::DIRECTORY : Leaf::OTHER;
      EXPECT_EQ(excludes.KeepOut(Plain(path), leaf).pattern != nullptr,
                expected.contains(Plain(path)))
          << path << " by " << testing::PrintToString(excludes.patterns);
    }
  }
  EXPECT_GT(kept_out, 100U);
}

}  // namespace
}  // namespace fileindexd
