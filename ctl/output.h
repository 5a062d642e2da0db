// SPDX-License-Identifier: GPL-2.0-or-later
// What fileindexctl writes: results to standard output, through a big buffer; errors to standard
// error, one line each. One thread.
#pragma once

#include <json/value.h>

#include <cstdint>
#include <ctime>
#include <string>
#include <string_view>
#include <vector>

namespace fileindexd {

constexpr int EXIT_DONE = 0;
constexpr int EXIT_FAILED = 1;
constexpr int EXIT_USAGE = 2;
constexpr int EXIT_NO_DAEMON = 3;

// Once, before anything is opened or written: the three standard descriptors exist, so that no
// database is opened under the number of standard output; a closed pipe comes as an error.
void PrepareStreams();

// Writes the line "fileindexctl: …" and returns `code`. The text is Printable on a terminal,
// OneLine elsewhere, so that a file's name cannot break the line.
[[gnu::format(printf, 2, 3)]] int Fail(int code, const char* format, ...);

// The same with one line for all of them. EXIT_FAILED, or EXIT_DONE where there are none.
int FailAll(const std::vector<std::string>& failures);

// Each is false once writing has failed: the caller may stop then. FinishOutput tells of it.
bool Put(std::string_view bytes);
bool PutLine(std::string_view bytes, char end = '\n');
bool PutJson(const Json::Value& value);  // a JsonLine

// Writes out what is buffered. `code`, or EXIT_FAILED with its line when anything could not be
// written. A reader that went away has all that it wanted: that is no failure.
int FinishOutput(int code);

// Sets `key` to the path; when it is not UTF-8, its bad bytes are replaced and `key`_hex holds all
// bytes in lower-case hexadecimal digits.
void SetPath(Json::Value& object, const std::string& path, const std::string& key = "path");

// The same for a list: `key`_hex holds all texts in digits when any of them is not UTF-8.
void SetTexts(Json::Value& object, const std::vector<std::string>& texts, const std::string& key);

// Compact JSON text. Bytes that are not UTF-8 stay as they are.
std::string ToText(const Json::Value& value);

// The same with its line end, for standard output: on a terminal what that would act on is escaped,
// so that it reads as the same value.
std::string JsonLine(const Json::Value& value);

// "2031-01-31 08:15:00", local.
std::string LocalTime(int64_t seconds);
// The same with localtime_r or gmtime_r.
std::string TimeOf(int64_t seconds, std::tm* (*split)(const time_t*, std::tm*));

// The whole seconds of a time in nanoseconds, rounded down.
int64_t WholeSeconds(int64_t nanoseconds);

// The text with its control characters shown as "\xNN"; all else byte for byte.
std::string OneLine(std::string_view text);

// The text with all that a terminal would act on, or cannot show, in digits (terminal/cells.h).
std::string Printable(std::string_view text);

// For standard output: Printable on a terminal. Elsewhere a name is what its bytes are, a text is
// OneLine.
std::string ShownName(std::string_view name);
std::string ShownText(std::string_view text);

// A word about long work, on standard error if that is a terminal. Gone when anything else is
// written, or it is destroyed. One at a time.
class Progress {
 public:
  explicit Progress(const std::string& text);
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;
  ~Progress();
};

}  // namespace fileindexd
