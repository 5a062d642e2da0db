// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/audio_stream.h"

#include <algorithm>
#include <stdexcept>

#include "extract/media_text.h"
#include "extract/read_at.h"

namespace fileindexd {

namespace {

constexpr int64_t BLOCK = 32 * 1024;

}  // namespace

TagLib::ByteVector AudioStream::readBlock(unsigned long length) {
  // An end of the file that is shown again and again does not stop every loop of the library; an
  // exception does, and what it leaves behind unfreed ends with the helper.
  if (++calls > MAX_CALLS) {
    throw std::runtime_error("too many blocks");
  }
  int64_t wanted =
      std::min<int64_t>(static_cast<int64_t>(std::min<unsigned long>(length, INT32_MAX)),
                        std::max<int64_t>(size - position, 0));
  wanted = std::min(wanted, MAX_BLOCK);
  if (wanted <= 0) {
    return {};
  }
  int64_t end = position + wanted;
  if (wanted <= BLOCK) {
    bool inside = !block.empty() && position >= block_start &&
                  end <= block_start + static_cast<int64_t>(block.size());
    if (!inside && !Fill()) {
      return {};
    }
    int64_t from = position - block_start;
    int64_t got = std::min<int64_t>(wanted, static_cast<int64_t>(block.size()) - from);
    position += got;
    return TagLib::ByteVector(block.data() + from, static_cast<unsigned>(got));
  }
  if (read_bytes + wanted > MAX_READ) {
    return {};
  }
  TagLib::ByteVector bytes(static_cast<unsigned>(wanted));
  size_t got = ReadAt(document, position, bytes.data(), static_cast<size_t>(wanted));
  bytes.resize(static_cast<unsigned>(got));
  read_bytes += static_cast<int64_t>(got);
  position += static_cast<int64_t>(got);
  return bytes;
}

void AudioStream::seek(long offset, Position from) {
  int64_t start = from == Beginning ? 0 : from == Current ? position : size;
  int64_t target = 0;
  if (__builtin_add_overflow(start, static_cast<int64_t>(offset), &target)) {
    target = size;
  }
  position = std::max<int64_t>(target, 0);
}

// Reads the block that begins a little before the position: some tags are read backwards.
bool AudioStream::Fill() {
  if (read_bytes + BLOCK * 2 > MAX_READ) {
    return false;
  }
  block_start = std::max<int64_t>(position - BLOCK / 8, 0);
  block.resize(static_cast<size_t>(BLOCK + BLOCK / 8));
  block.resize(ReadAt(document, block_start, block.data(), block.size()));
  read_bytes += static_cast<int64_t>(block.size());
  if (block_start + static_cast<int64_t>(block.size()) <= position) {
    block.clear();
    return false;
  }
  return true;
}

}  // namespace fileindexd
