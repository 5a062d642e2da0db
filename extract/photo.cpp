// SPDX-License-Identifier: GPL-2.0-or-later
#include <sys/mman.h>

#include <algorithm>
#include <exiv2/bmffimage.hpp>
#include <exiv2/exiv2.hpp>
#include <exiv2/webpimage.hpp>

#include "extract/bmff_items.h"
#include "extract/format.h"
#include "extract/gif_comment.h"
#include "extract/media_text.h"
#include "extract/photo_fields.h"
#include "extract/read_at.h"

namespace fileindexd {

namespace {

// What the reader knows. Of other pictures the ending tells the kind, and nothing is expected of
// their content.
constexpr std::string_view READ_ENDINGS =
    "jpg jpeg jpe jfif jif jp2 j2k jpf jpx png gif bmp dib tif tiff webp heic heif heics heifs "
    "avif avifs jxl psd psb raw dng cr2 cr3 crw nef nrw arw sr2 srw orf raf rw2 pef mrw";

constexpr int READ_TYPES[] = {
    Exiv2::ImageType::jpeg, Exiv2::ImageType::cr2,  Exiv2::ImageType::crw,  Exiv2::ImageType::mrw,
    Exiv2::ImageType::tiff, Exiv2::ImageType::webp, Exiv2::ImageType::orf,  Exiv2::ImageType::raf,
    Exiv2::ImageType::rw2,  Exiv2::ImageType::png,  Exiv2::ImageType::gif,  Exiv2::ImageType::bmp,
    Exiv2::ImageType::psd,  Exiv2::ImageType::jp2,  Exiv2::ImageType::bmff,
};

constexpr size_t MAX_METADATA = 16 << 20;  // bytes of one sort
constexpr int64_t MAX_PIXELS = 1 << 20;    // on a side

// Some formats' first looks throw over files that are shorter; zeros behind the end harm none.
constexpr size_t SMALLEST = 256;

// A file's bytes, mapped: the library wants all of a raw file at once, and looks at few of its
// pages. A page that cannot be had, of a disk that fails or a file that was cut meanwhile, ends the
// helper by SIGBUS (see main.cpp).
class Mapping {
 public:
  explicit Mapping(const Document& document) : size(static_cast<size_t>(document.size)) {
    if (size >= SMALLEST) {
      bytes = mmap(nullptr, size, PROT_READ, MAP_PRIVATE, document.file, 0);
      return;
    }
    const size_t filled = size;
    size = SMALLEST;
    bytes = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    if (IsThere()) {
      (void)ReadAt(document, 0, static_cast<char*>(bytes), filled);  // What is missing stays zero.
    }
  }
  ~Mapping() {
    if (IsThere()) {
      (void)munmap(bytes, size);  // Cannot fail: it is a mapping of ours, whole.
    }
  }
  Mapping(const Mapping&) = delete;
  Mapping& operator=(const Mapping&) = delete;
  bool IsThere() const { return bytes != MAP_FAILED; }

  void* bytes = MAP_FAILED;
  size_t size;
};

void SetUp() {
  static const bool is_set_up = [] {
    Exiv2::LogMsg::setLevel(Exiv2::LogMsg::mute);
    Exiv2::LogMsg::setHandler(nullptr);
    Exiv2::enableBMFF(true);
    return Exiv2::XmpParser::initialize();
  }();
  (void)is_set_up;  // Without XMP the other sorts are still read.
}

void PutSize(int64_t width, int64_t height, ContentSink& sink) {
  if (width > 0 && height > 0 && width <= MAX_PIXELS && height <= MAX_PIXELS) {
    sink.Set(ContentField::WIDTH, width);
    sink.Set(ContentField::HEIGHT, height);
  }
}

// Adds to the image what stands in items that the library did not find.
void ReadItems(std::string_view file, Exiv2::Image& image, ContentSink& sink) {
  const BmffItems items = FindBmffItems(file);
  PutSize(items.width, items.height, sink);
  if (image.exifData().empty() && !items.exif.empty() && items.exif.size() <= MAX_METADATA) {
    (void)Exiv2::ExifParser::decode(image.exifData(),
                                    reinterpret_cast<const Exiv2::byte*>(items.exif.data()),
                                    static_cast<uint32_t>(items.exif.size()));
  }
  if (image.xmpData().empty() && !items.xmp.empty() && items.xmp.size() <= MAX_METADATA) {
    // What it could not decode is not there.
    (void)Exiv2::XmpParser::decode(image.xmpData(), std::string(items.xmp));
  }
}

int TypeOf(const Mapping& mapping) {
  try {
    return Exiv2::ImageFactory::getType(static_cast<const Exiv2::byte*>(mapping.bytes),
                                        static_cast<long>(mapping.size));
  } catch (const std::exception&) {
    return Exiv2::ImageType::none;
  }
}

bool ReadPicture(int type, const Mapping& mapping, ContentSink& sink, std::string& why) {
  Exiv2::Image::AutoPtr image;
  bool is_whole = true;
  try {
    image = Exiv2::ImageFactory::open(static_cast<const Exiv2::byte*>(mapping.bytes),
                                      static_cast<long>(mapping.size));
    image->readMetadata();
  } catch (const std::exception&) {
    is_whole = false;  // What was read before is there.
  }
  if (image.get() == nullptr) {
    why = "damaged";
    return false;
  }
  try {
    if (type == Exiv2::ImageType::bmff) {
      ReadItems({static_cast<const char*>(mapping.bytes), mapping.size}, *image, sink);
    }
    PutSize(image->pixelWidth(), image->pixelHeight(), sink);
    PutPhotoFields(*image, sink);
    if (type == Exiv2::ImageType::gif) {
      sink.Set(ContentField::CAPTION,
               Trimmed(Utf8Of(GifComment({static_cast<const char*>(mapping.bytes), mapping.size},
                                         ContentSink::MAX_FIELD))));
    }
  } catch (const std::exception&) {
    is_whole = false;
  }
  if (!is_whole) {
    why = "damaged";
  }
  return is_whole;
}

}  // namespace

bool ReadPhoto(const Document& document, ContentSink& sink, std::string& why) {
  SetUp();
  sink.SetKind(Kind::PHOTO);
  if (document.size <= 0) {
    why = "empty";
    return false;
  }
  const Mapping mapping(document);
  if (!mapping.IsThere()) {
    why = "too big to be mapped";
    return false;
  }
  const int type = TypeOf(mapping);
  if (std::ranges::find(READ_TYPES, type) != std::end(READ_TYPES)) {
    return ReadPicture(type, mapping, sink, why);
  }
  if (!HasEnding(document.name, READ_ENDINGS)) {
    return true;
  }
  why = "damaged, or no picture";
  return false;
}

}  // namespace fileindexd
