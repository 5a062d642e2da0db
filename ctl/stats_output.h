// SPDX-License-Identifier: GPL-2.0-or-later
// Statistics, as stats shows them. On a screen bytes are short ("4.0K"), elsewhere exact.
#pragma once

#include <json/value.h>

#include <optional>
#include <string>
#include <vector>

#include "ctl/terminal/screen.h"
#include "index/statistics.h"

namespace fileindexd {

Json::Value StatisticsObject(const StatisticsWish& wish, const Statistics& statistics);

std::vector<std::string> StatisticsLines(const StatisticsWish& wish, const Statistics& statistics,
                                         const std::optional<Screen>& screen);

// "kind", "ext", "owner", "folder", "age".
const char* GroupByText(GroupBy by);
std::optional<GroupBy> GroupByFromText(const std::string& text);

}  // namespace fileindexd
