// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/indexer.h"

#include "base/mutex_guard.h"
#include "scripted/script.h"

namespace fileindexd::TALO::IR {

using scripted::TheScript;

// Present while the database is open.
struct Indexer::Handle {
  std::string db_path;
};

namespace {

void CountIndexers(int difference) {
  const MutexGuard lock(&TheScript().mutex);
  TheScript().live_indexers += difference;
}

bool Done(const Indexer& indexer, const char* operation, const std::string& subject,
          const std::string& arguments) {
  const auto answer = TheScript().Enter(operation, subject, arguments);
  pthread_testcancel();
  return indexer.IsOpen() && answer.value_or(1) != 0;
}

}  // namespace

Indexer::Indexer(const std::string& db_path, _tag_backend_ir backend) {
  const auto answer =
      TheScript().Enter("Indexer", db_path, db_path + " " + std::to_string(backend));
  if (answer.value_or(1) != 0) {
    handle = std::make_unique<Handle>(Handle{db_path});
  }
  pthread_testcancel();
  CountIndexers(1);
}

Indexer::~Indexer() {
  TheScript().Enter("~Indexer", "", "");
  CountIndexers(-1);
}

bool Indexer::IsOpen() const {
  return handle != nullptr;
}

bool Indexer::AddFSDocument(const std::string& path, const Json::Value& cfg) {
  return Done(*this, "AddFSDocument", path, path + " " + cfg.toString());
}

bool Indexer::UpdateFSDocument(const std::string& path, const Json::Value& cfg,
                               const Json::Value& data) {
  return Done(*this, "UpdateFSDocument", path, path + " " + cfg.toString() + " " + data.toString());
}

bool Indexer::DelFSDocument(const std::string& path, _tag_delete_mode mode) {
  return Done(*this, "DelFSDocument", path, path + " " + std::to_string(mode));
}

bool Indexer::Commit() {
  return Done(*this, "Commit", "", "");
}

namespace ErrorHandler {

int GetError() {
  TheScript().EnterUnrecorded("GetError", "");
  const MutexGuard lock(&TheScript().mutex);
  return TheScript().index_error;
}

}  // namespace ErrorHandler

}  // namespace fileindexd::TALO::IR
