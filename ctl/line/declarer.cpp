// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/line/declarer.h"

#include <memory>
#include <sstream>

#include "ctl/terminal/cells.h"

namespace fileindexd {

namespace {

constexpr size_t COLUMNS = 80;  // of a usual terminal

std::string Wrapped(const std::string& text, size_t columns) {
  std::string wrapped;
  for (const std::string& line : WrappedLines(text, columns)) {
    wrapped += (wrapped.empty() ? "" : "\n") + line;
  }
  return wrapped;
}

// Where a command has others below it, those are listed in its place. No line is wider than a
// terminal.
class CommandFormatter : public CLI::Formatter {
 public:
  CommandFormatter() { label("SUBCOMMAND", "COMMAND"); }

  std::string make_description(const CLI::App* app) const override {
    return Wrapped(app->get_description(), COLUMNS) + "\n";
  }

  std::string make_option_desc(const CLI::Option* option) const override {
    return Described(option->get_description());
  }

  // Examples, which are indented, stay as they are.
  std::string make_footer(const CLI::App* app) const override {
    std::istringstream footer(app->get_footer());
    std::string text;
    for (std::string line; std::getline(footer, line);) {
      text += (line.starts_with(' ') ? line : Wrapped(line, COLUMNS)) + "\n";
    }
    return text;
  }

  std::string make_subcommands(const CLI::App* app, CLI::AppFormatMode /*mode*/) const override {
    std::ostringstream text;
    AddCommands(app, "", text);
    return text.str().empty() ? "" : "\nCommands:\n" + text.str();
  }

 private:
  // What stands behind a name.
  std::string Described(const std::string& text) const {
    return Wrapped(text, COLUMNS - get_column_width());
  }

  void AddCommands(const CLI::App* app, const std::string& before, std::ostream& text) const {
    for (const CLI::App* command : app->get_subcommands({})) {
      const std::string name = before + command->get_name();
      if (command->get_subcommands({}).empty()) {
        CLI::detail::format_help(text, name, Described(command->get_description()),
                                 get_column_width());
      } else {
        AddCommands(command, name + " ", text);
      }
    }
  }
};

}  // namespace

Declarer::Declarer(Arguments& into) : arguments(into) {
  app.formatter(std::make_shared<CommandFormatter>());
  app.require_subcommand(1);
  app.footer("fileindexctl COMMAND --help tells more of one, with an example.");
}

CLI::App* Declarer::Group(const char* name, const char* help) {
  CLI::App* group = app.add_subcommand(name, help);
  // At most one, or a share named like a command would be taken for it.
  group->require_subcommand(1);
  group->footer(std::string("fileindexctl ") + name +
                " COMMAND --help tells more of one, with an example.");
  return group;
}

CLI::App* Declarer::Add(CLI::App* group, const char* name, Command command, const char* help,
                        const std::string& example) {
  CLI::App* added = group->add_subcommand(name, help);
  added->callback([this, command] { chosen = command; });
  const std::string before = group == &app ? "" : group->get_name() + " ";
  added->footer("Example:\n  fileindexctl " + before + name +
                (example.empty() ? "" : " " + example));
  return added;
}

CLI::Validator NotEmpty() {
  return CLI::Validator(
      [](std::string& given) { return given.empty() ? std::string("must not be empty") : ""; }, "");
}

CLI::Option* AddAnyText(CLI::App* command, const char* name, std::string& value, const char* help) {
  return command
      ->add_option_function<std::string>(
          name, [&value](const std::string& given) { value = given; }, help)
      ->required()
      ->type_name("");
}

void AddText(CLI::App* command, const char* name, std::string& value, const char* help) {
  AddAnyText(command, name, value, help)->check(NotEmpty());
}

CLI::Option* AddOption(CLI::App* command, const char* name, std::optional<std::string>& value,
                       const char* type, const char* help) {
  return command
      ->add_option_function<std::string>(
          name, [&value](const std::string& given) { value = given; }, help)
      ->type_name(type);
}

CLI::Option* AddChoice(CLI::App* command, const char* name, std::optional<std::string>& value,
                       const char* type, const char* help,
                       const std::vector<std::string>& choices) {
  return AddOption(command, name, value, type, help)->check(CLI::IsMember(choices).description(""));
}

CLI::Option* AddOn(CLI::App* command, const char* name, std::optional<bool>& value,
                   const char* help) {
  return command->add_flag_callback(
      name, [&value] { value = true; }, help);
}

CLI::Option* AddOnOff(CLI::App* command, const char* name, std::optional<bool>& value,
                      const char* help) {
  return command
      ->add_option_function<std::string>(
          name, [&value](const std::string& given) { value = given == "on"; }, help)
      ->check(CLI::IsMember({"on", "off"}).description(""))
      ->type_name("on|off");
}

CLI::Option* AddJson(CLI::App* command, Arguments& arguments, const char* help) {
  return command->add_flag("--json", arguments.json, help);
}

}  // namespace fileindexd
