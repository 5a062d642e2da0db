// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/pressure.h"

#include <filesystem>

#include "tests/unit/state/fixture.h"

namespace fileindexd {

class PressureTest : public StateTest {
 protected:
  void Say(const std::string& resource, const std::string& text) {
    WriteFile(folder + "/" + resource, text);
  }
};

TEST_F(PressureTest, HighestOfTheThreeCounts) {
  Say("cpu", "some avg10=1.25 avg60=99.00 avg300=99.00 total=1\nfull avg10=98.00 avg60=0\n");
  EXPECT_DOUBLE_EQ(ReadPressure(folder), 1.25);
  Say("io", "some avg10=41.50 avg60=0.00 avg300=0.00 total=1\n");
  EXPECT_DOUBLE_EQ(ReadPressure(folder), 41.5);
  Say("memory", "some avg10=100.00 avg60=0.00 avg300=0.00 total=1\n");
  EXPECT_DOUBLE_EQ(ReadPressure(folder), 100);
}

TEST_F(PressureTest, KernelThatDoesNotTellCountsAsNone) {
  EXPECT_DOUBLE_EQ(ReadPressure(folder), 0);
  for (const char* text :
       {"", "some", "some avg10=", "some avg10=x", "full avg10=7.00", "avg10=8"}) {
    Say("io", text);
    EXPECT_DOUBLE_EQ(ReadPressure(folder), 0) << text;
  }
}

}  // namespace fileindexd
