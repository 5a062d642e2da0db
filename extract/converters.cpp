// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/converters.h"

#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>

#include "extract/error_text.h"
#include "extract/run_time_files.h"

namespace fileindexd {

namespace {

const std::array<Converter, 2>& Converters() {
  // UTF-8 as the charset of what comes out; lines as long as their paragraphs.
  static const std::array<Converter, 2> converters = {{
      {"catdoc", {"-w", "-dutf-8"}, "converted.txt"},
      // As plain text it writes a mixture of charsets; pictures would be files.
      {"unrtf", {"--nopict", "--html"}, "converted.html"},
  }};
  return converters;
}

}  // namespace

const Converter* FindConverter(std::string_view name) {
  const auto& all = Converters();
  const auto* found = std::find_if(all.begin(), all.end(), [name](const Converter& converter) {
    return name == converter.name;
  });
  return found == all.end() ? nullptr : found;
}

void BecomeConverter(const Converter& converter, std::string& error) {
  std::vector<char*> arguments = {const_cast<char*>(converter.name)};  // NOLINT: execve's type
  for (const char* argument : converter.arguments) {
    arguments.push_back(const_cast<char*>(argument));  // NOLINT: execve's type
  }
  arguments.push_back(nullptr);
  const std::string program = FindProgramFile(converter.name);
  (void)execve(program.c_str(), arguments.data(), environ);
  (void)Failed(converter.name, error);
}

}  // namespace fileindexd
