// SPDX-License-Identifier: GPL-2.0-or-later
// How a folder's setting goes from GetMostSuitableCfg to the indexer, by way of a daemon that only
// hands it on: a number with a bit for each kind, or null. It is made for every document, and an
// object's members would cost as much as the index's look for the path.
#pragma once

#include <json/value.h>

#include "state/settings.h"

namespace fileindexd {

constexpr unsigned CONFIGURED_DOCUMENT = 1;
constexpr unsigned CONFIGURED_AUDIO = 2;
constexpr unsigned CONFIGURED_VIDEO = 4;
constexpr unsigned CONFIGURED_PHOTO = 8;

// From anything else but such a number: no kind is wanted.
inline ContentFlags FlagsOfConfiguration(const ::Json::Value& configuration) {
  const unsigned bits = configuration.isUInt() ? configuration.asUInt() : 0;
  return {(bits & CONFIGURED_DOCUMENT) != 0, (bits & CONFIGURED_AUDIO) != 0,
          (bits & CONFIGURED_VIDEO) != 0, (bits & CONFIGURED_PHOTO) != 0};
}

}  // namespace fileindexd
