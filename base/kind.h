// SPDX-License-Identifier: GPL-2.0-or-later
// Kinds of things that an index knows.
#pragma once

namespace fileindexd {

// Numbers are stored in the index: they never change.
enum class Kind { OTHER = 0, DOCUMENT = 1, AUDIO = 2, VIDEO = 3, PHOTO = 4, FOLDER = 5 };

}  // namespace fileindexd
