// SPDX-License-Identifier: GPL-2.0-or-later
#include "state/progress.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <charconv>
#include <ctime>
#include <string_view>

#include "base/scoped_fd.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

constexpr size_t LINE_SIZE = 256;
constexpr int64_t WRITE_INTERVAL_MS = 1000;
constexpr std::array WORKS = {Work::FIRST_INDEX, Work::REINDEX, Work::UPDATE, Work::COMPARISON};

int64_t Milliseconds(clockid_t clock) {
  timespec now = {};
  (void)clock_gettime(clock, &now);  // cannot fail for these clocks
  return static_cast<int64_t>(now.tv_sec) * 1000 + now.tv_nsec / 1'000'000;
}

// Reads the text from its front; once something is not as expected, nothing is.
struct Scanner {
  bool Literal(std::string_view expected) {
    good = good && rest.starts_with(expected);
    rest.remove_prefix(good ? expected.size() : 0);
    return good;
  }
  template <typename Number>
  bool Value(Number& number) {
    const auto result = std::from_chars(rest.data(), rest.data() + rest.size(), number);
    good = good && result.ec == std::errc();
    rest.remove_prefix(good ? static_cast<size_t>(result.ptr - rest.data()) : 0);
    return good;
  }

  std::string_view rest;
  bool good = true;
};

std::string ReadText(const std::string& path, size_t size) {
  const ScopedFd file(open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOFOLLOW));
  std::string text(size, '\0');
  const ssize_t length = file.fd < 0 ? -1 : read(file.fd, text.data(), size);
  text.resize(length > 0 ? static_cast<size_t>(length) : 0);
  return text;
}

// When the process was started, in the kernel's ticks since boot. 0: it does not live.
uint64_t StartTime(int64_t pid) {
  constexpr size_t STATE = 1;  // counted from the name's end, which may hold anything
  constexpr size_t START = 20;
  constexpr size_t STAT_SIZE = 4096;
  const std::string text = ReadText("/proc/" + std::to_string(pid) + "/stat", STAT_SIZE);
  size_t at = text.rfind(')');
  for (size_t field = STATE; at != std::string::npos; ++field) {
    at = text.find(' ', at);
    if (at == std::string::npos) {
      break;
    }
    ++at;
    if (field == STATE && (text[at] == 'Z' || text[at] == 'X')) {
      break;
    }
    if (field == START) {
      uint64_t ticks = 0;
      Scanner scanner{std::string_view(text).substr(at)};
      return scanner.Value(ticks) ? ticks : 0;
    }
  }
  return 0;
}

std::string Line(const ProgressRecord& record) {
  std::string line = std::string("{\"what\":\"") + WorkText(record.what) + "\"";
  line += ",\"done\":" + std::to_string(record.done);
  line += ",\"total\":" + (record.total ? std::to_string(*record.total) : "null");
  line += ",\"began\":" + std::to_string(record.began);
  line += ",\"updated\":" + std::to_string(record.updated);
  line += ",\"pid\":" + std::to_string(getpid());
  line += ",\"start\":" + std::to_string(StartTime(getpid())) + "}";
  line.resize(LINE_SIZE - 1, ' ');
  line += '\n';
  return line;
}

bool Parse(const std::string& line, ProgressRecord& record, int64_t& pid, uint64_t& start) {
  Scanner scanner{line};
  scanner.Literal("{\"what\":\"");
  bool known = false;
  for (const Work work : WORKS) {
    if (!known && scanner.rest.starts_with(WorkText(work))) {
      record.what = work;
      known = scanner.Literal(WorkText(work));
    }
  }
  scanner.Literal("\",\"done\":");
  scanner.Value(record.done);
  scanner.Literal(",\"total\":");
  record.total.reset();
  if (scanner.rest.starts_with("null")) {
    scanner.Literal("null");
  } else {
    scanner.Value(record.total.emplace());
  }
  scanner.Literal(",\"began\":");
  scanner.Value(record.began);
  scanner.Literal(",\"updated\":");
  scanner.Value(record.updated);
  scanner.Literal(",\"pid\":");
  scanner.Value(pid);
  scanner.Literal(",\"start\":");
  scanner.Value(start);
  scanner.Literal("}");
  return known && scanner.good && scanner.rest.find_first_not_of(' ') == scanner.rest.size() - 1 &&
         line.size() == LINE_SIZE && line.back() == '\n';
}

}  // namespace

const char* WorkText(Work work) {
  switch (work) {
    case Work::FIRST_INDEX:
      return "first index";
    case Work::REINDEX:
      return "reindex";
    case Work::UPDATE:
      return "update";
    case Work::COMPARISON:
      return "comparison";
  }
  return "";
}

std::string WorkerProgressPath(const std::string& share_name) {
  return ShareFolder(share_name) + "/progress";
}

std::string ComparisonProgressPath(const std::string& share_name) {
  return ShareFolder(share_name) + "/comparison";
}

void ProgressWriter::Begin(Work what, std::optional<uint64_t> total) {
  End();
  record.what = what;
  record.total = total;
  record.began = Milliseconds(CLOCK_REALTIME);
  next_write = Milliseconds(CLOCK_MONOTONIC_COARSE) + WRITE_INTERVAL_MS;
}

bool ProgressWriter::IsDue() {
  not_looked = 0;
  return IsRunning() && Milliseconds(CLOCK_MONOTONIC_COARSE) >= next_write;
}

// False when a living process has the file. What a dead one left goes.
bool ProgressWriter::Claim() {
  if (!claimed) {
    ProgressRecord other;
    claimed = !ReadProgress(path, other) && (unlink(path.c_str()) == 0 || errno == ENOENT);
  }
  return claimed;
}

void ProgressWriter::Write() {
  if (!IsRunning()) {
    return;
  }
  next_write = Milliseconds(CLOCK_MONOTONIC_COARSE) + WRITE_INTERVAL_MS;
  if (!Claim()) {
    return;
  }
  // Opened for each line: a Worker's thread may end with nothing to close.
  const ScopedFd file(open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK,
                           S_IRUSR | S_IWUSR));
  record.updated = Milliseconds(CLOCK_REALTIME);
  const std::string line = Line(record);
  const ssize_t ignored = file.fd < 0 ? -1 : pwrite(file.fd, line.data(), line.size(), 0);
  (void)ignored;  // a reader finds the line torn, or an old one
}

void ProgressWriter::End() {
  ProgressRecord written;
  int64_t pid = 0;
  uint64_t start = 0;
  if (claimed && Parse(ReadText(path, LINE_SIZE + 1), written, pid, start) && pid == getpid()) {
    (void)unlink(path.c_str());
  }
  claimed = false;
  not_looked = 0;
  record = {};
}

bool ReadProgress(const std::string& path, ProgressRecord& record) {
  ProgressRecord found;
  int64_t pid = 0;
  uint64_t start = 0;
  if (!Parse(ReadText(path, LINE_SIZE + 1), found, pid, start) || pid <= 0 || start == 0 ||
      StartTime(pid) != start) {
    return false;
  }
  record = found;
  return true;
}

}  // namespace fileindexd
