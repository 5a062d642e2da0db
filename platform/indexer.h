// SPDX-License-Identifier: GPL-2.0-or-later
// The writer of one share's index.
#pragma once

#include <memory>
#include <string>

#include "platform/json.h"

namespace fileindexd::TALO::IR {

// Selects the engine; the daemon asks for 0.
using _tag_backend_ir = int;  // NOLINT: the host's own name

// How much DelFSDocument removes.
// 0: the entry at the path, and what lies below it and is gone or does not belong.
// 1: the same below, and the entry itself if it is gone or does not belong: what is there stays
//    findable until the walk that follows looks at it anew.
// 2: the entry and all below it.
using _tag_delete_mode = int;  // NOLINT: the host's own name

// What ErrorHandler::GetError says when the database's path does not exist.
constexpr int ERROR_PATH_NOT_FOUND = 3;

// One thread at a time. An object whose database did not open exists all the same; each operation
// then tries to open it again, and fails if that fails. Nothing here throws. Each operation but the
// destructor tests for cancellation as its last step.
class Indexer {
 public:
  Indexer(const std::string& db_path, _tag_backend_ir backend);
  Indexer(const Indexer&) = delete;
  Indexer& operator=(const Indexer&) = delete;
  // Drops what was not committed. Waits until no operation is inside.
  virtual ~Indexer();

  // False when the database did not open; ErrorHandler::GetError then says why.
  bool IsOpen() const;

  // Adds or replaces the entry at `path`. `cfg`: what GetMostSuitableCfg returned for it.
  bool AddFSDocument(const std::string& path, const Json::Value& cfg);
  // Brings the entry in line with the disk. `data`: null, or an object of the four content flags,
  // whose true members say for which kinds it is decided anew whether content is wanted.
  bool UpdateFSDocument(const std::string& path, const Json::Value& cfg, const Json::Value& data);
  bool DelFSDocument(const std::string& path, _tag_delete_mode mode);
  // Makes all changes durable. After a failure they are kept for the next commit.
  bool Commit();

  struct Handle;
  std::unique_ptr<Handle> handle;  // the platform's own
};

namespace ErrorHandler {

// Code of the calling thread's last indexer error.
int GetError();

}  // namespace ErrorHandler

}  // namespace fileindexd::TALO::IR
