// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/command_line.h"

#include <algorithm>
#include <sstream>

#include "ctl/line/declarer.h"
#include "ctl/output.h"
#include "ctl/values.h"

namespace fileindexd {

namespace {

// The program and the commands that were recognised behind it.
std::vector<const CLI::App*> Recognised(const CLI::App& app) {
  std::vector<const CLI::App*> found = {&app};
  while (!found.back()->get_subcommands().empty()) {
    found.push_back(found.back()->get_subcommands().front());
  }
  return found;
}

// Of "--share=" the library takes the next argument, whatever it is, and of "--count=0" a number.
void CheckAssigned(const CLI::App& command, const std::vector<std::string>& line) {
  for (size_t i = 0; i < line.size() && line[i] != "--"; ++i) {
    const size_t equals = line[i].find('=');
    const std::string name = line[i].substr(0, equals);
    const CLI::Option* option =
        name.starts_with("--") ? command.get_option_no_throw(name) : nullptr;
    if (option == nullptr) {
      continue;
    }
    const bool takes_value = option->get_items_expected_max() > 0;
    if (equals == std::string::npos) {
      i += takes_value ? 1 : 0;
    } else if (!takes_value) {
      throw CLI::ValidationError(name, "takes no value");
    } else if (equals + 1 == line[i].size()) {
      throw CLI::ValidationError(name, "must not be empty");
    }
  }
}

// What is wrong, with the commands that were recognised in front: "folder add: PATH is required".
std::string Complaint(const CLI::App& app, const CLI::Error& error) {
  const std::vector<const CLI::App*> commands = Recognised(app);
  const CLI::App* inner = commands.back();
  std::string name;
  for (size_t i = 1; i < commands.size(); ++i) {
    name += commands[i]->get_name() + " ";
  }
  if (!name.empty()) {
    name.back() = ':';
    name += ' ';
  }

  const std::vector<std::string> unknown = inner->remaining();
  if (inner->get_require_subcommand_min() == 0) {
    return name + error.what();
  }
  return name + (unknown.empty() ? "a command is required" : unknown.front() + ": no such command");
}

// Options and words of a search, told apart: the words become one query.
std::vector<std::string> SearchLine(const std::vector<std::string>& given, std::string& query) {
  const SearchArguments split = SplitSearchArguments(
      {given.begin() + 1, given.end()},
      {"--share", "--kind", "--under", "--sort", "--limit", "--offset", "--timeout"});
  std::vector<std::string> line = {"search"};
  line.insert(line.end(), split.options.begin(), split.options.end());
  for (const std::string& word : split.words) {
    query += (query.empty() ? "" : " ") + word;
  }
  return line;
}

// A question may begin with '-': joined to its option it is not taken for another one.
std::vector<std::string> InfoLine(const std::vector<std::string>& given) {
  std::vector<std::string> line;
  for (auto argument = given.begin(); argument != given.end(); ++argument) {
    line.push_back(*argument);
    if (*argument == "--query" && argument + 1 != given.end()) {
      line.back() += "=" + *++argument;
    }
  }
  return line;
}

}  // namespace

Command ParseCommandLine(const std::vector<std::string>& given, Arguments& arguments, int& code) {
  Declarer declare(arguments);
  CLI::App& app = declare.app;
  std::vector<std::string> line = given;
  const bool is_search = !given.empty() && given.front() == "search";
  if (is_search) {
    DeclareSearch(declare);
    line = SearchLine(given, arguments.query);
  } else {
    DeclareManagement(declare);
    DeclareQuestions(declare);
  }
  if (!given.empty() && given.front() == "info") {
    line = InfoLine(given);
  }

  try {
    std::vector<std::string> backwards(line.rbegin(), line.rend());  // as parse() takes them
    app.parse(backwards);
    CheckAssigned(*Recognised(app).back(), line);
  } catch (const CLI::CallForHelp& help) {
    std::ostringstream text;
    (void)app.exit(help, text, text);
    (void)Put(text.str());
    code = EXIT_DONE;
    return nullptr;
  } catch (const CLI::Error& error) {
    code = Fail(EXIT_USAGE, "%s", Complaint(app, error).c_str());
    return nullptr;
  }

  if (is_search && arguments.query.empty()) {
    code = Fail(EXIT_USAGE, "search: QUERY is required");
    return nullptr;
  }
  return declare.chosen;
}

}  // namespace fileindexd
