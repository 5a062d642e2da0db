// SPDX-License-Identifier: GPL-2.0-or-later
// What tells whether words that were cut earlier are still those that would be cut now.
#pragma once

#include <string>

namespace fileindexd {

// The versions of the libraries that cut texts into words of that language (one of LanguageName).
// Where a library keeps its version to itself, what it makes of some words stands for it.
std::string WordsVersion(const std::string& language);

}  // namespace fileindexd
