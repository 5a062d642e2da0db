// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/own_root.h"

#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <utility>

#include "base/scoped_fd.h"
#include "extract/error_text.h"
#include "extract/nobody.h"

namespace fileindexd {

namespace {

// The new root is put together here: there on every machine, and nothing of what is needed below.
constexpr const char* SITE = "/tmp";

constexpr unsigned long FIXED = MS_NOSUID | MS_NODEV;

bool MakeFolders(const std::string& path) {
  for (size_t slash = path.find('/', 1); slash != std::string::npos;
       slash = path.find('/', slash + 1)) {
    if (mkdir(path.substr(0, slash).c_str(), S_IRWXU | S_IRGRP | S_IXGRP | S_IROTH | S_IXOTH) !=
            0 &&
        errno != EEXIST) {
      return false;
    }
  }
  return true;
}

// What somebody else has set on a mount cannot be lifted within a user namespace.
unsigned long FlagsOf(const std::string& path) {
  struct statvfs info = {};
  if (statvfs(path.c_str(), &info) != 0) {
    return 0;
  }
  unsigned long flags = 0;
  for (const auto& [told, wanted] : {std::pair<unsigned long, unsigned long>{ST_NOEXEC, MS_NOEXEC},
                                     {ST_NOATIME, MS_NOATIME},
                                     {ST_NODIRATIME, MS_NODIRATIME},
                                     {ST_RELATIME, MS_RELATIME}}) {
    flags |= (info.f_flag & told) != 0 ? wanted : 0;
  }
  return flags;
}

bool Show(const std::string& path) {
  struct stat info = {};
  if (path.empty() || stat(path.c_str(), &info) != 0) {
    return true;
  }

  const std::string place = SITE + path;
  if (!MakeFolders(place)) {
    return false;
  }
  if (S_ISDIR(info.st_mode)) {
    if (mkdir(place.c_str(), S_IRWXU) != 0 && errno != EEXIST) {
      return false;
    }
  } else {
    const ScopedFd made(open(place.c_str(), O_CREAT | O_RDONLY | O_CLOEXEC, S_IRUSR));
    if (made.fd < 0 && errno != EROFS) {  // shown already as part of a folder
      return false;
    }
  }
  return mount(path.c_str(), place.c_str(), nullptr, MS_BIND, nullptr) == 0 &&
         mount(nullptr, place.c_str(), nullptr,
               MS_REMOUNT | MS_BIND | MS_RDONLY | FIXED | FlagsOf(path), nullptr) == 0;
}

bool Write(const char* path, const std::string& text) {
  const ScopedFd file(open(path, O_WRONLY | O_CLOEXEC));
  return file.fd >= 0 &&
         write(file.fd, text.data(), text.size()) == static_cast<ssize_t>(text.size());
}

// In a user namespace it stays who it is: who has no number there can make no file.
bool EnterUserNamespace() {
  const std::string user = std::to_string(geteuid());
  const std::string group = std::to_string(getegid());
  // Who has become another user does not own what the kernel shows of it, but for this.
  return prctl(PR_SET_DUMPABLE, 1, 0, 0, 0) == 0 && unshare(CLONE_NEWUSER | CLONE_NEWNS) == 0 &&
         Write("/proc/self/uid_map", user + " " + user + " 1") &&
         Write("/proc/self/setgroups", "deny") &&
         Write("/proc/self/gid_map", group + " " + group + " 1");
}

// The superuser may lack the right to mount: then it has it where everybody else has.
bool EnterNamespace(std::string& error) {
  const bool is_superuser = geteuid() == 0;
  if (!(is_superuser && unshare(CLONE_NEWNS) == 0) && !(LeaveUser(error) && EnterUserNamespace())) {
    return false;
  }
  return mount(nullptr, "/", nullptr, MS_PRIVATE | MS_REC, nullptr) == 0;
}

// The old root is put over the new one and taken off again: no folder for it is needed.
bool Enter() {
  return chdir(SITE) == 0 && syscall(SYS_pivot_root, ".", ".") == 0 &&
         umount2(".", MNT_DETACH) == 0 && chdir("/") == 0 &&
         mount(nullptr, "/", nullptr, MS_REMOUNT | MS_BIND | MS_RDONLY | FIXED, nullptr) == 0;
}

}  // namespace

bool EnterOwnRoot(const RunTimeFiles& files, std::string& error) {
  (void)umask(S_IWGRP | S_IWOTH);  // whoever the process becomes goes through its folders
  if (!EnterNamespace(error)) {
    return error.empty() ? Failed("mount namespace", error) : false;
  }
  if (mount("none", SITE, "tmpfs", FIXED, "mode=755,size=1m") != 0) {
    return Failed(SITE, error);
  }

  bool is_shown = true;
  for (const auto* paths : {&files.readable, &files.executable}) {
    for (const std::string& path : *paths) {
      is_shown = is_shown && (Show(path) || Failed(path, error));
    }
  }
  if (!is_shown || !Enter()) {
    if (is_shown) {
      (void)Failed("own root", error);
    }
    (void)umount2(SITE, MNT_DETACH);
    return false;
  }
  return true;
}

}  // namespace fileindexd
