// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/standalone/walk.h"

#include <utility>

#include "state/layout.h"

namespace fileindexd {

namespace {

struct Walk {
  std::string top;  // normal; empty: none
  bool is_looked_at = false;
};
thread_local Walk walk;

}  // namespace

bool BeginsWalk(const std::string& path) {
  std::string normal = NormalPath(path).value_or(path);
  if (normal == walk.top) {
    // A second event for the same directory looks again.
    return !std::exchange(walk.is_looked_at, false);
  }
  if (!walk.top.empty() && Covers(walk.top, normal)) {
    return false;
  }
  walk = {std::move(normal), false};
  return true;
}

void NoteLookedAt(const std::string& path) {
  walk = {NormalPath(path).value_or(path), true};
}

void EndWalks() {
  walk = {};
}

}  // namespace fileindexd
