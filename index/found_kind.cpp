// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/found_kind.h"

#include "index/contents_reader.h"
#include "index/entry_table.h"
#include "index/schema.h"

namespace fileindexd {

IndexError FoundKinds::Open(IndexDatabase& entries, const std::string& share_name) {
  const IndexError error = AttachContents(entries, share_name);
  if (error != IndexError::NONE) {
    return error;
  }
  const int code =
      found.Prepare(entries.db, "SELECT found_kind FROM contents.files WHERE " FILEINDEX_THAT_FILE);
  return code == SQLITE_OK ? IndexError::NONE : FromSqlite(code);
}

bool FoundKinds::KindOf(const Entry& entry, Kind& kind) {
  kind = entry.kind;
  if (kind != Kind::OTHER || !entry.content_wanted || found.handle == nullptr) {
    return true;
  }
  BindIdentity(found, IdentityOf(entry));
  bool is_known = false;
  return found.ReadOne(is_known, [&] { kind = static_cast<Kind>(found.Int(0)); }) == SQLITE_OK;
}

}  // namespace fileindexd
