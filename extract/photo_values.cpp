// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/photo_values.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <exiv2/exif.hpp>
#include <exiv2/iptc.hpp>
#include <exiv2/value.hpp>
#include <exiv2/xmp_exiv2.hpp>

#include "extract/media_text.h"
#include "extract/utf16.h"

namespace fileindexd {

namespace {

// More is no text that a person wrote, and turning a picture's data into numbers in words takes
// for ever.
constexpr long MAX_VALUE = 256 * 1024;
constexpr long MAX_ELEMENTS = 4096;
constexpr double UNITS = 1e7;  // in a degree

const Exiv2::Exifdatum* FindExif(const Exiv2::ExifData& exif, const char* key) {
  const auto found = exif.findKey(Exiv2::ExifKey(key));
  const bool is_usable =
      found != exif.end() && found->count() > 0 && found->size() > 0 && found->size() <= MAX_VALUE;
  return is_usable ? &*found : nullptr;
}

// Degrees out of up to three rationals: degrees, minutes, seconds.
std::optional<double> Degrees(const Exiv2::Exifdatum& datum) {
  double degrees = 0;
  double unit = 1;
  for (long i = 0; i < std::min(datum.count(), 3L); i++) {
    const Exiv2::Rational part = datum.toRational(i);
    const auto over = static_cast<uint32_t>(part.first);
    const auto under = static_cast<uint32_t>(part.second);
    if (under == 0) {
      // Seconds of 0/0 are written by cameras that count in parts of minutes.
      if (i == 0 || over != 0) {
        return std::nullopt;
      }
      continue;
    }
    degrees += static_cast<double>(over) / static_cast<double>(under) / unit;
    unit *= 60;
  }
  return degrees;
}

std::optional<Position> Checked(double latitude, double longitude) {
  if (!std::isfinite(latitude) || !std::isfinite(longitude) || std::fabs(latitude) > 90 ||
      std::fabs(longitude) > 180) {
    return std::nullopt;
  }
  const Position position = {std::llround(latitude * UNITS), std::llround(longitude * UNITS)};
  // What cameras write that have not found where they are.
  if (position.latitude == 0 && position.longitude == 0) {
    return std::nullopt;
  }
  return position;
}

// "48,12.5N", "48,12,30N"
std::optional<double> XmpDegrees(const Exiv2::XmpData& xmp, const char* key) {
  const std::vector<std::string> texts = XmpTexts(xmp, key);
  if (texts.empty() || texts[0].size() < 2) {
    return std::nullopt;
  }
  const std::string& text = texts[0];
  const char side = text.back();
  const char* at = text.data();
  const char* end = at + text.size() - 1;
  double degrees = 0;
  double unit = 1;
  for (int part = 0; part < 3 && at < end; part++) {
    double number = 0;
    const auto [rest, error] = std::from_chars(at, end, number, std::chars_format::fixed);
    if (error != std::errc() || number < 0) {
      return std::nullopt;
    }
    degrees += number / unit;
    unit *= 60;
    at = rest < end && *rest == ',' ? rest + 1 : rest;
  }
  return side == 'S' || side == 'W' ? -degrees : degrees;
}

}  // namespace

std::string ExifText(const Exiv2::ExifData& exif, const char* key) {
  const Exiv2::Exifdatum* datum = FindExif(exif, key);
  if (datum == nullptr || datum->typeId() != Exiv2::asciiString) {
    return {};
  }
  const std::string text = datum->toString();
  return Utf8Of(Trimmed(text.substr(0, text.find('\0'))));
}

std::string ExifWideText(const Exiv2::ExifData& exif, const char* key) {
  const Exiv2::Exifdatum* datum = FindExif(exif, key);
  if (datum == nullptr || datum->typeId() != Exiv2::unsignedByte) {
    return {};
  }
  std::string bytes(static_cast<size_t>(datum->size()), '\0');
  (void)datum->copy(reinterpret_cast<Exiv2::byte*>(bytes.data()), Exiv2::littleEndian);
  const std::string text = Utf16ToUtf8(bytes);
  return std::string(Trimmed(text.substr(0, text.find('\0'))));
}

std::string ExifComment(const Exiv2::ExifData& exif) {
  const Exiv2::Exifdatum* datum = FindExif(exif, "Exif.Photo.UserComment");
  if (datum == nullptr) {
    return {};
  }
  const auto* comment = dynamic_cast<const Exiv2::CommentValue*>(&datum->value());
  if (comment == nullptr) {
    return {};
  }
  return Utf8Of(Trimmed(comment->comment()));
}

std::optional<int64_t> ExifNumber(const Exiv2::ExifData& exif, const char* key) {
  const Exiv2::Exifdatum* datum = FindExif(exif, key);
  if (datum == nullptr || datum->typeId() == Exiv2::asciiString) {
    return std::nullopt;
  }
  return datum->toLong(0);
}

std::vector<std::string> IptcTexts(const Exiv2::IptcData& iptc, const char* key) {
  std::vector<std::string> texts;
  const Exiv2::IptcKey wanted(key);
  for (const Exiv2::Iptcdatum& datum : iptc) {
    if (datum.tag() == wanted.tag() && datum.record() == wanted.record() &&
        datum.size() <= MAX_VALUE && texts.size() < MAX_ELEMENTS) {
      texts.push_back(Utf8Of(Trimmed(datum.toString())));
    }
  }
  return texts;
}

std::vector<std::string> XmpTexts(const Exiv2::XmpData& xmp, const char* key) {
  const auto found = xmp.findKey(Exiv2::XmpKey(key));
  if (found == xmp.end()) {
    return {};
  }
  const Exiv2::Value& value = found->value();
  if (const auto* languages = dynamic_cast<const Exiv2::LangAltValue*>(&value)) {
    auto chosen = languages->value_.find("x-default");
    if (chosen == languages->value_.end()) {
      chosen = languages->value_.begin();
    }
    if (chosen == languages->value_.end()) {
      return {};
    }
    return {Utf8Of(Trimmed(chosen->second))};
  }
  std::vector<std::string> texts;
  for (long i = 0; i < std::min(value.count(), MAX_ELEMENTS); i++) {
    texts.push_back(Utf8Of(Trimmed(value.toString(i))));
  }
  return texts;
}

std::optional<Position> ExifPosition(const Exiv2::ExifData& exif) {
  const Exiv2::Exifdatum* north = FindExif(exif, "Exif.GPSInfo.GPSLatitude");
  const Exiv2::Exifdatum* east = FindExif(exif, "Exif.GPSInfo.GPSLongitude");
  if (north == nullptr || east == nullptr || north->typeId() != Exiv2::unsignedRational ||
      east->typeId() != Exiv2::unsignedRational) {
    return std::nullopt;
  }
  const std::optional<double> latitude = Degrees(*north);
  const std::optional<double> longitude = Degrees(*east);
  if (!latitude || !longitude) {
    return std::nullopt;
  }
  const bool is_south = ExifText(exif, "Exif.GPSInfo.GPSLatitudeRef").starts_with("S");
  const bool is_west = ExifText(exif, "Exif.GPSInfo.GPSLongitudeRef").starts_with("W");
  return Checked(is_south ? -*latitude : *latitude, is_west ? -*longitude : *longitude);
}

std::optional<Position> XmpPosition(const Exiv2::XmpData& xmp) {
  const std::optional<double> latitude = XmpDegrees(xmp, "Xmp.exif.GPSLatitude");
  const std::optional<double> longitude = XmpDegrees(xmp, "Xmp.exif.GPSLongitude");
  return latitude && longitude ? Checked(*latitude, *longitude) : std::nullopt;
}

}  // namespace fileindexd
