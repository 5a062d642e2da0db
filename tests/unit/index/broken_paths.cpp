// SPDX-License-Identifier: GPL-2.0-or-later
// Definitions that the library meets in place of the C library's.
#include "tests/unit/index/broken_paths.h"

#include <dirent.h>
#include <dlfcn.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <map>

namespace fileindexd {

namespace {

std::map<std::string, int> broken_readings;
std::map<std::string, int> broken_looks;

std::string PathOf(int fd) {
  char path[PATH_MAX];
  const std::string link = "/proc/self/fd/" + std::to_string(fd);
  const ssize_t length = readlink(link.c_str(), path, sizeof path);
  return length > 0 ? std::string(path, static_cast<size_t>(length)) : std::string();
}

// True when the call is to fail; errno is set then.
bool Fails(const std::map<std::string, int>& broken, const std::string& path) {
  const auto found = broken.find(path);
  if (found != broken.end()) {
    errno = found->second;
  }
  return found != broken.end();
}

template <typename Function>
Function* Hidden(const char* name) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

}  // namespace

void BreakReading(const std::string& path, int code) {
  broken_readings[path] = code;
}

void BreakLooks(const std::string& path, int code) {
  broken_looks[path] = code;
}

void MendAll() {
  broken_readings.clear();
  broken_looks.clear();
}

}  // namespace fileindexd

extern "C" {

ssize_t getdents64(int fd, void* buffer, size_t size) {
  static auto* const hidden = fileindexd::Hidden<ssize_t(int, void*, size_t)>("getdents64");
  using fileindexd::broken_readings;
  const bool fails =
      !broken_readings.empty() && fileindexd::Fails(broken_readings, fileindexd::PathOf(fd));
  return fails ? -1 : hidden(fd, buffer, size);
}

int statx(int folder, const char* name, int flags, unsigned wanted, struct statx* st) {
  static auto* const hidden =
      fileindexd::Hidden<int(int, const char*, int, unsigned, struct statx*)>("statx");
  using fileindexd::broken_looks;
  if (!broken_looks.empty()) {
    const std::string path = *name == '/'    ? name
                             : *name == '\0' ? fileindexd::PathOf(folder)
                                             : fileindexd::PathOf(folder) + "/" + name;
    if (fileindexd::Fails(broken_looks, path)) {
      return -1;
    }
  }
  return hidden(folder, name, flags, wanted, st);
}
}
