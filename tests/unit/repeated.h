// SPDX-License-Identifier: GPL-2.0-or-later
#pragma once

#include <cstddef>
#include <string>

namespace fileindexd {

inline std::string Repeated(const std::string& text, size_t times) {
  std::string repeated;
  for (size_t i = 0; i < times; ++i) {
    repeated += text;
  }
  return repeated;
}

}  // namespace fileindexd
