// SPDX-License-Identifier: GPL-2.0-or-later
// Raw photos whose files have a structure of their own.
#include <utility>

#include "tests/unit/extract/media/bytes.h"
#include "tests/unit/extract/media/picture_samples.h"
#include "tests/unit/extract/media/tiff_bytes.h"

namespace fileindexd {

namespace {

std::string OneDirectory(const std::vector<TiffEntry>& entries) {
  const std::string header = PlainTiffHeader();
  return header + TiffDirectory(entries, header.size());
}

// Values, then their directory, then where that begins.
std::string Heap(const std::vector<std::pair<uint64_t, std::string>>& entries) {
  std::string values;
  std::string directory = Little(entries.size(), 2);
  for (const auto& [tag, value] : entries) {
    directory += Little(tag, 2) + Little(value.size(), 4) + Little(values.size(), 4);
    values += value;
  }
  return values + directory + Little(values.size(), 4);
}

}  // namespace

Sample MrwSample() {
  const std::string tiff = TiffBytes(PlainTiffHeader());
  const std::string blocks = std::string("\0PRD", 4) + Big(24, 4) + std::string(24, '\0') +
                             std::string("\0TTW", 4) + Big(tiff.size(), 4) + tiff;
  return {"p.mrw", std::string("\0MRM", 4) + Big(blocks.size(), 4) + blocks};
}

Sample Cr3Sample() {
  const std::string picture =
      OneDirectory({TiffText(0x10e, "Grüße vom Berg"), TiffText(0x10f, "NIKON CORPORATION"),
                    TiffText(0x110, "NIKON D70")});
  const std::string camera =
      OneDirectory({TiffText(0x9003, "2003:01:02 10:11:12"), TiffText(0x9011, "+02:00"),
                    TiffLong(0xa002, 64), TiffLong(0xa003, 48), TiffText(0xa434, "AF-S 18-70mm")});
  const std::string position =
      OneDirectory({TiffText(1, "N"), TiffRationals(2, {48, 1, 12, 1, 3015, 100}), TiffText(3, "W"),
                    TiffRationals(4, {11, 1, 30, 1, 0, 1})});
  const std::string parts =
      Box("uuid", Hex("85c0b687820f11e08111f4ce462b6a48") + Box("CMT1", picture) +
                      Box("CMT2", camera) + Box("CMT4", position));
  return {"p.cr3", Box("ftyp", "crx " + Big(1, 4) + "crx isom") + Box("moov", parts) +
                       Box("mdat", std::string(64, '\x05'))};
}

Sample CrwSample() {
  const std::string maker = std::string("Canon\0Canon EOS 10D\0", 20);
  const std::string facts = Heap({
      {0x2807, Heap({{0x080a, maker}})},
      {0x180e, Little(PHOTO_TAKEN, 4) + Little(0, 8)},
      {0x1810, Little(64, 4) + Little(48, 4) + Little(0x3f800000, 4) + std::string(16, '\0')},
  });
  return {"p.crw", "II" + Little(26, 4) + "HEAPCCDR" + std::string(12, '\0') +
                       Heap({{0x2005, std::string(256, '\x05')}, {0x300a, facts}})};
}

}  // namespace fileindexd
