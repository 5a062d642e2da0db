// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/layout.h"

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>

namespace fileindexd {

namespace {

constexpr const char* DEFAULT_ROOT = "/var/lib/fileindexd";
constexpr const char* ROOT_VARIABLE = "FILEINDEXD_STATE_DIR";
constexpr const char* NOWHERE = "/dev/null";  // no folder, so nothing is found or made below it
constexpr size_t MAX_SHARE_NAME = 64;         // bytes

// As it is given; empty: nothing is.
std::string WantedRoot() {
  const char* wanted = getenv(ROOT_VARIABLE);  // NOLINT: nothing here calls setenv
  return wanted == nullptr ? "" : wanted;
}

// The umask may be anything: it cannot add bits to 0700, and what it took away is put back.
bool MakeFolder(const std::string& path, std::string& error) {
  if (mkdir(path.c_str(), 0700) == 0) {
    if (chmod(path.c_str(), 0700) != 0) {
      error = "cannot set the mode of " + path + ": " + strerror(errno);  // NOLINT: glibc's is safe
      return false;
    }
    return true;
  }
  const int reason = errno;

  struct stat st {};
  if (reason == EEXIST && stat(path.c_str(), &st) == 0 && S_ISDIR(st.st_mode)) {
    return true;
  }
  error = "cannot create " + path + ": " + strerror(reason);  // NOLINT: glibc's is safe
  return false;
}

bool MakeFolderAndParents(const std::string& path, std::string& error) {
  for (size_t slash = path.find('/', 1); slash != std::string::npos;
       slash = path.find('/', slash + 1)) {
    if (!MakeFolder(path.substr(0, slash), error)) {
      return false;
    }
  }
  return MakeFolder(path, error);
}

// Whether an absolute path is as NormalPath gives it, as nearly all are. Not of "/".
bool IsNormal(std::string_view path) {
  for (size_t slash = 0; slash < path.size();) {
    const size_t end = std::min(path.find('/', slash + 1), path.size());
    const std::string_view component = path.substr(slash + 1, end - slash - 1);
    if (component.empty() || component == "." || component == "..") {
      return false;
    }
    slash = end;
  }
  return true;
}

}  // namespace

std::string StateRoot() {
  const std::string wanted = WantedRoot();
  if (wanted.empty()) {
    return DEFAULT_ROOT;
  }
  return wanted.front() == '/' ? NormalPath(wanted).value_or(wanted) : NOWHERE;
}

std::string StateDatabasePath() {
  return StateRoot() + "/state.db";
}

std::string SharesFolder() {
  return StateRoot() + "/shares";
}

std::string ShareFolder(const std::string& share_name) {
  return SharesFolder() + "/" + share_name;
}

std::string QueuePath(const std::string& share_name) {
  return ShareFolder(share_name) + "/" + QUEUE_NAME;
}

std::string DrainedPath(const std::string& share_name) {
  return QueuePath(share_name) + ".tmp";
}

std::string IndexPath(const std::string& share_name) {
  return ShareFolder(share_name) + "/index";
}

std::string ContentsPath(const std::string& share_name) {
  return ShareFolder(share_name) + "/contents";
}

std::string DamagedIndexPath(const std::string& share_name) {
  return ShareFolder(share_name) + "/index.damaged";
}

std::string DamagedContentsPath(const std::string& share_name) {
  return ShareFolder(share_name) + "/contents.damaged";
}

bool MakeStateRoot(std::string& error) {
  // Whatever else it could be taken for would be the wrong one: what was meant is not known.
  const std::string wanted = WantedRoot();
  if (!wanted.empty() && wanted.front() != '/') {
    error = std::string(ROOT_VARIABLE) + " is not an absolute path: " + wanted;
    return false;
  }
  const std::string root = StateRoot();
  return MakeFolderAndParents(root, error) && MakeFolder(SharesFolder(), error);
}

bool MakeShareFolder(const std::string& share_name, std::string& error) {
  if (!IsValidShareName(share_name)) {
    error = "not a valid share name: " + share_name;
    return false;
  }
  // The usual case costs one call.
  const std::string folder = ShareFolder(share_name);
  struct stat st {};
  if (stat(folder.c_str(), &st) == 0 && S_ISDIR(st.st_mode)) {
    return true;
  }
  return MakeStateRoot(error) && MakeFolder(folder, error);
}

bool IsValidShareName(std::string_view name) {
  if (name.empty() || name.size() > MAX_SHARE_NAME || name.front() == '.') {
    return false;
  }
  return std::none_of(name.begin(), name.end(), [](char c) {
    return c == '/' || static_cast<unsigned char>(c) < 0x20 || c == 0x7f;
  });
}

bool CanNameNewShare(std::string_view name) {
  constexpr char LEAD = '\xc2';  // of U+0080 to U+00BF
  for (size_t at = name.find(LEAD); at < name.size(); at = name.find(LEAD, at + 1)) {
    if (at + 1 < name.size() && static_cast<unsigned char>(name[at + 1]) < 0xa0) {
      return false;
    }
  }
  return IsValidShareName(name);
}

std::optional<std::string> NormalPath(std::string_view path) {
  if (path.empty() || path.front() != '/' || path.find('\0') != std::string_view::npos) {
    return std::nullopt;
  }
  if (IsNormal(path)) {
    return std::string(path);
  }
  std::string normal;
  normal.reserve(path.size());
  for (size_t at = 0; at < path.size();) {
    const size_t begin = path.find_first_not_of('/', at);
    if (begin == std::string_view::npos) {
      break;
    }
    const size_t end = std::min(path.find('/', begin), path.size());
    const std::string_view component = path.substr(begin, end - begin);
    if (component == "." || component == "..") {
      return std::nullopt;
    }
    normal += '/';
    normal += component;
    at = end;
  }
  return normal.empty() ? "/" : normal;
}

bool Covers(std::string_view parent, std::string_view path) {
  if (parent == "/") {
    return path.starts_with('/');
  }
  return path.starts_with(parent) && (path.size() == parent.size() || path[parent.size()] == '/');
}

}  // namespace fileindexd
