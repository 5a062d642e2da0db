// SPDX-License-Identifier: GPL-2.0-or-later
// What one entry costs in an index that grows, against what it cost in one of 10,000 entries: rows
// go into one index, in transactions as the daemon makes them, and the time is taken in portions.
//
// Portions of several sizes of the index are compared within one run. A portion is put at once, so
// there are no rounds: what varies is seen in the rows between the first and the last.
#include <cstdio>

#include "bench/bare_index.h"
#include "bench/measure.h"
#include "bench/scratch.h"

namespace fileindexd {

namespace {

constexpr uint64_t FEW = 10000;
constexpr uint64_t SIZES[] = {100000, 500000, 1000000, 2000000};
constexpr int PORTIONS = 5;  // measured at each size, of FEW rows each

// Of one of the `rows` rows, each portion below a folder of its own.
Cost PortionCost(const std::string& index, const std::string& under, uint64_t rows) {
  const Cost cost = CostOf([&] { PutMadeUpRows(index, under, rows); });
  const auto count = static_cast<double>(rows);
  return {cost.clock / count, cost.processor / count};
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  using namespace fileindexd;  // NOLINT(google-build-using-namespace): the program itself
  const uint64_t divisor = DivisorFrom(argc, argv);
  const uint64_t few = Scaled(FEW, divisor, 10);
  const ScratchFolder scratch;
  const std::string index = scratch.path + "/index";

  uint64_t rows = 0;
  uint64_t portion = 0;
  const auto measure = [&] {
    std::vector<Cost> costs;
    for (int i = 0; i < PORTIONS; ++i) {
      costs.push_back(PortionCost(index, "/share/portion-" + std::to_string(portion++), few));
      rows += few;
    }
    return MedianCost(costs);
  };

  PutMadeUpRows(index, "/share/start", few);
  rows += few;
  const Cost first = measure();
  for (const uint64_t size : SIZES) {
    const uint64_t wanted = Scaled(size, divisor, 10 * few);
    if (wanted > rows + few * PORTIONS) {
      const uint64_t between = wanted - rows - few * PORTIONS;
      PutMadeUpRows(index, "/share/between-" + std::to_string(portion++), between);
      rows += between;
    }
    PrintCosts(
        "one entry more at " + std::to_string(wanted) + " / at " + std::to_string(few) + " entries",
        measure(), first, 1.3);
  }
  return 0;
}
