// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/words_version.h"

#include <utf8proc.h>

#include <cstdint>

#include "index/text_tokenizer.h"

namespace fileindexd {

namespace {

// Inflected words of several languages and scripts: a stemmer that was changed most likely changes
// one of them.
constexpr const char* SAMPLE =
    "connections connected generously relational dying skies national hopefulness running "
    "aufgegangenen H\u00e4user verstandlichkeit kategorischen chevaux majestueusement "
    "continuellement nationalit\u00e9s corriendo nacionalidades cantar\u00edamos "
    "abbandonata pronunciamento j\u00e4mv\u00e4giga opmerkelijke lichamelijkheden "
    "naturalidade evleriniz alamaga\u0301 fotografiilor h\u00e1zaknak talossanikaan "
    "\u043a\u0440\u0430\u0441\u0438\u0432\u0435\u0439\u0448\u0438\u043c\u0438 "
    "\u0643\u062a\u0627\u0628\u0647\u0645 \ufb01ne \uff26\uff55\uff4c\uff4c \u6771\u4eac\u90fd "
    "foo_bar fooBar v1.2 utf8Decoder x\u200by a_b_c_d_e_f_g_h_i_j_k_l";

}  // namespace

std::string WordsVersion(const std::string& language) {
  uint64_t hash = 0xcbf29ce484222325;
  const auto add = [&hash](unsigned char byte) { hash = (hash ^ byte) * 0x100000001b3; };
  TextCutter(language).Cut(SAMPLE, false, [&](std::string_view word, size_t, size_t) {
    for (const char byte : word) {
      add(static_cast<unsigned char>(byte));
    }
    add(0);
    return true;
  });
  return std::string(utf8proc_version()) + " " + utf8proc_unicode_version() + " " +
         std::to_string(hash);
}

}  // namespace fileindexd
