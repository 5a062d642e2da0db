// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/found_kind.h"

#include "index/contents_schema.h"
#include "index/entry_table.h"
#include "index/schema.h"
#include "state/layout.h"

namespace fileindexd {

void FoundKinds::Open(const std::string& share_name) {
  error = contents.OpenForReading(ContentsPath(share_name), CONTENTS_FORM);
  if (error == IndexError::NONE) {
    error = FromSqlite(
        found.Prepare(contents.db, "SELECT found_kind FROM files WHERE " FILEINDEX_THAT_FILE));
  }
}

Kind FoundKinds::KindOf(const Entry& entry) {
  Kind kind = entry.kind;
  if (kind != Kind::OTHER || !entry.content_wanted || error != IndexError::NONE) {
    return kind;
  }
  BindIdentity(found, IdentityOf(entry));
  bool is_known = false;
  error = FromSqlite(found.ReadOne(is_known, [&] { kind = static_cast<Kind>(found.Int(0)); }));
  return kind;
}

bool IsWantedAs(Kind kind, const Entry& entry, const Settings& settings) {
  const IndexedFolder* folder = kind != entry.kind ? settings.FolderOfPath(entry.path) : nullptr;
  return entry.content_wanted && (folder == nullptr || IsContentWanted(kind, folder->wanted));
}

}  // namespace fileindexd
