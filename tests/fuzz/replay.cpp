// SPDX-License-Identifier: GPL-2.0-or-later
// Gives a fuzz target every file of the folders that are named, once.
#include <cerrno>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <string>

#include "fuzz/target.h"

int main(int count, char** arguments) {
  std::set<std::filesystem::path> files;
  for (int i = 1; i < count; ++i) {
    for (const auto& entry : std::filesystem::directory_iterator(arguments[i])) {
      files.insert(entry.path());
    }
  }
  if (files.empty()) {
    fprintf(stderr, "%s: no inputs\n", program_invocation_short_name);
    return 1;
  }

  for (const std::filesystem::path& path : files) {
    std::ifstream file(path, std::ios::binary);
    const std::string bytes((std::istreambuf_iterator<char>(file)), {});
    fprintf(stderr, "%s\n", path.filename().c_str());  // the last one is the one that failed
    (void)LLVMFuzzerTestOneInput(reinterpret_cast<const uint8_t*>(bytes.data()), bytes.size());
  }
  return 0;
}
