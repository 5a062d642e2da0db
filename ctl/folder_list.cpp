// SPDX-License-Identifier: GPL-2.0-or-later
// folder list, and how flags are shown.
#include "base/utf8.h"
#include "ctl/commands.h"
#include "ctl/content_kinds.h"
#include "ctl/output.h"
#include "ctl/places.h"

namespace fileindexd {

Json::Value FlagsObject(const ContentFlags& flags) {
  Json::Value object(Json::objectValue);
  for (const ContentKind& kind : CONTENT_KINDS) {
    object[kind.name] = flags.*kind.flag;
  }
  return object;
}

std::string FlagsText(const ContentFlags& flags) {
  std::string text;
  for (const ContentKind& kind : CONTENT_KINDS) {
    if (flags.*kind.flag) {
      text += (text.empty() ? "" : ",") + std::string(kind.name);
    }
  }
  return text.empty() ? "names" : text;
}

int FolderList(const Arguments& arguments) {
  Session session;
  if (!session.OpenToAsk()) {
    return EXIT_FAILED;
  }

  Json::Value list(Json::arrayValue);
  for (const IndexedFolder& folder : session.settings->folders) {
    const bool gone = IsDirectoryGone(folder.path);
    if (arguments.json) {
      Json::Value item = FlagsObject(folder.wanted);
      item["share"] = ToUtf8(folder.share);
      item["gone"] = gone;
      SetPath(item, folder.path);
      SetTexts(item, folder.excludes.patterns, "excludes");
      list.append(item);
      continue;
    }

    std::string line =
        ShownName(folder.share) + "\t" + ShownName(folder.path) + "\t" + FlagsText(folder.wanted);
    for (const std::string& pattern : folder.excludes.patterns) {
      line += "\texclude " + ShownName(pattern);
    }
    (void)PutLine(line + (gone ? "\tgone" : ""));
  }
  if (arguments.json) {
    (void)PutJson(list);
  }
  return EXIT_DONE;
}

}  // namespace fileindexd
