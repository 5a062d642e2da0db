// SPDX-License-Identifier: GPL-2.0-or-later
// A folder of one test's own, removed with all it holds.
#pragma once

#include <string>

namespace fileindexd::scripted {

class TempFolder {
 public:
  TempFolder();
  TempFolder(const TempFolder&) = delete;
  TempFolder& operator=(const TempFolder&) = delete;
  ~TempFolder();

  // Names are relative to the folder; each returns the absolute path.
  std::string Path(const std::string& name) const;
  std::string MakeDir(const std::string& name) const;
  std::string Write(const std::string& name, const std::string& text) const;
  bool Exists(const std::string& name) const;
  std::string Read(const std::string& name) const;

  std::string path;
};

// Descriptors that this process holds now.
int OpenDescriptors();

}  // namespace fileindexd::scripted
