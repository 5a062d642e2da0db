// SPDX-License-Identifier: GPL-2.0-or-later
// What every measuring program shares: rounds, medians, and the rows of the table.
//
//   row = name, ours, reference, ratio, target     columns of fixed width; bench/run prints the
//   heading
//
// Ours and the reference are measured in turns within one run, so that a busy machine slows both.
#pragma once

#include <cstdint>
#include <ctime>
#include <functional>
#include <string>
#include <vector>

namespace fileindexd {

constexpr int ROUNDS = 5;

// Seconds on the monotonic clock.
double Now();

// Seconds that `work` takes.
double TimeOf(const std::function<void()>& work);

double Seconds(const timespec& time);

// What a piece of work took, in seconds. What others do at the same time shows in the first alone.
struct Cost {
  double clock = 0;
  double processor = 0;
};

// What `work` takes of this program's own processor time.
Cost CostOf(const std::function<void()>& work);
Cost MedianCost(const std::vector<Cost>& costs);

// The middle one; of an even number the lower of the two in the middle. Not of none.
double Median(std::vector<double> values);

// The one that 95 of 100 are not above. Not of none.
double Percentile95(std::vector<double> values);

// `size` divided by `divisor`, and never less than `least`.
uint64_t Scaled(uint64_t size, uint64_t divisor, uint64_t least);

// The divisor that a program was started with: its only argument, 1 without one. Ends the program
// with 2 where it is no positive number.
uint64_t DivisorFrom(int argc, char** argv);

// "12.3 ms", with the unit that suits.
std::string SecondsText(double seconds);

void PrintRow(const std::string& name, const std::string& ours, const std::string& reference,
              double ratio, double target);
// A time against a time.
void PrintTimes(const std::string& name, double ours, double reference, double target);
// The same, and a row for the processor time.
void PrintCosts(const std::string& name, const Cost& ours, const Cost& reference, double target);

// Says on standard error what did not work, and ends the program with 1.
[[noreturn]] void Fail(const std::string& what);

}  // namespace fileindexd
