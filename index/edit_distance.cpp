// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/edit_distance.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdlib>
#include <vector>

#include "index/text_characters.h"

namespace fileindexd {

namespace {

std::vector<int32_t> Codes(const std::string& text) {
  std::vector<int32_t> codes;
  for (size_t at = 0; at < text.size();) {
    const Character character = CharacterAt(text, at);
    codes.push_back(character.code);
    at += character.size;
  }
  return codes;
}

}  // namespace

int EditDistance(const std::string& from, const std::string& to, int most) {
  const std::vector<int32_t> a = Codes(from);
  const std::vector<int32_t> b = Codes(to);
  if (std::abs(static_cast<int>(a.size()) - static_cast<int>(b.size())) > most) {
    return most + 1;
  }
  std::array<std::vector<int>, 3> rows;  // the last two and this one
  for (std::vector<int>& row : rows) {
    row.resize(b.size() + 1);
  }
  for (size_t j = 0; j <= b.size(); ++j) {
    rows[0][j] = static_cast<int>(j);
  }
  for (size_t i = 1; i <= a.size(); ++i) {
    std::vector<int>& row = rows[i % 3];
    const std::vector<int>& above = rows[(i + 2) % 3];
    const std::vector<int>& two_above = rows[(i + 1) % 3];
    row[0] = static_cast<int>(i);
    int least = row[0];
    for (size_t j = 1; j <= b.size(); ++j) {
      row[j] =
          std::min({above[j] + 1, row[j - 1] + 1, above[j - 1] + (a[i - 1] == b[j - 1] ? 0 : 1)});
      if (i > 1 && j > 1 && a[i - 1] == b[j - 2] && a[i - 2] == b[j - 1]) {
        row[j] = std::min(row[j], two_above[j - 2] + 1);
      }
      least = std::min(least, row[j]);
    }
    if (least > most) {
      return most + 1;
    }
  }
  return std::min(rows[a.size() % 3][b.size()], most + 1);
}

}  // namespace fileindexd
