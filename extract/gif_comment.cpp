// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/gif_comment.h"

#include <algorithm>

namespace fileindexd {

namespace {

//   file      = "GIF87a" | "GIF89a" screen block*
//   screen    = 4 bytes of size, flags, 2 bytes, colours as the flags say
//   block     = 0x2C 8 bytes, flags, colours, 1 byte, pieces | 0x21 label pieces | 0x3B
//   pieces    = (length byte*)* 0
class Gif {
 public:
  explicit Gif(std::string_view bytes) : rest(bytes) {}

  // The beginning; past the end there is nothing.
  std::string_view Take(size_t count) {
    const std::string_view taken = rest.substr(0, count);
    rest.remove_prefix(taken.size());
    return taken;
  }
  unsigned char TakeByte() {
    const std::string_view byte = Take(1);
    return byte.empty() ? 0 : static_cast<unsigned char>(byte[0]);
  }
  void SkipColours(unsigned char flags) {
    if ((flags & 0x80) != 0) {
      (void)Take(size_t{3} << ((flags & 7) + 1));
    }
  }
  std::string TakePieces(size_t limit) {
    std::string pieces;
    for (size_t length = TakeByte(); length > 0; length = TakeByte()) {
      pieces += Take(length).substr(0, limit - std::min(limit, pieces.size()));
    }
    return pieces;
  }

  std::string_view rest;
};

constexpr unsigned char IMAGE = 0x2C;
constexpr unsigned char EXTENSION = 0x21;
constexpr unsigned char COMMENT = 0xFE;

}  // namespace

std::string GifComment(std::string_view file, size_t limit) {
  std::string comment;
  Gif gif(file);
  if (!gif.Take(6).starts_with("GIF8")) {
    return comment;
  }
  (void)gif.Take(4);
  const unsigned char screen = gif.TakeByte();
  (void)gif.Take(2);
  gif.SkipColours(screen);
  while (comment.size() < limit) {
    const unsigned char block = gif.TakeByte();
    if (block == IMAGE) {
      (void)gif.Take(8);
      gif.SkipColours(gif.TakeByte());
      (void)gif.Take(1);
      (void)gif.TakePieces(0);
    } else if (block == EXTENSION) {
      const bool is_comment = gif.TakeByte() == COMMENT;
      comment += gif.TakePieces(is_comment ? limit - comment.size() : 0);
    } else {
      break;
    }
  }
  return comment;
}

}  // namespace fileindexd
