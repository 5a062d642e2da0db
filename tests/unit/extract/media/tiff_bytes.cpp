// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/media/tiff_bytes.h"

#include "tests/unit/extract/media/bytes.h"
#include "tests/unit/extract/media/picture_samples.h"

namespace fileindexd {

TiffEntry TiffText(uint64_t tag, const std::string& text) {
  return {tag, 2, text.size() + 1, text + std::string(1, '\0')};
}

TiffEntry TiffBytesEntry(uint64_t tag, const std::string& bytes) {
  return {tag, 1, bytes.size(), bytes};
}

TiffEntry TiffShort(uint64_t tag, uint64_t number) {
  return {tag, 3, 1, Little(number, 2)};
}

TiffEntry TiffLong(uint64_t tag, uint64_t number) {
  return {tag, 4, 1, Little(number, 4)};
}

TiffEntry TiffRationals(uint64_t tag, const std::vector<uint64_t>& pairs) {
  std::string bytes;
  for (const uint64_t part : pairs) {
    bytes += Little(part, 4);
  }
  return {tag, 5, pairs.size() / 2, bytes};
}

std::string TiffDirectory(const std::vector<TiffEntry>& entries, uint64_t offset) {
  std::string directory = Little(entries.size(), 2);
  std::string values;
  const uint64_t behind = offset + 2 + entries.size() * 12 + 4;
  for (const TiffEntry& entry : entries) {
    directory += Little(entry.tag, 2) + Little(entry.type, 2) + Little(entry.count, 4);
    if (entry.value.size() <= 4) {
      directory += entry.value + std::string(4 - entry.value.size(), '\0');
      continue;
    }
    directory += Little(behind + values.size(), 4);
    values += entry.value + std::string(entry.value.size() % 2, '\0');
  }
  return directory + Little(0, 4) + values;
}

std::string TiffFile(const std::string& header, std::vector<TiffEntry> picture,
                     const std::vector<TiffEntry>& camera, const std::vector<TiffEntry>& position) {
  const uint64_t start = header.size();
  picture.push_back(TiffLong(0x8769, 0));
  picture.push_back(TiffLong(0x8825, 0));
  const uint64_t camera_at = start + TiffDirectory(picture, start).size();
  const std::string camera_bytes = TiffDirectory(camera, camera_at);
  const uint64_t position_at = camera_at + camera_bytes.size();
  picture[picture.size() - 2] = TiffLong(0x8769, camera_at);
  picture[picture.size() - 1] = TiffLong(0x8825, position_at);
  return header + TiffDirectory(picture, start) + camera_bytes +
         TiffDirectory(position, position_at);
}

std::string PlainTiffHeader() {
  return "II*" + Hex("00 08000000");
}

std::string TiffBytes(const std::string& header) {
  return TiffFile(header,
                  {TiffLong(0x100, 64), TiffLong(0x101, 48), TiffText(0x10e, "Grüße vom Berg"),
                   TiffText(0x10f, "NIKON CORPORATION"), TiffText(0x110, "NIKON D70")},
                  {TiffText(0x9003, "2003:01:02 10:11:12"), TiffText(0x9011, "+02:00"),
                   TiffLong(0xa002, 64), TiffLong(0xa003, 48), TiffText(0xa434, "AF-S 18-70mm")},
                  {TiffText(1, "N"), TiffRationals(2, {48, 1, 12, 1, 3015, 100}), TiffText(3, "W"),
                   TiffRationals(4, {11, 1, 30, 1, 0, 1})});
}

}  // namespace fileindexd
