// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/share.h"

#include <cstring>

#include "base/event_codes.h"
#include "platform/log.h"
#include "platform/standalone/environment.h"
#include "platform/standalone/shortage.h"
#include "platform/standalone/uncancelled.h"
#include "state/belonging.h"
#include "state/filesystem.h"
#include "state/layout.h"
#include "state/queue_content.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

// The record and the texts that it points to.
struct ShareRecord : _tag_TALOSHARE {
  Share share;
};

int CopyPath(const std::string& path, char* buffer, int size) {
  if (size <= 0 || path.size() >= static_cast<size_t>(size)) {
    return -1;
  }
  memcpy(buffer, path.c_str(), path.size() + 1);
  return 0;
}

// An index that was found missing may be made anew now that what fills it is on record, where no
// power cut can reach it: else an index could be left that is new, empty and opens well.
void AllowRebuild(const Share& share) {
  ChangeStatus(share.name, [](ShareStatus& status) {
    status.rebuild_wanted = status.rebuild_wanted || status.missing;
  });
}

}  // namespace

int TALOShareGet(const char* name, _tag_TALOSHARE** share) {
  return Uncancelled([name, share] {
    const std::shared_ptr<const Settings> settings = CurrentSettings();
    const Share* found = settings->ShareByName(name);
    if (found == nullptr) {
      return -1;
    }

    auto* record = new ShareRecord;
    record->share = *found;
    record->name = record->share.name.c_str();
    record->path = record->share.path.c_str();
    *share = record;
    return 0;
  });
}

void TALOShareFree(_tag_TALOSHARE* share) {
  delete static_cast<ShareRecord*>(share);
}

int FILEIDXDBPathGet(const char* share_name, char* buffer, int size) {
  return IsValidShareName(share_name) ? CopyPath(IndexPath(share_name), buffer, size) : -1;
}

int FILEIDXQueuePathGet(const char* share_name, char* buffer, int size) {
  return Uncancelled([share_name, buffer, size] {
    if (!IsValidShareName(share_name)) {
      return -1;
    }
    // The folder is about to be watched for the queue file.
    std::string error;
    if (!MakeShareFolder(share_name, error)) {
      FI_LOG("%s", error.c_str());
      return -1;
    }
    return CopyPath(QueuePath(share_name), buffer, size);
  });
}

namespace TALO::FILEINDEX {

void AddCustomEvent(const int& event, const std::string& path, const Json::Value& data) {
  Uncancelled([&] {
    const std::shared_ptr<const Settings> settings = CurrentSettings();
    const Share* share = FindShareOfPath(*settings, path);
    if (share == nullptr) {
      FI_LOG("No share holds path=%s", path.c_str());
      return false;
    }

    const auto code = static_cast<uint32_t>(event);
    const std::string text = data.isNull() ? std::string() : data.toString();
    const bool refills = code == CUSTOM_EVENT_REINDEX && NormalPath(path) == share->path;
    std::string error;
    if (!AppendEvent(share->name, code, path, text, refills ? Durability::SYNCED : Durability::NONE,
                     error)) {
      FI_LOG("Failed to queue event for share[%s]: %s", share->name.c_str(), error.c_str());
      if (!RequestReindex(share->name)) {
        return false;
      }
    }
    if (refills) {
      AllowRebuild(*share);
    }
    return true;
  });
}

void NoteLostChanges(const std::string& path, int error) {
  const CancelOff off;
  NoteFailedLook(*CurrentSettings(), path, error);
}

bool GetShareNameByPath(std::string& share_name, const std::string& path) {
  return Uncancelled([&] {
    const std::shared_ptr<const Settings> settings = CurrentSettings();
    const Share* share = FindShareOfPath(*settings, path);
    if (share == nullptr) {
      return false;
    }
    share_name = share->name;
    return true;
  });
}

bool CanShareBeIndexed(const _tag_TALOSHARE* share) {
  return Uncancelled([share] {
    const Share& record = static_cast<const ShareRecord*>(share)->share;
    return LookAtRoot(record) == RootState::SOUND && IsRealFilesystem(record.path);
  });
}

bool IsShareSpaceEnough(const std::string& share_name) {
  return Uncancelled([&share_name] {
    const std::shared_ptr<const Settings> settings = CurrentSettings();
    const Share* share = settings->ShareByName(share_name);
    if (share != nullptr && !HasSpace(share->path, true)) {
      return false;
    }
    if (!HasSpace(StateRoot(), false)) {
      return false;
    }
    if (share != nullptr && StatusOf(share_name).no_space) {
      ChangeStatus(share_name, [](ShareStatus& status) { status.no_space = false; });
    }
    return true;
  });
}

}  // namespace TALO::FILEINDEX
}  // namespace fileindexd
