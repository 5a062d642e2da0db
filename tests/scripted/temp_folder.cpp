// SPDX-License-Identifier: GPL-2.0-or-later
#include "scripted/temp_folder.h"

#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>

namespace fileindexd::scripted {

namespace fs = std::filesystem;

TempFolder::TempFolder() {
  path = (fs::temp_directory_path() / "fileindexd-test-XXXXXX").string();
  if (mkdtemp(path.data()) == nullptr) {
    throw std::runtime_error("no temporary folder");
  }
}

TempFolder::~TempFolder() {
  std::error_code ignored;
  fs::remove_all(path, ignored);
}

std::string TempFolder::Path(const std::string& name) const {
  return path + "/" + name;
}

std::string TempFolder::MakeDir(const std::string& name) const {
  fs::create_directories(Path(name));
  return Path(name);
}

std::string TempFolder::Write(const std::string& name, const std::string& text) const {
  fs::create_directories(fs::path(Path(name)).parent_path());
  std::ofstream(Path(name), std::ios::binary) << text;
  return Path(name);
}

bool TempFolder::Exists(const std::string& name) const {
  return fs::symlink_status(Path(name)).type() != fs::file_type::not_found;
}

std::string TempFolder::Read(const std::string& name) const {
  std::ifstream file(Path(name), std::ios::binary);
  return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

int OpenDescriptors() {
  int count = -1;  // the one that looks
  for (const auto& entry : fs::directory_iterator("/proc/self/fd")) {
    (void)entry;
    ++count;
  }
  return count;
}

}  // namespace fileindexd::scripted
