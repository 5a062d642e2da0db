// SPDX-License-Identifier: GPL-2.0-or-later
// Makes archives for the readers' tests.
#pragma once

#include <string>
#include <vector>

namespace fileindexd {

struct Member {
  std::string name;
  std::string bytes;
};

struct Packing {
  int format = 0;  // ARCHIVE_FORMAT_…
  int filter = 0;  // ARCHIVE_FILTER_…
  std::string options;
  std::string passphrase;
};

// The bytes of an archive of these members.
std::string Packed(const Packing& packing, const std::vector<Member>& members);
std::string Zipped(const std::vector<Member>& members);

}  // namespace fileindexd
