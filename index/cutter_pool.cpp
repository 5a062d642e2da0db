// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/cutter_pool.h"

#include <utility>

namespace fileindexd {

std::unique_ptr<TextCutter> CutterPool::Lend(const std::string& language) {
  {
    const std::lock_guard<std::mutex> lock(mutex);
    auto node = unused.extract(language);
    if (!node.empty()) {
      return std::move(node.mapped());
    }
  }
  return std::make_unique<TextCutter>(language);
}

void CutterPool::TakeBack(const std::string& language, std::unique_ptr<TextCutter> cutter) {
  const std::lock_guard<std::mutex> lock(mutex);
  unused.emplace(language, std::move(cutter));
}

}  // namespace fileindexd
