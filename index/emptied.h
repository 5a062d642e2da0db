// SPDX-License-Identifier: GPL-2.0-or-later
// A share's folder that is empty where it was not.
#pragma once

#include <cstdint>

#include "state/belonging.h"
#include "state/settings.h"
#include "state/store.h"

namespace fileindexd {

// Whether an index of so many entries holds anything but the share's indexed folders themselves.
bool HoldsMoreThanFolders(const Settings& settings, const Share& share, uint64_t entries);

// Whether the share's folder is empty, its index of `entries` is not, and nobody said that this is
// wanted: what was mounted there may be gone, so the emptiness takes nothing out of the index.
bool IsEmptied(StateStore& store, const Settings& settings, const Share& share, uint64_t entries);

}  // namespace fileindexd
