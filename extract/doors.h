// SPDX-License-Identifier: GPL-2.0-or-later
// What a helper gives up before it reads the first byte of a file.
//
//   files        opens, for reading alone, what the libraries need (run_time_files.h), by Landlock,
//                or in a mount namespace that holds nothing else; where the kernel has neither,
//                none
//   network,     no way to any: not among the system calls that are allowed (system_calls.h)
//   programs,
//   processes
//   rights       nobody's, no capability, none to be had by executing something
//   amounts      address space, open files, size of files in memory, processor time for a file; no
//                core
//
// Descriptors that it has or is handed stay as they are. Call these while the process has one
// thread. For good.
#pragma once

#include <cstdint>
#include <string>

namespace fileindexd {

struct Converter;

// Bounds of what one file may cost.
constexpr uint64_t ADDRESS_SPACE = uint64_t{1} << 30;  // not where a sanitizer watches
// Files in memory are no part of the address space: each of them, and how many are open at a time.
constexpr uint64_t MEMORY_FILE = uint64_t{48} << 20;
constexpr uint64_t OPEN_FILES = 16;
constexpr uint64_t PROCESSOR_SECONDS = 60;
// Of a helper, all its files together; cannot be raised by it.
constexpr uint64_t PROCESSOR_SECONDS_OF_ALL = 3600;

struct Doors {
  int parent = 0;                        // its process number: when it ends, so does this process
  const Converter* converter = nullptr;  // the one program that may still be executed; null: none
  bool has_landlock = true;              // false: as if the kernel had none
  bool has_namespaces = true;
  bool can_open_files = false;  // out: what the libraries need can be opened
};

// False, and `error` then says why, on failure, or when the parent has ended: then nothing may be
// read.
bool CloseDoors(Doors& doors, std::string& error);

// The next file's share of processor time begins. False where no whole one is left, or with errno.
bool RefreshProcessorTime();

}  // namespace fileindexd
