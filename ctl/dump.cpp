// SPDX-License-Identifier: GPL-2.0-or-later
// dump: a whole index, entry by entry.
#include "ctl/commands.h"
#include "ctl/output.h"
#include "ctl/pending.h"
#include "ctl/places.h"
#include "index/found_kind.h"
#include "index/reader.h"
#include "index/suspicion.h"

namespace fileindexd {

namespace {

bool PutEntry(const Entry& entry, Kind kind, const Settings& settings, const Arguments& arguments) {
  if (!arguments.json) {
    return arguments.nul_ended ? PutLine(entry.path, '\0') : PutLine(ShownName(entry.path));
  }

  Json::Value object(Json::objectValue);
  SetPath(object, entry.path);
  object["dir"] = entry.thing == Thing::DIRECTORY;
  object["kind"] = KindText(kind);
  object["size"] = static_cast<Json::Int64>(entry.size);
  object["mtime"] = static_cast<Json::Int64>(WholeSeconds(entry.mtime));
  object["content"] = IsWantedAs(kind, entry, settings);
  return PutJson(object);
}

}  // namespace

int Dump(const Arguments& arguments) {
  Session session;
  if (!session.OpenToAsk()) {
    return EXIT_FAILED;
  }
  const Share* share = session.FindShare(arguments.share);
  if (share == nullptr) {
    return EXIT_FAILED;
  }

  EntryReader reader;
  IndexError opened = OpenAndTell(reader.database, share->name);
  if (opened == IndexError::PATH_NOT_FOUND) {
    if (!IsIndexExpected(*session.store, *session.settings, share->name)) {
      return EXIT_DONE;  // nothing was indexed yet
    }
    opened = OpenAndTell(reader.database, share->name);  // it may just have been made
  }
  if (opened != IndexError::NONE) {
    return Fail(EXIT_FAILED, "%s: index: %s", share->name.c_str(), IndexErrorText(opened));
  }

  // Paths alone need nothing of what was read out of files.
  FoundKinds kinds;
  if (arguments.json) {
    kinds.Open(share->name);
  }
  const Progress progress("reading the index of " + share->name);
  bool written = true;
  const bool read = reader.ForEach(share->path, [&](const Entry& entry) {
    written = PutEntry(entry, kinds.KindOf(entry), *session.settings, arguments);
    return written;
  });
  if (!read && written) {
    TellWriter(share->name, reader.read_error);
    return Fail(EXIT_FAILED, "%s: the index cannot be read", share->name.c_str());
  }
  if (kinds.error != IndexError::NONE && kinds.error != IndexError::PATH_NOT_FOUND) {
    TellContentsWriter(share->name, kinds.error);
    return Fail(EXIT_FAILED, "share %s: contents: %s", share->name.c_str(),
                IndexErrorText(kinds.error));
  }
  return EXIT_DONE;
}

}  // namespace fileindexd
