// SPDX-License-Identifier: GPL-2.0-or-later
// Indexed folders, and what their patterns keep out.
#include "state/layout.h"
#include "state/store_impl.h"

namespace fileindexd {

namespace {

void BindFlags(Statement& statement, int first, const ContentFlags& wanted) {
  statement.BindInt(first, wanted.document ? 1 : 0);
  statement.BindInt(first + 1, wanted.audio ? 1 : 0);
  statement.BindInt(first + 2, wanted.video ? 1 : 0);
  statement.BindInt(first + 3, wanted.photo ? 1 : 0);
}

}  // namespace

// Both in byte order of the folders' paths.
bool StateStore::Impl::LoadExcludes(Settings& settings) {
  Statement ask;
  if (!Prepare(ask, "SELECT folder, pattern FROM exclude ORDER BY folder, place")) {
    return false;
  }
  size_t at = 0;
  int result = SQLITE_OK;
  while ((result = ask.Step()) == SQLITE_ROW) {
    const std::string path = ask.Bytes(0);
    while (at < settings.folders.size() && settings.folders[at].path < path) {
      ++at;
    }
    if (at < settings.folders.size() && settings.folders[at].path == path) {
      // It was checked before it was stored. One that came in otherwise matches nothing.
      std::string ignored;
      (void)settings.folders[at].excludes.Add(ask.Bytes(1), ignored);
    }
  }
  return result == SQLITE_DONE || FailSql();
}

bool StateStore::Impl::CheckExcludes(const std::vector<std::string>& patterns) {
  Excludes checked;
  std::string reason;
  for (const std::string& pattern : patterns) {
    if (!checked.Add(pattern, reason)) {
      return Fail(reason);
    }
  }
  return true;
}

bool StateStore::Impl::WriteExcludes(const std::string& folder,
                                     const std::vector<std::string>& patterns) {
  Statement remove;
  if (!Prepare(remove, "DELETE FROM exclude WHERE folder = ?")) {
    return false;
  }
  remove.BindBlob(1, folder);
  if (!Run(remove)) {
    return false;
  }

  Statement insert;
  if (!Prepare(insert, "INSERT INTO exclude VALUES(?, ?, ?)")) {
    return false;
  }
  int64_t place = 0;
  for (const std::string& pattern : patterns) {
    insert.BindBlob(1, folder);
    insert.BindInt(2, place++);
    insert.BindBlob(3, pattern);
    if (!Run(insert)) {
      return false;
    }
  }
  return true;
}

bool StateStore::Impl::WriteFlags(const std::string& folder, const ContentFlags& wanted) {
  Statement update;
  if (!Prepare(update,
               "UPDATE folder SET document = ?, audio = ?, video = ?, photo = ? WHERE path = ?")) {
    return false;
  }
  BindFlags(update, 1, wanted);
  update.BindBlob(5, folder);
  return Run(update) &&
         (sqlite3_changes(connection->db) == 1 || Fail(folder + " is no indexed folder"));
}

bool StateStore::AddFolder(const std::string& path, const ContentFlags& wanted,
                           const std::vector<std::string>& excludes) {
  const std::lock_guard guard(impl->mutex);
  if (NormalPath(path) != path) {
    return impl->Fail("not a plain absolute path: " + path);
  }
  if (!impl->CheckExcludes(excludes)) {
    return false;
  }
  return impl->ChangeSettings([&] {
    Settings settings;
    if (!impl->Load(settings)) {
      return Impl::Outcome::FAILED;
    }
    const Share* share = settings.ShareOfPath(path);
    if (share == nullptr) {
      return impl->Done(impl->Fail(path + " lies in no share"));
    }
    if (settings.FolderAt(path) != nullptr) {
      return impl->Done(impl->Fail(path + " is an indexed folder already"));
    }
    Statement insert;
    if (!impl->Prepare(insert, "INSERT INTO folder VALUES(?, ?, ?, ?, ?, ?)")) {
      return Impl::Outcome::FAILED;
    }
    insert.BindBlob(1, path);
    insert.BindBlob(2, share->name);
    BindFlags(insert, 3, wanted);
    return impl->Done(impl->Run(insert) && impl->WriteExcludes(path, excludes));
  });
}

bool StateStore::SetFolder(const std::string& path, const ContentFlags& wanted) {
  const std::lock_guard guard(impl->mutex);
  return impl->ChangeSettings([&] { return impl->Done(impl->WriteFlags(path, wanted)); });
}

bool StateStore::SetFolder(const std::string& path, const ContentFlags& wanted,
                           const std::vector<std::string>& excludes) {
  const std::lock_guard guard(impl->mutex);
  if (!impl->CheckExcludes(excludes)) {
    return false;
  }
  return impl->ChangeSettings([&] {
    return impl->Done(impl->WriteFlags(path, wanted) && impl->WriteExcludes(path, excludes));
  });
}

bool StateStore::RemoveFolder(const std::string& path) {
  const std::lock_guard guard(impl->mutex);
  return impl->ChangeSettings([&] {
    Statement remove;
    if (!impl->Prepare(remove, "DELETE FROM folder WHERE path = ?")) {
      return Impl::Outcome::FAILED;
    }
    remove.BindBlob(1, path);
    return impl->Done(impl->Run(remove) &&
                      (sqlite3_changes(impl->connection->db) == 1 ||
                       impl->Fail(path + " is no indexed folder")) &&
                      impl->WriteExcludes(path, {}));
  });
}

}  // namespace fileindexd
