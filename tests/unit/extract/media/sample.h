// SPDX-License-Identifier: GPL-2.0-or-later
#pragma once

#include <string>

namespace fileindexd {

// A file that a test makes.
struct Sample {
  std::string name;  // with its ending
  std::string bytes;
};

}  // namespace fileindexd
