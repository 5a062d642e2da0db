// SPDX-License-Identifier: GPL-2.0-or-later
// Commands that change something: shares, folders, queues, the daemon.
#include "ctl/line/declarer.h"
#include "ctl/values.h"

namespace fileindexd {

namespace {

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

void AddShares(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* group = declare.Group("share", "Shares: directories that are watched and indexed");

  CLI::App* add =
      declare.Add(group, "add", ShareAdd, "Register a directory as a share", "photos /srv/photos");
  AddText(add, "NAME", into.share, "Name, 1 to 64 bytes");
  AddText(add, "PATH", into.path, "An existing directory");

  CLI::App* remove =
      declare.Add(group, "remove", ShareRemove,
                  "Remove a share with its settings and its index; files stay", "photos");
  AddText(remove, "NAME", into.share, "The share");

  CLI::App* accept = declare.Add(group, "accept", ShareAccept,
                                 "Go on with what is at a share's path now: another file system, "
                                 "or nothing where something was",
                                 "photos");
  AddText(accept, "NAME", into.share, "The share");

  CLI::App* set = declare.Add(group, "set", ShareSet, "Change what holds for a share",
                              "letters --language german");
  AddText(set, "NAME", into.share, "The share");
  AddOption(
      set, "--language", into.language, "L",
      ("Find the forms of that language's words together; none: of no language's. L is one of " +
       KnownLanguages())
          .c_str())
      ->required();

  CLI::App* list = declare.Add(group, "list", ShareList, "List the shares", "--json");
  AddJson(list, into, "One JSON document");
}

void AddFolders(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* group = declare.Group("folder", "Indexed folders of the shares");

  CLI::App* add = declare.Add(group, "add", FolderAdd,
                              "Index a folder: names and attributes, and the contents asked for",
                              "/srv/projects --document --photo --exclude '*.o'");
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

  CLI::App* set = declare.Add(group, "set", FolderSet, "Change what of a folder is indexed",
                              "/srv/projects --audio=on --photo=off");
  AddText(set, "PATH", into.path, "An indexed folder");
  AddOnOff(set, "--document", into.document, "Contents of documents");
  AddOnOff(set, "--audio", into.audio, "Contents of audio files");
  AddOnOff(set, "--video", into.video, "Contents of video files");
  AddOnOff(set, "--photo", into.photo, "Contents of pictures");
  CLI::Option* exclude = AddExclude(set, into);
  exclude->description("Keep out what matches, in place of all patterns so far; may be repeated");
  set->add_flag("--no-excludes", into.no_excludes, "No patterns any more")->excludes(exclude);

  CLI::App* remove =
      declare.Add(group, "remove", FolderRemove, "Index a folder no longer", "/srv/projects/old");
  AddText(remove, "PATH", into.path, "An indexed folder");

  CLI::App* list = declare.Add(group, "list", FolderList, "List the indexed folders", "");
  AddJson(list, into, "One JSON document");
}

void AddEvents(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* reindex =
      declare.Add(&declare.app, "reindex", Reindex, "Index a subtree again", "/srv/photos/2024");
  AddText(reindex, "PATH", into.path, "A file or folder of a share");

  CLI::App* event =
      declare.Add(&declare.app, "event", Event, "Append one event line to a share's queue",
                  "photos 8 /srv/photos/new.jpg");
  AddText(event, "SHARE", into.share, "The share");
  AddText(event, "CODE", into.code, "A number, decimal or 0x..., or an event's name");
  AddAnyText(event, "PATH", into.path, "The path that changed, taken as given");
  AddOption(event, "--path-old", into.path_old, "OLD", "The former path, taken as given");
  AddOption(event, "--data", into.data, "JSON", "The event's data");
}

void AddControl(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* pause = declare.Add(&declare.app, "pause", Pause, "Pause indexing", "--for 2h");
  CLI::Option* until =
      AddOption(pause, "--until", into.until, "TIME", "End: seconds since the epoch, or ISO 8601");
  AddOption(pause, "--for", into.duration, "DURATION", "Length: 90s, 15m, 1h30m, 1d")
      ->excludes(until);
  declare.Add(&declare.app, "resume", Resume, "End the pause", "");

  CLI::App* level =
      declare.Add(&declare.app, "log-level", LogLevel, "Set the daemon's log level", "debug");
  level
      ->add_option_function<std::string>(
          "LEVEL", [&into](const std::string& given) { into.level = given; }, "debug or error")
      ->required()
      ->check(CLI::IsMember({"debug", "error"}).description(""))
      ->type_name("");

  CLI::App* worker = declare.Group("worker", "The daemon's Workers, one for each share");
  CLI::App* drop =
      declare.Add(worker, "drop", WorkerDrop, "Stop a share's Worker for good", "photos");
  AddText(drop, "SHARE", into.share, "The share");
  CLI::App* revive = declare.Add(worker, "revive", WorkerRevive, "Start a fresh Worker", "photos");
  AddText(revive, "SHARE", into.share, "The share");
}

}  // namespace

void DeclareManagement(Declarer& declare) {
  AddShares(declare);
  AddFolders(declare);
  AddEvents(declare);
  AddControl(declare);
}

}  // namespace fileindexd
