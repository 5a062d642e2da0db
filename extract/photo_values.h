// SPDX-License-Identifier: GPL-2.0-or-later
// Single values out of a picture's three sorts of metadata, as plain texts and numbers.
#pragma once

#include <cstdint>
#include <exiv2/image.hpp>
#include <optional>
#include <string>
#include <vector>

namespace fileindexd {

// Trimmed, in UTF-8. Empty where the key is not there, holds no text, or too much of it.
std::string ExifText(const Exiv2::ExifData& exif, const char* key);
// One of the texts that Windows writes as a row of bytes.
std::string ExifWideText(const Exiv2::ExifData& exif, const char* key);
// The user's comment, which names its charset.
std::string ExifComment(const Exiv2::ExifData& exif);
std::optional<int64_t> ExifNumber(const Exiv2::ExifData& exif, const char* key);

// Each repetition of the key.
std::vector<std::string> IptcTexts(const Exiv2::IptcData& iptc, const char* key);

// Each element of a list; of a text in several languages the default one.
std::vector<std::string> XmpTexts(const Exiv2::XmpData& xmp, const char* key);

// 1e-7 degrees, positive to the north and east. None where it is not whole or cannot be.
struct Position {
  int64_t latitude = 0;
  int64_t longitude = 0;
};
std::optional<Position> ExifPosition(const Exiv2::ExifData& exif);
std::optional<Position> XmpPosition(const Exiv2::XmpData& xmp);

}  // namespace fileindexd
