// SPDX-License-Identifier: GPL-2.0-or-later
// Declares commands on one line of arguments: names, values, help.
#pragma once

#include <CLI/CLI.hpp>
#include <optional>
#include <string>

#include "ctl/commands.h"

namespace fileindexd {

// All commands share the record that is filled. Lives as long as its `app`.
struct Declarer {
  explicit Declarer(Arguments& into);

  CLI::App* Group(const char* name, const char* help);
  // `example`: what stands behind the program's name in the line that ends the command's help, as a
  // shell takes it.
  CLI::App* Add(CLI::App* group, const char* name, Command command, const char* help,
                const std::string& example);

  CLI::App app{"Manages the file index, and searches it", "fileindexctl"};
  Arguments& arguments;
  Command chosen = nullptr;
};

CLI::Validator NotEmpty();

// One that has to be there; the second kind may be empty.
void AddText(CLI::App* command, const char* name, std::string& value, const char* help);
CLI::Option* AddAnyText(CLI::App* command, const char* name, std::string& value, const char* help);

CLI::Option* AddOption(CLI::App* command, const char* name, std::optional<std::string>& value,
                       const char* type, const char* help);
// With one of these values.
CLI::Option* AddChoice(CLI::App* command, const char* name, std::optional<std::string>& value,
                       const char* type, const char* help, const std::vector<std::string>& choices);
CLI::Option* AddOn(CLI::App* command, const char* name, std::optional<bool>& value,
                   const char* help);
CLI::Option* AddOnOff(CLI::App* command, const char* name, std::optional<bool>& value,
                      const char* help);
CLI::Option* AddJson(CLI::App* command, Arguments& arguments, const char* help);

// All that there are, in two parts.
void DeclareManagement(Declarer& declare);
void DeclareQuestions(Declarer& declare);
// Of these the one that is run most often, and whose start should not be that of all.
void DeclareSearch(Declarer& declare);

}  // namespace fileindexd
