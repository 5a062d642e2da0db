// SPDX-License-Identifier: GPL-2.0-or-later
// What is wrong with a share's root, for whoever shows it.
#pragma once

#include <cstdint>
#include <string>

#include "state/belonging.h"
#include "state/store.h"

namespace fileindexd {

// Whether the root is sound, holds nothing, and stands for so many entries in the index, with
// nobody having said that this is wanted.
bool IsRootEmptied(const Settings& settings, const Share& share, const ShareStatus& status,
                   RootState root, uint64_t entries);

// A sentence that begins with `subject`, which is how it names the root. Empty: nothing to say.
std::string RootProblem(const std::string& subject, const Share& share, RootState root,
                        bool emptied);

}  // namespace fileindexd
