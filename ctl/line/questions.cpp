// SPDX-License-Identifier: GPL-2.0-or-later
// Commands that look and change nothing (but for what they are told to mend).
#include "ctl/line/declarer.h"

namespace fileindexd {

void DeclareSearch(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* search = declare.Add(&declare.app, "search", Search, "Search the index, best first",
                                 "--kind document --under /srv/projects 'annual -draft'");
  // For the help alone: the words are taken out before, see SplitSearchArguments. What comes here
  // begins like an option, and the library takes it for none ("---x", "-- x").
  search
      ->add_option_function<std::vector<std::string>>(
          "QUERY", [](const std::vector<std::string>& given) { throw CLI::ExtrasError(given); },
          "What to find, see below; joined by a blank")
      ->type_name("");
  search->set_help_flag("--help", "Print this help message and exit");
  AddOption(search, "--share", into.in_share, "NAME",
            "In that share alone; in several with share:A,B in QUERY");
  AddChoice(search, "--kind", into.kind, "KIND", "document, audio, video, photo, other or folder",
            {"document", "audio", "video", "photo", "other", "folder"});
  AddOption(search, "--under", into.under, "PATH", "At or below that path");
  AddChoice(search, "--sort", into.sort, "name|size|modified",
            "Not the best first, but by name, or the largest or youngest first",
            {"name", "size", "modified"});
  search->add_flag("--reverse", into.reverse, "The other way round");
  AddOption(search, "--limit", into.limit, "N",
            "At most so many hits, or 'all'; 20 if not given; with 0 the question is only checked");
  AddOption(search, "--offset", into.offset, "N", "Leave out so many of the first");
  search->add_flag("--count", into.count,
                   "The number of hits alone, on a line; with --json as {\"count\":N}");
  CLI::Option* wait =
      search->add_flag("--wait", into.wait, "Once all that has happened to files is in the index");
  AddOption(search, "--timeout", into.timeout, "S", "Wait for S seconds at most; 60 if not given")
      ->needs(wait);
  CLI::Option* json = AddJson(
      search, into,
      "One JSON object a line; marks count bytes: of path_hex where that is given, else of path");
  search->add_flag("-0", into.nul_ended, "End paths with NUL, not with a newline")->excludes(json);
  search->footer(
      "Every word of QUERY must stand in a file's name or content. \"words in a row\", begin*, "
      "-without, one OR another, (groups), name:*.tar.gz, title:word, size:>10M; kind:video or "
      "share:NAME alone finds all of it; QUERY.md tells of all. Options may stand between the "
      "words; what follows a lone -- is QUERY.\n\n" +
      search->get_footer());
}

namespace {

void AddInfo(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* info = declare.Add(&declare.app, "info", Info,
                               "Tell what the index holds of a path, and why or why not",
                               "/srv/projects/report.pdf --query 'annual report'");
  AddText(info, "PATH", into.path, "Any path");
  info->add_flag("--terms", into.terms, "The words of its content, as the index has them");
  AddOption(info, "--query", into.question, "QUERY",
            "Why a search for QUERY finds it or not, part by part")
      ->check(NotEmpty());
  AddJson(info, into, "One JSON document");
}

void AddStats(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* stats =
      declare.Add(&declare.app, "stats", Stats, "Count entries and bytes, the most bytes first",
                  "--share projects --by ext");
  AddOption(stats, "--share", into.in_share, "NAME", "In that share alone");
  AddChoice(stats, "--by", into.by, "KEY", "kind, ext, owner, folder or age",
            {"kind", "ext", "owner", "folder", "age"});
  AddOption(stats, "--largest", into.largest, "N", "The N largest files");
  stats->add_flag("--duplicates", into.duplicates, "Files that are probably alike");
  AddOption(stats, "--growth", into.growth, "DURATION",
            "What was added since, by folder: 15m, 1h30m, 7d, 2w");
  AddJson(stats, into, "One JSON document");
  stats->footer(
      "Each name of a file counts, its bytes count once in a share: at the first of its paths "
      "there. A file with names in several shares counts in each, and so more than once in the "
      "line (all).\n"
      "ext and age (since the last change) are of files and links alone; folder is the one "
      "right below the share's. Alike are, of the files whose content is indexed, those of "
      "one size whose beginning, middle and end are the same: probably, as nothing is "
      "compared in full. Where the output is no terminal, columns are separated by "
      "tabulators, and bytes are exact.\n\n" +
      stats->get_footer());
}

void AddReports(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* failed =
      declare.Add(&declare.app, "failed", Failed,
                  "List the files whose content could not be read, and why", "projects --retry");
  failed
      ->add_option_function<std::string>(
          "SHARE", [&into](const std::string& given) { into.share = given; }, "Of that share alone")
      ->check(NotEmpty())
      ->type_name("");
  failed->add_flag("--retry", into.retry, "Have all of them tried again");
  AddJson(failed, into, "One JSON document");

  CLI::App* dump =
      declare.Add(&declare.app, "dump", Dump, "List every entry of a share's index", "projects -0");
  AddText(dump, "SHARE", into.share, "The share");
  CLI::Option* dump_json = AddJson(dump, into, "One JSON object a line");
  dump->add_flag("-0", into.nul_ended, "End paths with NUL, not with a newline")
      ->excludes(dump_json);

  CLI::App* verify = declare.Add(&declare.app, "verify", Verify,
                                 "Compare a share's index with its files", "projects --repair");
  AddText(verify, "SHARE", into.share, "The share");
  verify->add_flag("--repair", into.repair, "Queue the events that mend what differs");
  AddJson(verify, into, "One JSON object a line");
}

}  // namespace

void DeclareQuestions(Declarer& declare) {
  Arguments& into = declare.arguments;
  CLI::App* status =
      declare.Add(&declare.app, "status", Status, "Show what is going on", "--follow");
  status->add_flag("--follow", into.follow, "Show it again whenever it has changed");
  AddJson(status, into, "One JSON document; with --follow one a line");
  DeclareSearch(declare);
  AddInfo(declare);
  AddStats(declare);
  AddReports(declare);
}

}  // namespace fileindexd
