// SPDX-License-Identifier: GPL-2.0-or-later
// Files of the system that libraries and converters open while they read.
#pragma once

#include <string>
#include <vector>

namespace fileindexd {

struct Converter;

struct RunTimeFiles {
  std::vector<std::string> readable;    // files and folders with all below
  std::vector<std::string> executable;  // the converter and its loader
};

// As they lie on this machine; what is not there may be among them.
RunTimeFiles FindRunTimeFiles(const Converter* converter);

// Where the program lies; empty: nowhere.
std::string FindProgramFile(const char* name);

}  // namespace fileindexd
