// SPDX-License-Identifier: GPL-2.0-or-later
// Rows keep no copy of their name's words: a row is removed by folding its name once more.
#include "index/name_text.h"

#include <gtest/gtest.h>

#include "index/schema.h"

namespace fileindexd {

TEST(NameTextTest, WordsOfNamesChangeOnlyWithTheEntriesVersion) {
  NameFolder folder;
  EXPECT_EQ(
      NameRow(folder,
              "Plan_v1.2 utf8Decoder \u00c4rger a\u0301rbol na\u0131f \ufb01ne \uff26\uff55\uff4c "
              "\u0643\u0650\u062a\u0627\u0628 \u0939\u093f\u0928\u094d\u0926\u0940 \u6771\u4eac "
              "\u304b\u3099 \u1112\u1161\u11ab x\u200by\u00adz\u200d \u00a0\u2014 \u0664\u00b2"),
      "plan_v1.2 utf8decoder arger arbol na\u0131f fine ful "
      "\u0643\u062a\u0627\u0628 \u0939\u093f\u0928\u094d\u0926\u0940  \u6771 \u4eac   "
      "\u304c   \ud55c  xyz \u00a0\u2014 \u06642 \ue000");
  EXPECT_EQ(ENTRIES_VERSION, 4) << "with other words above";
}

}  // namespace fileindexd
