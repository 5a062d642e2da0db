// SPDX-License-Identifier: GPL-2.0-or-later
// What a client of the service's socket asks for.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace fileindexd {

struct Request {
  uint64_t client = 0;
  enum class Type { STATUS, SYNC } type = Type::STATUS;
  std::vector<std::string> shares;  // of SYNC; none: all
};

// Reads one line, without its newline. Empty on success, else what is wrong with it; `request` is
// then not to be used.
std::string ReadRequest(const std::string& line, Request& request);

}  // namespace fileindexd
