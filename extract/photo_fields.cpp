// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/photo_fields.h"

#include <algorithm>
#include <exiv2/easyaccess.hpp>
#include <exiv2/exif.hpp>
#include <exiv2/iptc.hpp>
#include <exiv2/xmp_exiv2.hpp>

#include "extract/media_text.h"
#include "extract/photo_values.h"

namespace fileindexd {

namespace {

std::string Joined(const std::vector<std::string>& texts) {
  std::string joined;
  for (const std::string& text : texts) {
    joined += joined.empty() || text.empty() ? "" : ", ";
    joined += text;
  }
  return joined;
}

// A time of the camera's clock. Where the camera wrote down its zone, that is left out: what people
// remember, and what cameras without one write, is what the clock said.
std::optional<int64_t> ExifClock(const Exiv2::ExifData& exif, const char* key) {
  return WrittenClockOf(ExifText(exif, key));
}

std::optional<int64_t> FirstClock(const std::vector<std::string>& texts) {
  return texts.empty() ? std::nullopt : WrittenClockOf(texts[0]);
}

std::optional<int64_t> Taken(const Exiv2::Image& image) {
  const Exiv2::ExifData& exif = image.exifData();
  const Exiv2::XmpData& xmp = image.xmpData();
  auto taken = ExifClock(exif, "Exif.Photo.DateTimeOriginal");
  if (!taken) {
    taken = ExifClock(exif, "Exif.Photo.DateTimeDigitized");
  }
  for (const char* key :
       {"Xmp.exif.DateTimeOriginal", "Xmp.photoshop.DateCreated", "Xmp.xmp.CreateDate"}) {
    taken = taken ? taken : FirstClock(XmpTexts(xmp, key));
  }
  if (!taken) {
    const auto days = IptcTexts(image.iptcData(), "Iptc.Application2.DateCreated");
    const auto times = IptcTexts(image.iptcData(), "Iptc.Application2.TimeCreated");
    taken = days.empty() ? std::nullopt
                         : WrittenClockOf(times.empty() ? days[0] : days[0] + " " + times[0]);
  }
  // The last, as it is that of the last change where a program has been at work.
  return taken ? taken : ExifClock(exif, "Exif.Image.DateTime");
}

std::string_view FirstWord(std::string_view text) {
  return text.substr(0, text.find(' '));
}

bool IsSameWord(std::string_view one, std::string_view other) {
  return one.size() == other.size() &&
         std::equal(one.begin(), one.end(), other.begin(),
                    [](unsigned char a, unsigned char b) { return (a | 0x20) == (b | 0x20); });
}

// Maker and model; many models begin with their maker already.
std::string Camera(const Exiv2::Image& image) {
  const Exiv2::ExifData& exif = image.exifData();
  std::string maker = ExifText(exif, "Exif.Image.Make");
  std::string model = ExifText(exif, "Exif.Image.Model");
  if (maker.empty() && model.empty()) {
    maker = ExifText(exif, "Exif.PanasonicRaw.Make");
    model = ExifText(exif, "Exif.PanasonicRaw.Model");
  }
  if (maker.empty() && model.empty()) {
    maker = Joined(XmpTexts(image.xmpData(), "Xmp.tiff.Make"));
    model = Joined(XmpTexts(image.xmpData(), "Xmp.tiff.Model"));
  }
  if (model.empty() || maker.empty() || IsSameWord(FirstWord(maker), FirstWord(model))) {
    return model.empty() ? maker : model;
  }
  return maker + " " + model;
}

// What makers write in their own notes, mostly a number, by the library's tables.
std::string LensOfMaker(const Exiv2::ExifData& exif) {
  const auto found = Exiv2::lensName(exif);
  if (found == exif.end()) {
    return {};
  }
  const std::string name = Utf8Of(found->print(&exif));
  // A number that no table has is shown as it is, "(255)", or said to be unknown.
  const bool is_name = std::any_of(name.begin(), name.end(), [](unsigned char letter) {
    return (letter | 0x20) >= 'a' && (letter | 0x20) <= 'z';
  });
  return is_name && name[0] != '(' && name != "n/a" && !name.starts_with("Unknown") ? name : "";
}

std::string Lens(const Exiv2::Image& image) {
  const Exiv2::ExifData& exif = image.exifData();
  for (const char* key : {"Exif.Photo.LensModel", "Exif.Canon.LensModel",
                          "Exif.OlympusEq.LensModel", "Exif.Panasonic.LensType"}) {
    std::string lens = ExifText(exif, key);
    if (!lens.empty()) {
      return lens;
    }
  }
  for (const char* key : {"Xmp.exifEX.LensModel", "Xmp.aux.Lens"}) {
    std::string lens = Joined(XmpTexts(image.xmpData(), key));
    if (!lens.empty()) {
      return lens;
    }
  }
  return LensOfMaker(exif);
}

void PutTexts(const Exiv2::Image& image, ContentSink& sink) {
  const Exiv2::ExifData& exif = image.exifData();
  const Exiv2::IptcData& iptc = image.iptcData();
  const Exiv2::XmpData& xmp = image.xmpData();

  // The first that says something stays. XMP comes first: it alone has a sure charset.
  sink.Set(ContentField::CAPTION, Joined(XmpTexts(xmp, "Xmp.dc.description")));
  sink.Set(ContentField::CAPTION, Joined(IptcTexts(iptc, "Iptc.Application2.Caption")));
  sink.Set(ContentField::CAPTION, ExifText(exif, "Exif.Image.ImageDescription"));
  sink.Set(ContentField::CAPTION, ExifComment(exif));
  sink.Set(ContentField::CAPTION, ExifWideText(exif, "Exif.Image.XPComment"));
  sink.Set(ContentField::CAPTION, Trimmed(Utf8Of(image.comment())));  // of the file, not the photo

  sink.Set(ContentField::TITLE, Joined(XmpTexts(xmp, "Xmp.dc.title")));
  sink.Set(ContentField::TITLE, Joined(IptcTexts(iptc, "Iptc.Application2.ObjectName")));
  sink.Set(ContentField::TITLE, ExifWideText(exif, "Exif.Image.XPTitle"));

  sink.Set(ContentField::AUTHOR, Joined(XmpTexts(xmp, "Xmp.dc.creator")));
  sink.Set(ContentField::AUTHOR, Joined(IptcTexts(iptc, "Iptc.Application2.Byline")));
  sink.Set(ContentField::AUTHOR, ExifText(exif, "Exif.Image.Artist"));
  sink.Set(ContentField::AUTHOR, ExifWideText(exif, "Exif.Image.XPAuthor"));
}

void PutKeywords(const Exiv2::Image& image, ContentSink& sink) {
  for (const std::string& keyword : XmpTexts(image.xmpData(), "Xmp.dc.subject")) {
    sink.Set(ContentField::KEYWORDS, keyword);
  }
  for (const std::string& keyword : IptcTexts(image.iptcData(), "Iptc.Application2.Keywords")) {
    sink.Set(ContentField::KEYWORDS, keyword);
  }
  const std::string list = ExifWideText(image.exifData(), "Exif.Image.XPKeywords");
  for (std::string_view rest = list; !rest.empty();) {
    const size_t end = rest.find(';');
    sink.Set(ContentField::KEYWORDS, Trimmed(rest.substr(0, end)));
    rest = end == std::string_view::npos ? std::string_view{} : rest.substr(end + 1);
  }
}

}  // namespace

void PutPhotoFields(const Exiv2::Image& image, ContentSink& sink) {
  PutTexts(image, sink);
  PutKeywords(image, sink);
  sink.Set(ContentField::CAMERA, Camera(image));
  sink.Set(ContentField::LENS, Lens(image));
  if (const auto taken = Taken(image)) {
    sink.Set(ContentField::TAKEN, *taken);
  }

  auto position = ExifPosition(image.exifData());
  position = position ? position : XmpPosition(image.xmpData());
  if (position) {
    sink.Set(ContentField::LATITUDE, position->latitude);
    sink.Set(ContentField::LONGITUDE, position->longitude);
  }

  const auto ratings = XmpTexts(image.xmpData(), "Xmp.xmp.Rating");
  auto rating = ratings.empty() ? std::nullopt : LeadingNumber(ratings[0]);
  rating = rating ? rating : ExifNumber(image.exifData(), "Exif.Image.Rating");
  if (rating) {
    sink.Set(ContentField::RATING, *rating);
  }
}

}  // namespace fileindexd
