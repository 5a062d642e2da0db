// SPDX-License-Identifier: GPL-2.0-or-later
#include "unit/fault/plan.h"

#include <sqlite3.h>

#include <atomic>

#include "unit/fault/vfs.h"

namespace fileindexd::fault {

namespace {

// Written while no other thread of the process uses a database.
Fault plan;
int first = 0;
std::atomic<bool> armed{false};
std::atomic<int> counted{0};
std::atomic<int> failed{0};

sqlite3_mem_methods memory;

void* Allocate(int size) {
  return Strike(Call::MEMORY, Target::BOTH) != 0 ? nullptr : memory.xMalloc(size);
}

void* Reallocate(void* block, int size) {
  return Strike(Call::MEMORY, Target::BOTH) != 0 ? nullptr : memory.xRealloc(block, size);
}

}  // namespace

void Install() {
  sqlite3_config(SQLITE_CONFIG_GETMALLOC, &memory);
  sqlite3_mem_methods failing = memory;
  failing.xMalloc = Allocate;
  failing.xRealloc = Reallocate;
  sqlite3_config(SQLITE_CONFIG_MALLOC, &failing);
  InstallVfs();
}

void Arm(const Fault& fault, int nth) {
  plan = fault;
  first = nth;
  counted = 0;
  failed = 0;
  armed = true;
}

void Disarm() {
  armed = false;
}

int Counted() {
  return counted;
}

int Failed() {
  return failed;
}

int Strike(Call call, Target target) {
  if (!armed || call != plan.call || (plan.target != Target::BOTH && target != plan.target)) {
    return 0;
  }

  const int number = ++counted;
  if (first == 0 || number < first || number - first >= plan.times) {
    return 0;
  }
  ++failed;
  return plan.code;
}

Target TargetOf(const std::string& path) {
  return path.find("/state.db") != std::string::npos ? Target::STATE : Target::ENTRIES;
}

}  // namespace fileindexd::fault
