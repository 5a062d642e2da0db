// SPDX-License-Identifier: GPL-2.0-or-later
// Processes and services.
#pragma once

namespace fileindexd {

// 1 when the process that the pid file records is alive, 0 when not, negative on failure.
int QLIBCProcAliveByPidFile(const char* pid_file);

// Records the calling process; negative on failure.
int QLIBCProcPidFileCreate(const char* pid_file);

// Start and stop the service of that name; `wait` is 1: until it runs, or has ended. Negative on
// failure, and the three operations below then tell of it.
int QLIBServiceStart(const char* name, int wait);
int QLIBServiceStop(const char* name, int wait);

// The calling thread's last error of the operations above: its code, and where it was found.
int QLIBCErrGet();
const char* QLIBCErrorGetFile();
int QLIBCErrorGetLine();

// Runs a program with up to four arguments, the remaining ones null, and waits for its end. Its
// exit status, or negative when it could not be run.
int QLIBCExec(const char* program, const char* arg1, const char* arg2, const char* arg3,
              const char* arg4);

}  // namespace fileindexd
