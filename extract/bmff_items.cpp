// SPDX-License-Identifier: GPL-2.0-or-later
//
// box       = size(4) type(4) [size(8) if size is 1] payload; size 0: up to the end
// meta      = version(4) box*, of which
//   pitm    = version(4) item(2, 4 from version 1)
//   iinf    = version(4) count(2, 4 from version 1) infe*
//   infe    = version(4) item(2, 4 from version 3) protection(2) type(4) name\0 [mime type\0]
//   iloc    = version(4) sizes(2) count(2, 4 from version 2) (item [method(2)] data_reference(2)
//             base extent_count(2) ([index] offset length)*)*
//   iprp    = ipco(property box*) ipma
//   ipma    = version(4) count(4) (item association_count(1) association(1 or 2)*)*
//   idat    = bytes that extents may point into
#include "extract/bmff_items.h"

#include <map>
#include <optional>
#include <vector>

namespace fileindexd {

namespace {

constexpr size_t MAX_BOXES = 4096;  // on one level
constexpr uint64_t MAX_ITEMS = 65536;
constexpr uint64_t IN_FILE = 0;  // construction methods
constexpr uint64_t IN_IDAT = 1;

// Reads big-endian numbers off the front; after the end all are 0, and IsGood says so.
class Cursor {
 public:
  explicit Cursor(std::string_view payload) : bytes(payload) {}

  uint64_t Number(size_t size) {
    if (bytes.size() < size) {
      is_good = false;
      bytes = {};
      return 0;
    }
    uint64_t number = 0;
    for (size_t i = 0; i < size; i++) {
      number = number << 8 | static_cast<unsigned char>(bytes[i]);
    }
    bytes.remove_prefix(size);
    return number;
  }
  std::string_view Take(size_t size) {
    const std::string_view taken = bytes.substr(0, size);
    bytes.remove_prefix(taken.size());
    return taken;
  }

  std::string_view bytes;  // that are left
  bool is_good = true;
};

struct Box {
  std::string_view type;
  std::string_view payload;
};

std::optional<Box> TakeBox(Cursor& cursor) {
  if (cursor.bytes.size() < 8) {
    return std::nullopt;
  }
  uint64_t size = cursor.Number(4);
  Box box;
  box.type = cursor.Take(4);
  uint64_t header = 8;
  if (size == 1) {
    size = cursor.Number(8);
    header = 16;
  } else if (size == 0) {
    size = header + cursor.bytes.size();
  }
  if (!cursor.is_good || size < header) {
    return std::nullopt;
  }
  // A box that is cut off is read as far as it goes.
  box.payload = cursor.Take(size - header);
  return box;
}

std::vector<Box> Boxes(std::string_view payload) {
  std::vector<Box> boxes;
  Cursor cursor(payload);
  while (boxes.size() < MAX_BOXES) {
    const std::optional<Box> box = TakeBox(cursor);
    if (!box) {
      break;
    }
    boxes.push_back(*box);
  }
  return boxes;
}

std::string_view FindBox(const std::vector<Box>& boxes, std::string_view type) {
  for (const Box& box : boxes) {
    if (box.type == type) {
      return box.payload;
    }
  }
  return {};
}

uint64_t TakeVersion(Cursor& cursor) {
  return cursor.Number(4) >> 24;
}

uint64_t PrimaryItem(std::string_view payload) {
  Cursor cursor(payload);
  const uint64_t version = TakeVersion(cursor);
  return cursor.Number(version == 0 ? 2 : 4);
}

struct MetadataItems {
  std::optional<uint64_t> exif;
  std::optional<uint64_t> xmp;
};

MetadataItems FindMetadata(std::string_view payload) {
  Cursor list(payload);
  const uint64_t list_version = TakeVersion(list);
  (void)list.Number(list_version == 0 ? 2 : 4);  // The boxes count themselves.
  MetadataItems found;
  for (const Box& box : Boxes(list.bytes)) {
    Cursor cursor(box.payload);
    const uint64_t version = TakeVersion(cursor);
    if (box.type != "infe" || version < 2) {
      continue;
    }
    const uint64_t item = cursor.Number(version == 2 ? 2 : 4);
    (void)cursor.Number(2);  // Protection.
    const std::string_view type = cursor.Take(4);
    if (type == "Exif") {
      found.exif = item;
    } else if (type == "mime" &&
               cursor.bytes.find("application/rdf+xml") != std::string_view::npos) {
      found.xmp = item;
    }
  }
  return found;
}

// The item's bytes, where they lie in one piece.
std::string_view ItemBytes(std::string_view payload, uint64_t wanted, std::string_view file,
                           std::string_view idat) {
  Cursor cursor(payload);
  const uint64_t version = TakeVersion(cursor);
  const uint64_t sizes = cursor.Number(2);
  const size_t offset_size = sizes >> 12 & 15;
  const size_t length_size = sizes >> 8 & 15;
  const size_t base_size = sizes >> 4 & 15;
  const size_t index_size = version == 0 ? 0 : sizes & 15;
  if (offset_size > 8 || length_size > 8 || base_size > 8 || index_size > 8) {
    return {};
  }
  // Extents that take no bytes would be counted to any number without an end.
  const uint64_t most = index_size + offset_size + length_size == 0 ? 1 : UINT16_MAX;
  const uint64_t count = cursor.Number(version < 2 ? 2 : 4);
  for (uint64_t i = 0; i < count && i < MAX_ITEMS && cursor.is_good; i++) {
    const uint64_t item = cursor.Number(version < 2 ? 2 : 4);
    const uint64_t method = version == 0 ? IN_FILE : cursor.Number(2) & 15;
    (void)cursor.Number(2);  // In which file: always this one.
    const uint64_t base = cursor.Number(base_size);
    const uint64_t extents = cursor.Number(2);
    if (extents > most) {
      return {};
    }
    uint64_t offset = 0;
    uint64_t length = 0;
    for (uint64_t extent = 0; extent < extents && cursor.is_good; extent++) {
      (void)cursor.Number(index_size);
      offset = cursor.Number(offset_size);
      length = cursor.Number(length_size);
    }
    if (item != wanted || !cursor.is_good) {
      continue;
    }
    const std::string_view from = method == IN_IDAT ? idat : file;
    const bool is_inside = extents == 1 && method <= IN_IDAT && base <= from.size() &&
                           offset <= from.size() - base && length <= from.size() - base - offset;
    return is_inside ? from.substr(base + offset, length) : std::string_view{};
  }
  return {};
}

// Numbers of the item's properties, counted from 1.
std::vector<uint64_t> Properties(std::string_view payload, uint64_t wanted) {
  Cursor cursor(payload);
  const uint64_t flags = cursor.Number(4);
  const uint64_t count = cursor.Number(4);
  for (uint64_t i = 0; i < count && i < MAX_ITEMS && cursor.is_good; i++) {
    const uint64_t item = cursor.Number(flags >> 24 == 0 ? 2 : 4);
    const uint64_t associations = cursor.Number(1);
    std::vector<uint64_t> properties;
    for (uint64_t one = 0; one < associations && cursor.is_good; one++) {
      const bool is_wide = (flags & 1) != 0;
      properties.push_back(cursor.Number(is_wide ? 2 : 1) & (is_wide ? 0x7fff : 0x7f));
    }
    if (item == wanted) {
      return properties;
    }
  }
  return {};
}

void FindSize(std::string_view payload, uint64_t primary, BmffItems& items) {
  const std::vector<Box> parts = Boxes(payload);
  const std::vector<Box> properties = Boxes(FindBox(parts, "ipco"));
  for (const uint64_t number : Properties(FindBox(parts, "ipma"), primary)) {
    if (number == 0 || number > properties.size() || properties[number - 1].type != "ispe") {
      continue;
    }
    Cursor cursor(properties[number - 1].payload);
    (void)TakeVersion(cursor);
    items.width = static_cast<int64_t>(cursor.Number(4));
    items.height = static_cast<int64_t>(cursor.Number(4));
    return;
  }
}

}  // namespace

BmffItems FindBmffItems(std::string_view file) {
  BmffItems items;
  const std::string_view meta = FindBox(Boxes(file), "meta");
  if (meta.size() < 4) {
    return items;
  }
  const std::vector<Box> boxes = Boxes(meta.substr(4));
  FindSize(FindBox(boxes, "iprp"), PrimaryItem(FindBox(boxes, "pitm")), items);

  const MetadataItems found = FindMetadata(FindBox(boxes, "iinf"));
  const std::string_view places = FindBox(boxes, "iloc");
  const std::string_view idat = FindBox(boxes, "idat");
  if (found.exif) {
    // Its beginning says how many bytes stand before the TIFF header.
    Cursor exif(ItemBytes(places, *found.exif, file, idat));
    const uint64_t skipped = exif.Number(4);
    items.exif = skipped <= exif.bytes.size() ? exif.bytes.substr(skipped) : std::string_view{};
  }
  if (found.xmp) {
    items.xmp = ItemBytes(places, *found.xmp, file, idat);
  }
  return items;
}

}  // namespace fileindexd
