// SPDX-License-Identifier: GPL-2.0-or-later
#include "bench/measure.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>

namespace fileindexd {

double Now() {
  const auto since = std::chrono::steady_clock::now().time_since_epoch();
  return std::chrono::duration<double>(since).count();
}

double TimeOf(const std::function<void()>& work) {
  const double begin = Now();
  work();
  return Now() - begin;
}

double Seconds(const timespec& time) {
  return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) / 1e9;
}

Cost CostOf(const std::function<void()>& work) {
  timespec begin{};
  timespec end{};
  (void)clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &begin);  // cannot fail for this clock
  const double clock = TimeOf(work);
  (void)clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &end);
  return {clock, Seconds(end) - Seconds(begin)};
}

Cost MedianCost(const std::vector<Cost>& costs) {
  std::vector<double> clock;
  std::vector<double> processor;
  for (const Cost& cost : costs) {
    clock.push_back(cost.clock);
    processor.push_back(cost.processor);
  }
  return {Median(clock), Median(processor)};
}

double Median(std::vector<double> values) {
  std::sort(values.begin(), values.end());
  return values[(values.size() - 1) / 2];
}

double Percentile95(std::vector<double> values) {
  std::sort(values.begin(), values.end());
  return values[(values.size() * 95 + 99) / 100 - 1];
}

uint64_t Scaled(uint64_t size, uint64_t divisor, uint64_t least) {
  return std::max(size / divisor, least);
}

uint64_t DivisorFrom(int argc, char** argv) {
  if (argc < 2) {
    return 1;
  }

  char* end = nullptr;
  const unsigned long long divisor = strtoull(argv[1], &end, 10);
  if (argc > 2 || *end != '\0' || divisor == 0) {
    fprintf(stderr, "%s: the argument is what sizes are divided by\n", argv[0]);
    exit(2);
  }
  return divisor;
}

std::string SecondsText(double seconds) {
  char text[32];
  if (seconds >= 1) {
    snprintf(text, sizeof(text), "%.2f s", seconds);
  } else if (seconds >= 1e-3) {
    snprintf(text, sizeof(text), "%.2f ms", seconds * 1e3);
  } else if (seconds >= 1e-6) {
    snprintf(text, sizeof(text), "%.1f us", seconds * 1e6);
  } else {
    snprintf(text, sizeof(text), "%.1f ns", seconds * 1e9);
  }
  return text;
}

void PrintRow(const std::string& name, const std::string& ours, const std::string& reference,
              double ratio, double target) {
  printf("%-52s %12s %12s %8.3f %8.3f\n", name.c_str(), ours.c_str(), reference.c_str(), ratio,
         target);
  (void)fflush(stdout);  // a long run shows its rows as they come
}

void PrintTimes(const std::string& name, double ours, double reference, double target) {
  PrintRow(name, SecondsText(ours), SecondsText(reference), ours / reference, target);
}

void PrintCosts(const std::string& name, const Cost& ours, const Cost& reference, double target) {
  PrintTimes(name, ours.clock, reference.clock, target);
  PrintTimes("processor time of the same", ours.processor, reference.processor, target);
}

void Fail(const std::string& what) {
  fprintf(stderr, "bench: %s\n", what.c_str());
  exit(1);
}

}  // namespace fileindexd
