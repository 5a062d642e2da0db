// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/places.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <optional>
#include <vector>

#include "ctl/output.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

// None, with errno, when it does not exist or cannot be reached.
std::optional<std::string> RealPath(const std::string& path) {
  char* resolved = realpath(path.c_str(), nullptr);
  if (resolved == nullptr) {
    return std::nullopt;
  }

  std::string result = resolved;
  free(resolved);
  return result;
}

std::string Join(const std::string& folder, const std::string& name) {
  return folder == "/" ? folder + name : folder + "/" + name;
}

// Drops the last component, and returns it; both paths without a slash at their end.
std::string SplitLast(std::string& path) {
  const size_t slash = path.rfind('/');
  std::string name = path.substr(slash + 1);
  path.resize(slash == 0 ? 1 : slash);
  return name;
}

bool IsAbsent(const std::string& path) {
  struct stat status = {};
  return lstat(path.c_str(), &status) != 0 && errno == ENOENT;
}

// Whether rights alone keep the user out of the state, or from making it.
bool IsKeptOut(const std::string& root) {
  struct stat status = {};
  std::string existing = root;
  while (stat(existing.c_str(), &status) != 0) {
    if (errno != ENOENT || existing == "/") {
      return errno == EACCES;
    }
    SplitLast(existing);
  }
  return S_ISDIR(status.st_mode) &&
         faccessat(AT_FDCWD, existing.c_str(), R_OK | W_OK | X_OK, AT_EACCESS) != 0 &&
         errno == EACCES;
}

void DropSlashes(std::string& path) {
  while (path.size() > 1 && path.back() == '/') {
    path.pop_back();
  }
}

// Appends by letters: there is nothing on disk that ".." could mean anything else for.
void AppendComponent(std::string& path, const std::string& name) {
  if (name == "..") {
    SplitLast(path);
  } else if (!name.empty() && name != ".") {
    path = Join(path, name);
  }
}

bool RefuseEmpty() {
  (void)Fail(EXIT_FAILED, "an empty path names nothing");
  return false;
}

bool MakeAbsolute(const std::string& given, std::string& path) {
  if (given.empty()) {
    return RefuseEmpty();
  }
  if (given.front() == '/') {
    path = given;
    return true;
  }

  std::error_code error;
  const std::string current = std::filesystem::current_path(error).string();
  if (error) {
    (void)Fail(EXIT_FAILED, "%s: the current folder: %s", given.c_str(), error.message().c_str());
    return false;
  }

  path = Join(current, given);
  return true;
}

}  // namespace

bool Session::Open() {
  std::string error;
  store = StateStore::Open(error);
  if (!store && IsKeptOut(StateRoot())) {
    (void)Fail(EXIT_FAILED, "cannot read the state folder %s: root is needed", StateRoot().c_str());
    return false;
  }
  if (!store) {
    (void)Fail(EXIT_FAILED, "%s", error.c_str());
    return false;
  }

  if (!store->GetSettings(settings)) {
    (void)Fail(EXIT_FAILED, "%s", store->Error().c_str());
    return false;
  }

  return true;
}

bool Session::OpenToAsk() {
  const std::string database = StateDatabasePath();
  if (IsAbsent(database) && IsAbsent(database + ".copy") && !IsKeptOut(StateRoot())) {
    settings = std::make_shared<const Settings>();
    return true;
  }
  return Open();
}

const Share* Session::FindShare(const std::string& name) const {
  const Share* share = settings->ShareByName(name);
  if (share == nullptr) {
    (void)Fail(EXIT_FAILED, "%s: no such share", name.c_str());
  }
  return share;
}

bool ResolvePath(const std::string& given, std::string& path) {
  std::string rest;
  if (!MakeAbsolute(given, rest)) {
    return false;
  }

  // From the end, until what is left can be resolved. The last component stays as it is, unless
  // its form says that it is a directory.
  std::vector<std::string> unresolved;
  const bool is_directory = rest.back() == '/';
  DropSlashes(rest);
  const std::string last = rest.substr(rest.rfind('/') + 1);
  if (!is_directory && last != "." && last != ".." && rest != "/") {
    unresolved.push_back(SplitLast(rest));
    DropSlashes(rest);
  }
  std::optional<std::string> resolved = RealPath(rest);
  while (!resolved) {
    if ((errno != ENOENT && errno != ENOTDIR) || rest == "/") {
      (void)Fail(EXIT_FAILED, "%s: %s", given.c_str(), strerror(errno));
      return false;
    }

    unresolved.push_back(SplitLast(rest));
    DropSlashes(rest);
    resolved = RealPath(rest);
  }

  for (auto name = unresolved.rbegin(); name != unresolved.rend(); ++name) {
    AppendComponent(*resolved, *name);
  }
  path = *resolved;
  return true;
}

bool ResolveInShare(const Settings& settings, const std::string& given, std::string& path) {
  std::string plain;
  if (!ResolvePath(given, plain)) {
    return false;
  }
  if (settings.ShareOfPath(plain) != nullptr) {
    path = plain;
    return true;
  }

  const std::optional<std::string> target = RealPath(plain);
  if (target && settings.ShareOfPath(*target) != nullptr) {
    path = *target;
    return true;
  }

  (void)Fail(EXIT_FAILED, "%s: lies in no share", plain.c_str());
  return false;
}

bool ResolveDirectory(const std::string& given, std::string& path) {
  if (given.empty()) {
    return RefuseEmpty();
  }

  const std::optional<std::string> resolved = RealPath(given);
  struct stat status = {};
  if (!resolved || stat(resolved->c_str(), &status) != 0) {
    (void)Fail(EXIT_FAILED, "%s: %s", given.c_str(), strerror(errno));
    return false;
  }
  if (!S_ISDIR(status.st_mode)) {
    (void)Fail(EXIT_FAILED, "%s: not a directory", given.c_str());
    return false;
  }

  path = *resolved;
  return true;
}

bool IsDirectoryGone(const std::string& path) {
  struct stat status = {};
  if (lstat(path.c_str(), &status) != 0) {
    return errno == ENOENT || errno == ENOTDIR;
  }

  return !S_ISDIR(status.st_mode);
}

}  // namespace fileindexd
