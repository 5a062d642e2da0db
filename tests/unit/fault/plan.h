// SPDX-License-Identifier: GPL-2.0-or-later
// Which call fails. One plan for the process; calls are counted only while it is armed.
#pragma once

#include <climits>
#include <string>

namespace fileindexd::fault {

enum class Call {
  // Of SQLite's file layer.
  OPEN,
  READ,
  SHORT_READ,  // the read gives less than was asked for
  WRITE,
  HALF_WRITE,  // the write fails with half of it done
  SYNC,
  TRUNCATE,
  SIZE,
  LOCK,
  SHARED_MEMORY,
  SHARED_LOCK,
  REMOVE,
  ACCESS,
  // Of SQLite itself.
  MEMORY,
  STATEMENT,
  PREPARE,
  // The state folder's own files, whoever calls; `code` is an errno. Queue files do not count.
  FILE_OPEN,
  FILE_READ,
  FILE_WRITE,
  FILE_SYNC,
  FILE_RENAME,
  FILE_REMOVE,
  FILE_MODE,
  FOLDER_MAKE,
};

enum class Target { ENTRIES, STATE, BOTH };

constexpr int FOR_EVER = INT_MAX;

struct Fault {
  Call call = Call::WRITE;
  int code = 0;  // what the call answers
  Target target = Target::BOTH;
  int times = 1;  // so many calls fail, from the Nth on
};

// Before SQLite is used for the first time in this process.
void Install();

// From now on call number `nth` (from 1) and those that follow it fail. 0: they are only counted.
void Arm(const Fault& fault, int nth);
void Disarm();
int Counted();  // calls of the kind since Arm
int Failed();   // of these

// Asked at each call: the code to fail with, 0 to go on.
int Strike(Call call, Target target);
// The database that the name of a file belongs to.
Target TargetOf(const std::string& path);

// What was logged in this process, one line each.
std::string Logged();

}  // namespace fileindexd::fault
