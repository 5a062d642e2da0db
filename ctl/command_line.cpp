// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/command_line.h"

#include <CLI/CLI.hpp>
#include <algorithm>
#include <optional>
#include <sstream>

#include "ctl/output.h"
#include "ctl/values.h"

namespace fileindexd {

namespace {

// Declares commands on one line of arguments. All of them share the record that is filled.
struct Declarer {
  CLI::App* Group(const char* name, const char* help) {
    CLI::App* group = app.add_subcommand(name, help);
    // At most one, or a share named like a command would be taken for it.
    group->require_subcommand(1);
    return group;
  }

  CLI::App* Add(CLI::App* group, const char* name, Command command, const char* help) {
    CLI::App* added = group->add_subcommand(name, help);
    added->callback([this, command] { chosen = command; });
    return added;
  }

  CLI::App app{"Manages the file index, and searches it", "fileindexctl"};
  Arguments& arguments;
  Command chosen = nullptr;
};

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

// Each occurrence takes one value, as it is: the library would otherwise split "[a,b]", and take
// "{}" for nothing.
CLI::Option* AddExclude(CLI::App* command, Arguments& arguments) {
  return command
      ->add_option(
          "--exclude",
          [&arguments](const CLI::results_t& given) {
            arguments.excludes = given;
            return true;
          },
          "Keep out what matches, as in gitignore; may be repeated")
      ->type_size(1)
      ->expected(1, CLI::detail::expected_max_vector_size)
      ->allow_extra_args(false)
      ->type_name("PATTERN");
}

CLI::Option* AddJson(CLI::App* command, Arguments& arguments, const char* help) {
  return command->add_flag("--json", arguments.json, help);
}

void AddShares(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* group = declare.Group("share", "Shares: directories that are watched and indexed");

  CLI::App* add = declare.Add(group, "add", ShareAdd, "Register a directory as a share");
  AddText(add, "NAME", into.share, "Name, 1 to 64 bytes");
  AddText(add, "PATH", into.path, "An existing directory");

  CLI::App* remove = declare.Add(group, "remove", ShareRemove,
                                 "Remove a share with its settings and its index; files stay");
  AddText(remove, "NAME", into.share, "The share");

  CLI::App* accept = declare.Add(group, "accept", ShareAccept,
                                 "Go on with what is at a share's path now: another file system, "
                                 "or nothing where something was");
  AddText(accept, "NAME", into.share, "The share");

  CLI::App* set = declare.Add(group, "set", ShareSet, "Change what holds for a share");
  AddText(set, "NAME", into.share, "The share");
  AddOption(set, "--language", into.language, "L",
            "Find the forms of that language's words together; none: of no language's")
      ->required();

  CLI::App* list = declare.Add(group, "list", ShareList, "List the shares");
  AddJson(list, into, "One JSON document");
}

void AddFolders(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* group = declare.Group("folder", "Indexed folders of the shares");

  CLI::App* add = declare.Add(group, "add", FolderAdd,
                              "Index a folder: names and attributes, and the contents asked for");
  AddText(add, "PATH", into.path, "A folder of a share");
  CLI::Option* document = AddOn(add, "--document", into.document, "Contents of documents");
  CLI::Option* audio = AddOn(add, "--audio", into.audio, "Contents of audio files");
  CLI::Option* video = AddOn(add, "--video", into.video, "Contents of video files");
  CLI::Option* photo = AddOn(add, "--photo", into.photo, "Contents of pictures");
  add->add_flag("--all", into.all, "Contents of all four")
      ->excludes(document)
      ->excludes(audio)
      ->excludes(video)
      ->excludes(photo);
  AddExclude(add, into);

  CLI::App* set = declare.Add(group, "set", FolderSet, "Change what of a folder is indexed");
  AddText(set, "PATH", into.path, "An indexed folder");
  AddOnOff(set, "--document", into.document, "Contents of documents");
  AddOnOff(set, "--audio", into.audio, "Contents of audio files");
  AddOnOff(set, "--video", into.video, "Contents of video files");
  AddOnOff(set, "--photo", into.photo, "Contents of pictures");
  CLI::Option* exclude = AddExclude(set, into);
  exclude->description("Keep out what matches, in place of all patterns so far; may be repeated");
  set->add_flag("--no-excludes", into.no_excludes, "No patterns any more")->excludes(exclude);

  CLI::App* remove = declare.Add(group, "remove", FolderRemove, "Index a folder no longer");
  AddText(remove, "PATH", into.path, "An indexed folder");

  CLI::App* list = declare.Add(group, "list", FolderList, "List the indexed folders");
  AddJson(list, into, "One JSON document");
}

void AddEvents(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* reindex = declare.Add(&declare.app, "reindex", Reindex, "Index a subtree again");
  AddText(reindex, "PATH", into.path, "A file or folder of a share");

  CLI::App* event =
      declare.Add(&declare.app, "event", Event, "Append one event line to a share's queue");
  AddText(event, "SHARE", into.share, "The share");
  AddText(event, "CODE", into.code, "A number, decimal or 0x..., or an event's name");
  AddAnyText(event, "PATH", into.path, "The path that changed, taken as given");
  AddOption(event, "--path-old", into.path_old, "OLD", "The former path, taken as given");
  AddOption(event, "--data", into.data, "JSON", "The event's data");
}

void AddControl(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* pause = declare.Add(&declare.app, "pause", Pause, "Pause indexing");
  CLI::Option* until =
      AddOption(pause, "--until", into.until, "TIME", "End: seconds since the epoch, or ISO 8601");
  AddOption(pause, "--for", into.duration, "DURATION", "Length: 90s, 15m, 2h, 1d")->excludes(until);
  declare.Add(&declare.app, "resume", Resume, "End the pause");

  CLI::App* level = declare.Add(&declare.app, "log-level", LogLevel, "Set the daemon's log level");
  level
      ->add_option_function<std::string>(
          "LEVEL", [&into](const std::string& given) { into.level = given; }, "debug or error")
      ->required()
      ->check(CLI::IsMember({"debug", "error"}).description(""))
      ->type_name("");

  CLI::App* worker = declare.Group("worker", "The daemon's Workers, one for each share");
  CLI::App* drop = declare.Add(worker, "drop", WorkerDrop, "Stop a share's Worker for good");
  AddText(drop, "SHARE", into.share, "The share");
  CLI::App* revive = declare.Add(worker, "revive", WorkerRevive, "Start a fresh Worker");
  AddText(revive, "SHARE", into.share, "The share");
}

void AddQuestions(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* status = declare.Add(&declare.app, "status", Status, "Show what is going on");
  status->add_flag("--follow", into.follow, "Show it again whenever it has changed");
  AddJson(status, into, "One JSON document; with --follow one a line");

  CLI::App* search = declare.Add(&declare.app, "search", Search, "Search the index, best first");
  // For the help alone: the words are taken out before, see SplitSearchArguments.
  search
      ->add_option_function<std::vector<std::string>>(
          "QUERY", [](const std::vector<std::string>&) {}, "Words, joined by a blank")
      ->type_name("");
  search->set_help_flag("--help", "Print this help message and exit");
  AddOption(search, "--share", into.in_share, "NAME", "In that share alone");
  AddOption(search, "--kind", into.kind, "KIND", "document, audio, video, photo, other or folder")
      ->check(CLI::IsMember({"document", "audio", "video", "photo", "other", "folder"})
                  .description(""));
  AddOption(search, "--under", into.under, "PATH", "At or below that path");
  AddOption(search, "--limit", into.limit, "N", "At most so many hits; 20 if not given");
  AddOption(search, "--offset", into.offset, "N", "Leave out so many of the best");
  search->add_flag("--count", into.count, "The number of hits alone");
  CLI::Option* wait =
      search->add_flag("--wait", into.wait, "Once all that has happened to files is in the index");
  AddOption(search, "--timeout", into.timeout, "S", "Wait for S seconds at most; 60 if not given")
      ->needs(wait);
  CLI::Option* search_json = AddJson(search, into, "One JSON object a line");
  search->add_flag("-0", into.nul_ended, "End paths with NUL, not with a newline")
      ->excludes(search_json);

  CLI::App* info = declare.Add(&declare.app, "info", Info,
                               "Tell what the index holds of a path, and why or why not");
  AddText(info, "PATH", into.path, "Any path");
  AddJson(info, into, "One JSON document");

  CLI::App* failed = declare.Add(&declare.app, "failed", Failed,
                                 "List the files whose content could not be read, and why");
  failed
      ->add_option_function<std::string>(
          "SHARE", [&into](const std::string& given) { into.share = given; }, "Of that share alone")
      ->check(NotEmpty())
      ->type_name("");
  failed->add_flag("--retry", into.retry, "Have all of them tried again");
  AddJson(failed, into, "One JSON document");

  CLI::App* dump = declare.Add(&declare.app, "dump", Dump, "List every entry of a share's index");
  AddText(dump, "SHARE", into.share, "The share");
  CLI::Option* dump_json = AddJson(dump, into, "One JSON object a line");
  dump->add_flag("-0", into.nul_ended, "End paths with NUL, not with a newline")
      ->excludes(dump_json);

  CLI::App* verify =
      declare.Add(&declare.app, "verify", Verify, "Compare a share's index with its files");
  AddText(verify, "SHARE", into.share, "The share");
  verify->add_flag("--repair", into.repair, "Queue the events that mend what differs");
  AddJson(verify, into, "One JSON object a line");
}

// What is wrong, with the commands that were recognised in front: "folder add: PATH is required".
std::string Complaint(const CLI::App& app, const CLI::Error& error) {
  std::string name;
  const CLI::App* inner = &app;
  while (!inner->get_subcommands().empty()) {
    inner = inner->get_subcommands().front();
    name += inner->get_name() + " ";
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

}  // namespace

Command ParseCommandLine(const std::vector<std::string>& given, Arguments& arguments, int& code) {
  Declarer declare{.arguments = arguments};
  CLI::App& app = declare.app;
  app.require_subcommand(1);
  AddShares(declare);
  AddFolders(declare);
  AddEvents(declare);
  AddControl(declare);
  AddQuestions(declare);

  std::vector<std::string> line = given;
  const bool is_search = !given.empty() && given.front() == "search";
  if (is_search) {
    const SearchArguments split =
        SplitSearchArguments({given.begin() + 1, given.end()},
                             {"--share", "--kind", "--under", "--limit", "--offset", "--timeout"});
    line = {"search"};
    line.insert(line.end(), split.options.begin(), split.options.end());
    for (const std::string& word : split.words) {
      arguments.query += (arguments.query.empty() ? "" : " ") + word;
    }
  }

  try {
    std::reverse(line.begin(), line.end());  // as parse() takes them
    app.parse(line);
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
