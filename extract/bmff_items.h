// SPDX-License-Identifier: GPL-2.0-or-later
// Items of a picture in boxes (HEIF, AVIF): where its metadata lie, and how big it is.
#pragma once

#include <cstdint>
#include <string_view>

namespace fileindexd {

// The picture library finds these only where the boxes are laid out as one maker's telephones do,
// and takes the biggest tile's size for the picture's.
struct BmffItems {
  int64_t width = 0;  // of the primary item, pixels; 0 is not known
  int64_t height = 0;
  std::string_view exif;  // from its TIFF header on; empty: none, or in pieces
  std::string_view xmp;
};

// The views point into `file`, which is hostile.
BmffItems FindBmffItems(std::string_view file);

}  // namespace fileindexd
