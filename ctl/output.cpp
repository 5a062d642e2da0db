// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/output.h"

#include <json/writer.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <memory>
#include <sstream>

#include "base/standard_streams.h"
#include "base/utf8.h"
#include "ctl/terminal/cells.h"

namespace fileindexd {

namespace {

constexpr size_t OUTPUT_BUFFER = 256 * 1024;

int output_error = 0;  // errno of the first write that failed; 0 while all is well
bool progress_shown = false;

void EraseProgress() {
  if (progress_shown) {
    (void)fprintf(stderr, "\r\033[K");  // to the line's start, and erase it
    progress_shown = false;
  }
}

std::string Hex(std::string_view bytes) {
  constexpr char DIGITS[] = "0123456789abcdef";
  std::string hex;
  hex.reserve(bytes.size() * 2);
  for (const char byte : bytes) {
    const auto value = static_cast<unsigned char>(byte);
    hex += DIGITS[value >> 4];
    hex += DIGITS[value & 0xf];
  }
  return hex;
}

bool IsTerminal() {
  static const bool is_terminal = isatty(STDOUT_FILENO) == 1;
  return is_terminal;
}

void Remember() {
  if (output_error == 0) {
    output_error = errno != 0 ? errno : EIO;
  }
}

}  // namespace

void PrepareStreams() {
  FillStandardStreams();
  (void)signal(SIGPIPE, SIG_IGN);
  (void)setvbuf(stdout, nullptr, _IOFBF, OUTPUT_BUFFER);
}

int Fail(int code, const char* format, ...) {
  va_list arguments;
  va_start(arguments, format);
  char* text = nullptr;
  const int length = vasprintf(&text, format, arguments);
  va_end(arguments);

  const std::string line = length < 0                   ? "out of memory"
                           : isatty(STDERR_FILENO) == 1 ? Printable(text)
                                                        : OneLine(text);
  if (length >= 0) {
    free(text);
  }

  EraseProgress();
  (void)fprintf(stderr, "fileindexctl: %s\n", line.c_str());  // nowhere left to tell of a failure
  return code;
}

int FailAll(const std::vector<std::string>& failures) {
  std::string text;
  for (const std::string& failure : failures) {
    text.append(text.empty() ? "" : "; ").append(failure);
  }
  return failures.empty() ? EXIT_DONE : Fail(EXIT_FAILED, "%s", text.c_str());
}

bool Put(std::string_view bytes) {
  if (output_error != 0) {
    return false;
  }

  EraseProgress();
  errno = 0;
  if (fwrite(bytes.data(), 1, bytes.size(), stdout) != bytes.size()) {
    Remember();
    return false;
  }

  return true;
}

bool PutLine(std::string_view bytes, char end) {
  return Put(bytes) && Put({&end, 1});
}

bool PutJson(const Json::Value& value) {
  return Put(JsonLine(value));
}

int FinishOutput(int code) {
  errno = 0;
  if (fflush(stdout) != 0) {
    Remember();
  }
  if (output_error == 0 || output_error == EPIPE) {
    return code;
  }

  (void)Fail(EXIT_FAILED, "standard output: %s", strerror(output_error));
  return code == EXIT_DONE ? EXIT_FAILED : code;
}

void SetPath(Json::Value& object, const std::string& path, const std::string& key) {
  object[key] = ToUtf8(path);
  if (!IsUtf8(path)) {
    object[key + "_hex"] = Hex(path);
  }
}

void SetTexts(Json::Value& object, const std::vector<std::string>& texts, const std::string& key) {
  Json::Value shown(Json::arrayValue);
  Json::Value hex(Json::arrayValue);
  for (const std::string& text : texts) {
    shown.append(ToUtf8(text));
    hex.append(Hex(text));
  }
  object[key] = shown;
  if (!std::all_of(texts.begin(), texts.end(), IsUtf8)) {
    object[key + "_hex"] = hex;
  }
}

std::string ToText(const Json::Value& value) {
  // A writer made anew for each line costs more than the line.
  static const std::unique_ptr<Json::StreamWriter> writer([] {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    builder["emitUTF8"] = true;
    return builder.newStreamWriter();
  }());

  std::ostringstream text;
  writer->write(value, &text);
  return text.str();
}

std::string JsonLine(const Json::Value& value) {
  return (IsTerminal() ? EscapedJson(ToText(value)) : ToText(value)) + "\n";
}

std::string TimeOf(int64_t seconds, std::tm* (*split)(const time_t*, std::tm*)) {
  const time_t time = static_cast<time_t>(seconds);
  std::tm parts = {};
  char text[64];
  if (split(&time, &parts) == nullptr ||
      strftime(text, sizeof(text), "%Y-%m-%d %H:%M:%S", &parts) == 0) {
    return std::to_string(seconds);
  }

  return text;
}

std::string LocalTime(int64_t seconds) {
  return TimeOf(seconds, localtime_r);
}

int64_t WholeSeconds(int64_t nanoseconds) {
  constexpr int64_t SECOND = 1000000000;
  return nanoseconds / SECOND - (nanoseconds % SECOND < 0 ? 1 : 0);
}

std::string OneLine(std::string_view text) {
  std::string line;
  for (const char byte : text) {
    const auto value = static_cast<unsigned char>(byte);
    if (value >= 0x20 && value != 0x7f) {
      line += byte;
      continue;
    }

    char shown[8];
    (void)snprintf(shown, sizeof(shown), "\\x%02x", value);
    line += shown;
  }
  return line;
}

std::string Printable(std::string_view text) {
  return ShowCells(CellsOf(text), false);
}

std::string ShownName(std::string_view name) {
  return IsTerminal() ? Printable(name) : std::string(name);
}

std::string ShownText(std::string_view text) {
  return IsTerminal() ? Printable(text) : OneLine(text);
}

Progress::Progress(const std::string& text) {
  progress_shown = isatty(STDERR_FILENO) == 1;
  if (progress_shown) {
    (void)fprintf(stderr, "\r%s", Printable(text).c_str());
  }
}

Progress::~Progress() {
  EraseProgress();
}

}  // namespace fileindexd
