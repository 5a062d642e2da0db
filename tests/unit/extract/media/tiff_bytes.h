// SPDX-License-Identifier: GPL-2.0-or-later
// Directories in the structure of TIFF, by hand.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace fileindexd {

struct TiffEntry {
  uint64_t tag;
  uint64_t type;
  uint64_t count;
  std::string value;  // its bytes; more than four are put behind the directory
};

TiffEntry TiffText(uint64_t tag, const std::string& text);
TiffEntry TiffBytesEntry(uint64_t tag, const std::string& bytes);
TiffEntry TiffShort(uint64_t tag, uint64_t number);
TiffEntry TiffLong(uint64_t tag, uint64_t number);
// Pairs of numerator and denominator.
TiffEntry TiffRationals(uint64_t tag, const std::vector<uint64_t>& pairs);

// The directory with its values, to be put at `offset`.
std::string TiffDirectory(const std::vector<TiffEntry>& entries, uint64_t offset);

// A header, then three directories: picture, camera, position. Tags in rising order.
std::string TiffFile(const std::string& header, std::vector<TiffEntry> picture,
                     const std::vector<TiffEntry>& camera, const std::vector<TiffEntry>& position);

}  // namespace fileindexd
