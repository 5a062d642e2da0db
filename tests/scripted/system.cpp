// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/system.h"

#include <filesystem>
#include <fstream>

#include "base/mutex_guard.h"
#include "scripted/script.h"

namespace fileindexd {

using scripted::TheScript;

namespace {

bool IsRemovable(const std::string& path) {
  const MutexGuard lock(&TheScript().mutex);
  const std::string& below = TheScript().removable_below;
  return !below.empty() && path.starts_with(below + "/");
}

std::string ServiceCall(const char* name, int wait) {
  return std::string(name) + " " + std::to_string(wait);
}

}  // namespace

int QLIBCProcAliveByPidFile(const char* pid_file) {
  return TheScript().Enter("QLIBCProcAliveByPidFile", pid_file, pid_file).value_or(0);
}

int QLIBCProcPidFileCreate(const char* pid_file) {
  const int answer = TheScript().Enter("QLIBCProcPidFileCreate", pid_file, pid_file).value_or(0);
  if (answer >= 0) {
    std::ofstream(pid_file) << getpid();
  }
  return answer;
}

int QLIBServiceStart(const char* name, int wait) {
  return TheScript().Enter("QLIBServiceStart", name, ServiceCall(name, wait)).value_or(0);
}

int QLIBServiceStop(const char* name, int wait) {
  return TheScript().Enter("QLIBServiceStop", name, ServiceCall(name, wait)).value_or(0);
}

int QLIBCErrGet() {
  const MutexGuard lock(&TheScript().mutex);
  return TheScript().system_error;
}

const char* QLIBCErrorGetFile() {
  return "service.c";
}

int QLIBCErrorGetLine() {
  return 42;
}

int QLIBCExec(const char* program, const char* arg1, const char* arg2, const char* arg3,
              const char* arg4) {
  std::string arguments = program;
  for (const char* argument : {arg1, arg2, arg3, arg4}) {
    if (argument != nullptr) {
      arguments += std::string(" ") + argument;
    }
  }
  const int answer = TheScript().Enter("QLIBCExec", arguments, arguments).value_or(0);
  const bool removes = std::string(program) == "/bin/rm" && arg2 != nullptr && arg3 == nullptr;
  if (answer == 0 && removes && std::string(arg1) == "-rf" && IsRemovable(arg2)) {
    std::error_code gone;
    std::filesystem::remove_all(arg2, gone);
  }
  return answer;
}

}  // namespace fileindexd
