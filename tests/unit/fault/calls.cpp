// SPDX-License-Identifier: GPL-2.0-or-later
// Definitions that the program's libraries, SQLite among them, meet in place of the C library's and
// of SQLite's own: each asks the plan, and calls the one that it hides.
#include <dlfcn.h>
#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <map>
#include <mutex>
#include <string>
#include <string_view>

#include "unit/fault/plan.h"

namespace fileindexd::fault {

namespace {

std::mutex log_mutex;
std::string& LogText() {
  static std::string& text = *new std::string;
  return text;
}

thread_local bool inside_exec = false;
std::mutex failed_mutex;
std::map<sqlite3_stmt*, int>& FailedSteps() {
  static std::map<sqlite3_stmt*, int>& steps = *new std::map<sqlite3_stmt*, int>;
  return steps;
}

int TakeFailedStep(sqlite3_stmt* statement) {
  const std::lock_guard guard(failed_mutex);
  const auto found = FailedSteps().find(statement);
  if (found == FailedSteps().end()) {
    return 0;
  }
  const int code = found->second;
  FailedSteps().erase(found);
  return code;
}

template <typename Function>
Function* Hidden(const char* name) {
  return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

Target TargetOfStatement(sqlite3* db) {
  const char* file = sqlite3_db_filename(db, "main");
  return TargetOf(file != nullptr ? file : "");
}

// True when the call is to fail; errno is set then.
bool StrikesFile(Call call, std::string_view path) {
  const char* root = getenv("FILEINDEXD_STATE_DIR");  // NOLINT(concurrency-mt-unsafe): never set
  if (root == nullptr || !path.starts_with(root) || path.find("/TALO@") != path.npos) {
    return false;
  }
  const int code = Strike(call, TargetOf(std::string(path)));
  if (code != 0) {
    errno = code;
  }
  return code != 0;
}

// Takes no memory for what is none of the state's files: a child just forked, which tells its
// parent by a pipe, would await a lock that another thread of the parent held.
bool StrikesDescriptor(Call call, int fd) {
  char link[32];
  snprintf(link, sizeof link, "/proc/self/fd/%d", fd);
  char path[4096];
  const ssize_t length = readlink(link, path, sizeof path);
  return length > 0 && StrikesFile(call, {path, static_cast<size_t>(length)});
}

void Log(const char* format, va_list arguments) {
  char line[4096];
  vsnprintf(line, sizeof line, format, arguments);
  const std::lock_guard guard(log_mutex);
  LogText().append(line).append("\n");
  // Beside the state, for whoever finds this process hanging.
  const int file = open("log", O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600);
  dprintf(file, "%s\n", line);
  close(file);
}

}  // namespace

std::string Logged() {
  const std::lock_guard guard(log_mutex);
  return LogText();
}

}  // namespace fileindexd::fault

using fileindexd::fault::Call;

extern "C" {

int sqlite3_step(sqlite3_stmt* statement) {
  static auto* const hidden = fileindexd::fault::Hidden<int(sqlite3_stmt*)>("sqlite3_step");
  const int code = fileindexd::fault::inside_exec
                       ? 0
                       : fileindexd::fault::Strike(
                             Call::STATEMENT,
                             fileindexd::fault::TargetOfStatement(sqlite3_db_handle(statement)));
  if (code == 0) {
    return hidden(statement);
  }
  const std::lock_guard guard(fileindexd::fault::failed_mutex);
  fileindexd::fault::FailedSteps()[statement] = code;
  return code;
}

// Fails as a whole: it does not ask its statements for their failures in a way that is seen here.
int sqlite3_exec(sqlite3* db, const char* sql, int (*row)(void*, int, char**, char**),
                 void* argument, char** message) {
  static auto* const hidden = fileindexd::fault::Hidden<int(
      sqlite3*, const char*, int (*)(void*, int, char**, char**), void*, char**)>("sqlite3_exec");
  const bool nested = fileindexd::fault::inside_exec;
  const int failed =
      nested ? 0
             : fileindexd::fault::Strike(Call::STATEMENT, fileindexd::fault::TargetOfStatement(db));
  if (failed != 0) {
    return failed;
  }
  fileindexd::fault::inside_exec = true;
  const int code = hidden(db, sql, row, argument, message);
  fileindexd::fault::inside_exec = nested;
  return code;
}

// Gives the failure of the step once more: SQLite's own modules look only here.
int sqlite3_reset(sqlite3_stmt* statement) {
  static auto* const hidden = fileindexd::fault::Hidden<int(sqlite3_stmt*)>("sqlite3_reset");
  const int code = hidden(statement);
  const int failed = fileindexd::fault::TakeFailedStep(statement);
  return failed != 0 ? failed : code;
}

int sqlite3_finalize(sqlite3_stmt* statement) {
  static auto* const hidden = fileindexd::fault::Hidden<int(sqlite3_stmt*)>("sqlite3_finalize");
  const int failed = fileindexd::fault::TakeFailedStep(statement);
  const int code = hidden(statement);
  return failed != 0 ? failed : code;
}

int sqlite3_prepare_v3(sqlite3* db, const char* sql, int size, unsigned flags,
                       sqlite3_stmt** statement, const char** tail) {
  static auto* const hidden = fileindexd::fault::Hidden<int(
      sqlite3*, const char*, int, unsigned, sqlite3_stmt**, const char**)>("sqlite3_prepare_v3");
  const int code =
      fileindexd::fault::Strike(Call::PREPARE, fileindexd::fault::TargetOfStatement(db));
  if (code != 0) {
    *statement = nullptr;
    return code;
  }
  return hidden(db, sql, size, flags, statement, tail);
}

int open64(const char* path, int flags, ...) {
  static auto* const hidden = fileindexd::fault::Hidden<int(const char*, int, ...)>("open64");
  mode_t mode = 0;
  if ((flags & (O_CREAT | O_TMPFILE)) != 0) {
    va_list arguments;
    va_start(arguments, flags);
    mode = va_arg(arguments, mode_t);
    va_end(arguments);
  }
  return fileindexd::fault::StrikesFile(Call::FILE_OPEN, path) ? -1 : hidden(path, flags, mode);
}

ssize_t read(int fd, void* buffer, size_t size) {
  static auto* const hidden = fileindexd::fault::Hidden<ssize_t(int, void*, size_t)>("read");
  return fileindexd::fault::StrikesDescriptor(Call::FILE_READ, fd) ? -1 : hidden(fd, buffer, size);
}

ssize_t write(int fd, const void* buffer, size_t size) {
  static auto* const hidden = fileindexd::fault::Hidden<ssize_t(int, const void*, size_t)>("write");
  return fileindexd::fault::StrikesDescriptor(Call::FILE_WRITE, fd) ? -1 : hidden(fd, buffer, size);
}

ssize_t pwrite64(int fd, const void* buffer, size_t size, off64_t at) {
  static auto* const hidden =
      fileindexd::fault::Hidden<ssize_t(int, const void*, size_t, off64_t)>("pwrite64");
  return fileindexd::fault::StrikesDescriptor(Call::FILE_WRITE, fd) ? -1
                                                                    : hidden(fd, buffer, size, at);
}

int fsync(int fd) {
  static auto* const hidden = fileindexd::fault::Hidden<int(int)>("fsync");
  return fileindexd::fault::StrikesDescriptor(Call::FILE_SYNC, fd) ? -1 : hidden(fd);
}

int fdatasync(int fd) {
  static auto* const hidden = fileindexd::fault::Hidden<int(int)>("fdatasync");
  return fileindexd::fault::StrikesDescriptor(Call::FILE_SYNC, fd) ? -1 : hidden(fd);
}

int rename(const char* from, const char* to) {
  static auto* const hidden = fileindexd::fault::Hidden<int(const char*, const char*)>("rename");
  return fileindexd::fault::StrikesFile(Call::FILE_RENAME, from) ? -1 : hidden(from, to);
}

int unlink(const char* path) {
  static auto* const hidden = fileindexd::fault::Hidden<int(const char*)>("unlink");
  return fileindexd::fault::StrikesFile(Call::FILE_REMOVE, path) ? -1 : hidden(path);
}

int remove(const char* path) {
  static auto* const hidden = fileindexd::fault::Hidden<int(const char*)>("remove");
  return fileindexd::fault::StrikesFile(Call::FILE_REMOVE, path) ? -1 : hidden(path);
}

// What is removed with all that is in it: the folder tells whose it is.
int unlinkat(int folder, const char* path, int flags) {
  static auto* const hidden = fileindexd::fault::Hidden<int(int, const char*, int)>("unlinkat");
  const bool strikes = path[0] == '/'
                           ? fileindexd::fault::StrikesFile(Call::FILE_REMOVE, path)
                           : fileindexd::fault::StrikesDescriptor(Call::FILE_REMOVE, folder);
  return strikes ? -1 : hidden(folder, path, flags);
}

int fchmod(int fd, mode_t mode) {
  static auto* const hidden = fileindexd::fault::Hidden<int(int, mode_t)>("fchmod");
  return fileindexd::fault::StrikesDescriptor(Call::FILE_MODE, fd) ? -1 : hidden(fd, mode);
}

int chmod(const char* path, mode_t mode) {
  static auto* const hidden = fileindexd::fault::Hidden<int(const char*, mode_t)>("chmod");
  return fileindexd::fault::StrikesFile(Call::FILE_MODE, path) ? -1 : hidden(path, mode);
}

int mkdir(const char* path, mode_t mode) {
  static auto* const hidden = fileindexd::fault::Hidden<int(const char*, mode_t)>("mkdir");
  return fileindexd::fault::StrikesFile(Call::FOLDER_MAKE, path) ? -1 : hidden(path, mode);
}

// The fortified names too: which of the two is called depends on the build.
void vsyslog(int /*priority*/, const char* format, va_list arguments) {
  fileindexd::fault::Log(format, arguments);
}

void __vsyslog_chk(int /*priority*/, int /*flag*/, const char* format, va_list arguments) {
  fileindexd::fault::Log(format, arguments);
}

void syslog(int /*priority*/, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  fileindexd::fault::Log(format, arguments);
  va_end(arguments);
}

void __syslog_chk(int /*priority*/, int /*flag*/, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  fileindexd::fault::Log(format, arguments);
  va_end(arguments);
}
}
