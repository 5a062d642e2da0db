// SPDX-License-Identifier: GPL-2.0-or-later
// Cutters of texts that are kept for those who show hits: each knows the stems of words it has met.
#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <string>

#include "index/text_tokenizer.h"

namespace fileindexd {

// Any thread. There are as many cutters of a language as were ever in use at the same time.
class CutterPool {
 public:
  std::unique_ptr<TextCutter> Lend(const std::string& language);
  void TakeBack(const std::string& language, std::unique_ptr<TextCutter> cutter);

 private:
  std::mutex mutex;
  std::multimap<std::string, std::unique_ptr<TextCutter>> unused;
};

}  // namespace fileindexd
