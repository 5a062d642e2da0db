// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/media/bytes.h"

namespace fileindexd {

std::string Little(uint64_t number, size_t size) {
  std::string bytes;
  for (size_t i = 0; i < size; i++) {
    bytes += i < 8 ? static_cast<char>(number >> (8 * i) & 0xff) : '\0';
  }
  return bytes;
}

std::string Big(uint64_t number, size_t size) {
  std::string bytes = Little(number, size);
  return {bytes.rbegin(), bytes.rend()};
}

std::string Box(std::string_view type, const std::string& payload) {
  return Big(payload.size() + 8, 4) + std::string(type) + payload;
}

std::string RiffChunk(std::string_view type, const std::string& payload) {
  return std::string(type) + Little(payload.size(), 4) + payload +
         std::string(payload.size() % 2, '\0');
}

std::string FormChunk(std::string_view type, const std::string& payload) {
  return std::string(type) + Big(payload.size(), 4) + payload +
         std::string(payload.size() % 2, '\0');
}

std::string OggPage(int flags, int64_t granule, uint32_t number, const std::string& packet,
                    uint32_t stream) {
  std::string lengths(packet.size() / 255, '\xff');
  lengths += static_cast<char>(packet.size() % 255);
  std::string page = std::string("OggS\0", 5) + static_cast<char>(flags) +
                     Little(static_cast<uint64_t>(granule), 8) + Little(stream, 4) +
                     Little(number, 4) + Little(0, 4) + static_cast<char>(lengths.size()) +
                     lengths + packet;
  uint32_t checksum = 0;
  for (const char byte : page) {
    checksum ^= static_cast<uint32_t>(static_cast<unsigned char>(byte)) << 24;
    for (int bit = 0; bit < 8; bit++) {
      checksum = (checksum << 1) ^ ((checksum >> 31) != 0 ? 0x04c11db7U : 0U);
    }
  }
  return page.replace(22, 4, Little(checksum, 4));
}

std::string Hex(std::string_view digits) {
  std::string bytes;
  int high = -1;
  for (const char digit : digits) {
    if (digit == ' ') {
      continue;
    }
    const int value = digit <= '9' ? digit - '0' : digit - 'a' + 10;
    if (high < 0) {
      high = value;
    } else {
      bytes += static_cast<char>(high * 16 + value);
      high = -1;
    }
  }
  return bytes;
}

uint32_t PngChecksum(std::string_view bytes) {
  uint32_t checksum = 0xffffffff;
  for (const char byte : bytes) {
    checksum ^= static_cast<unsigned char>(byte);
    for (int bit = 0; bit < 8; bit++) {
      checksum = (checksum >> 1) ^ ((checksum & 1) != 0 ? 0xedb88320U : 0U);
    }
  }
  return ~checksum;
}

uint32_t TableChecksum(std::string_view bytes) {
  uint32_t checksum = 0xffffffff;
  for (const char byte : bytes) {
    checksum ^= static_cast<uint32_t>(static_cast<unsigned char>(byte)) << 24;
    for (int bit = 0; bit < 8; bit++) {
      checksum = (checksum << 1) ^ ((checksum >> 31) != 0 ? 0x04c11db7U : 0U);
    }
  }
  return checksum;
}

}  // namespace fileindexd
