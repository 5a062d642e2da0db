// SPDX-License-Identifier: GPL-2.0-or-later
// What a system call failed with, in words.
#pragma once

#include <cerrno>
#include <string>
#include <system_error>

namespace fileindexd {

inline std::string ErrorText(int number) {
  return std::generic_category().message(number);
}

// "WHAT: why", by errno, as the error; always false.
inline bool Failed(const std::string& what, std::string& error) {
  error = what + ": " + ErrorText(errno);
  return false;
}

}  // namespace fileindexd
