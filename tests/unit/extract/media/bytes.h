// SPDX-License-Identifier: GPL-2.0-or-later
// Bytes put together by hand.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace fileindexd {

// The lowest `size` bytes of a number, low byte first and high byte first.
std::string Little(uint64_t number, size_t size);
std::string Big(uint64_t number, size_t size);
// Of an MP4: size, type, payload.
std::string Box(std::string_view type, const std::string& payload);
// Of RIFF and of AIFF: type, size, payload, padded to an even length.
std::string RiffChunk(std::string_view type, const std::string& payload);
std::string FormChunk(std::string_view type, const std::string& payload);
// Of Ogg: one page that holds one packet.
std::string OggPage(int flags, int64_t granule, uint32_t number, const std::string& packet,
                    uint32_t stream = 7);
// Of text in hexadecimal digits; blanks are passed over.
std::string Hex(std::string_view digits);
// The checksum of PNG chunks and, read the other way round, of tables in transport streams.
uint32_t PngChecksum(std::string_view bytes);
uint32_t TableChecksum(std::string_view bytes);

}  // namespace fileindexd
