// SPDX-License-Identifier: GPL-2.0-or-later
// fileindexctl: management of the index, and search.
#include <exception>
#include <string>
#include <vector>

#include "ctl/command_line.h"
#include "ctl/output.h"

using fileindexd::EXIT_DONE;
using fileindexd::EXIT_FAILED;

int main(int argc, char** argv) {
  fileindexd::PrepareStreams();

  int code = EXIT_DONE;
  try {
    fileindexd::Arguments arguments;
    const std::vector<std::string> given(argv + (argc > 0 ? 1 : 0), argv + argc);
    const fileindexd::Command command = fileindexd::ParseCommandLine(given, arguments, code);
    if (command != nullptr) {
      code = command(arguments);
    }
  } catch (const std::exception& error) {  // of the libraries: no memory, a value out of range
    code = fileindexd::Fail(EXIT_FAILED, "%s", error.what());
  }
  return fileindexd::FinishOutput(code);
}
