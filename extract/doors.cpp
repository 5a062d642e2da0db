// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/doors.h"

#include <sys/prctl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>

#include "base/capabilities.h"
#include "base/landlock.h"
#include "extract/error_text.h"
#include "extract/limits.h"
#include "extract/nobody.h"
#include "extract/own_root.h"
#include "extract/run_time_files.h"
#include "extract/system_calls.h"

namespace fileindexd {

namespace {

bool Limit(const LandlockRules& rules, const RunTimeFiles& files, std::string& error) {
  for (const std::string& path : files.readable) {
    if (!rules.Allow(path.c_str(), LANDLOCK_ACCESS_FS_READ_FILE | LANDLOCK_ACCESS_FS_READ_DIR)) {
      return Failed(path, error);
    }
  }
  for (const std::string& path : files.executable) {
    if (!rules.Allow(path.c_str(), LANDLOCK_ACCESS_FS_READ_FILE | LANDLOCK_ACCESS_FS_EXECUTE)) {
      return Failed(path, error);
    }
  }
  return true;
}

}  // namespace

bool CloseDoors(Doors& doors, std::string& error) {
  // The order matters: an own root takes a capability; Landlock's rules are made while everything
  // can be named, and hold once no new privileges can be had; limits on processes count against the
  // user, and are refused by none; the system calls go last.
  GoFirst();
  const RunTimeFiles files = FindRunTimeFiles(doors.converter);
  LandlockRules rules;
  const bool has_landlock = doors.has_landlock && LandlockVersion() >= 1;
  if (has_landlock && (!rules.Open(LANDLOCK_READS | LandlockWrites(LandlockVersion())) ||
                       !Limit(rules, files, error))) {
    return error.empty() ? Failed("Landlock", error) : false;
  }
  if (!BoundCapabilities(0)) {  // takes none of those that it has now
    return Failed("capabilities", error);
  }
  std::string fault;
  const bool has_own_root = !has_landlock && doors.has_namespaces && EnterOwnRoot(files, fault);
  doors.can_open_files = has_landlock || has_own_root;
  if (!doors.can_open_files && doors.converter != nullptr) {
    error = "neither Landlock nor an own root: " + fault;
    return false;
  }

  (void)umask(S_IRWXG | S_IRWXO);
  if (!BoundCapabilities(0)) {  // a user namespace of its own began with all of them
    return Failed("capabilities", error);
  }
  if (!LeaveUser(error)) {
    return false;
  }
  if (!KeepCapabilities(0)) {
    return Failed("capabilities", error);
  }
  if (prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0 || prctl(PR_SET_DUMPABLE, 0, 0, 0, 0) != 0) {
    return Failed("privileges", error);
  }
  // Becoming another user has undone it, had it been done before.
  if (prctl(PR_SET_PDEATHSIG, SIGKILL, 0, 0, 0) != 0 || getppid() != doors.parent) {
    return Failed("parent", error);
  }
  if (has_landlock && !rules.Restrict()) {
    return Failed("Landlock", error);
  }
  if (!SetLimits()) {
    return Failed("limits", error);
  }
  const SystemCalls calls = {doors.can_open_files, doors.converter != nullptr};
  return LimitSystemCalls(calls, error);
}

}  // namespace fileindexd
