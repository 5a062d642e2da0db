// SPDX-License-Identifier: GPL-2.0-or-later
// The real programs, started beside the measuring one: in a /run, a /dev/log and a process
// namespace of their own (bench/in_namespace), with a state folder of their own.
//
// Every failure ends the program, with what the daemon logged.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace fileindexd {

// A child that has ended.
struct Ended {
  int status = -1;            // as waitpid gives it
  uint64_t peak_memory = 0;   // KiB
  double processor_time = 0;  // seconds
};
Ended RunProgram(const std::vector<std::string>& arguments, const std::string& output = "");

// The folder of the running program.
std::string OwnFolder();

class DaemonUnderTest {
 public:
  // Starts fileindexd with that state folder, which also becomes this program's own.
  explicit DaemonUnderTest(const std::string& state_folder);
  DaemonUnderTest(const DaemonUnderTest&) = delete;
  DaemonUnderTest& operator=(const DaemonUnderTest&) = delete;
  // SIGTERM, and waits for the end.
  ~DaemonUnderTest();

  // fileindexctl with these arguments.
  void Control(const std::vector<std::string>& arguments);
  // Adds share and indexed folder at `root`, and waits until its first indexing is done.
  void IndexShare(const std::string& share, const std::string& root);
  // Waits until the share's Worker has taken all that was queued and its thread is gone.
  void WaitUntilQuiet(const std::string& share);
  // Highest resident memory so far, KiB.
  uint64_t PeakMemory();
  // Seconds of processor time so far, without that of its children.
  double ProcessorTime();

  [[noreturn]] void FailWithLog(const std::string& what);

 private:
  void Start();
  uint64_t StatusNumber(const std::string& key);

  pid_t pid = -1;
  struct Log;
  std::unique_ptr<Log> log;
};

}  // namespace fileindexd
