// SPDX-License-Identifier: GPL-2.0-or-later
// What runs in a file of film or sound: tracks, their codecs and sizes.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "extract/format.h"

namespace fileindexd {

struct Tracks {
  bool has_video = false;
  bool has_sound = false;
  int64_t duration = 0;  // milliseconds; 0 is not known, for all numbers here
  int64_t bit_rate = 0;  // bits a second
  int64_t width = 0;     // of the first video track, pixels
  int64_t height = 0;
  std::optional<int64_t> recorded;  // seconds since the epoch
  std::vector<std::string> codecs;  // video before sound
  std::string title;
  std::string performer;
  std::string album;
  std::string genre;
  std::string description;
};

// Reads a bounded number of blocks. None where the content is no format that is known.
std::optional<Tracks> FindTracks(const Document& document);

void PutTracks(const Tracks& tracks, ContentSink& sink);

}  // namespace fileindexd
