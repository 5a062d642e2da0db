// SPDX-License-Identifier: GPL-2.0-or-later
// What the content service leaves unread on this host, kept for those who ask for the status: one
// line in ROOT/contents-left-out, and no file if there is nothing to tell.
#pragma once

#include <string>

namespace fileindexd {

// Atomically. False with errno.
bool WriteLeftOut(const std::string& left_out);
// Empty: nothing is known to be left out.
std::string ReadLeftOut();

}  // namespace fileindexd
