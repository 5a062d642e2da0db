// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/status.h"

#include "platform/log.h"
#include "platform/standalone/environment.h"
#include "platform/standalone/pass_progress.h"
#include "platform/standalone/uncancelled.h"
#include "state/layout.h"

namespace fileindexd::TALO::FILEINDEX {

bool StatusMgr::GetPauseInfo(int64_t& resume_time) {
  return Uncancelled([&resume_time] {
    StateStore* store = Store();
    return store != nullptr && store->GetPause(resume_time);
  });
}

bool StatusMgr::IsUpdated(const std::string& marker) {
  return Uncancelled([&marker] {
    StateStore* store = Store();
    bool has = false;
    return store != nullptr && store->HasMarker(marker, has) && has;
  });
}

bool StatusMgr::SetUpdated(const std::string& marker) {
  return Uncancelled([&marker] {
    StateStore* store = Store();
    return store != nullptr && store->SetMarker(marker);
  });
}

bool StatusMgr::ShareIsNeedReindex(const std::string& share_name) {
  return Uncancelled([&share_name] {
    const ShareStatus status = StatusOf(share_name);
    return (status.needs_reindex || status.reindex_begun) && !PutReindexOff(share_name);
  });
}

void StatusMgr::ShareSetNeedReindex(const std::string& share_name, bool need) {
  Uncancelled([&share_name, need] {
    if (need) {
      return RequestReindex(share_name);
    }
    // The flag goes before the walk has begun: until a pass has ended, the record stands for it.
    ProgressOf(share_name).BeginShareReindex();
    return ChangeStatus(share_name, [](ShareStatus& status) {
      status.needs_reindex = false;
      status.reindex_begun = true;
    });
  });
}

bool StatusMgr::ShareSetNoSpace(const std::string& share_name, bool no_space) {
  return Uncancelled([&share_name, no_space] {
    if (no_space) {
      ProgressOf(share_name).End();  // the pass is given up
    }
    return ChangeStatus(share_name,
                        [no_space](ShareStatus& status) { status.no_space = no_space; });
  });
}

// Gives every registered share the folder that its queue file and its index lie in.
bool Updater_hvx60_beta2() {
  return Uncancelled([] {
    const std::shared_ptr<const Settings> settings = CurrentSettings();
    for (const Share& share : settings->shares) {
      std::string error;
      if (!MakeShareFolder(share.name, error)) {
        FI_LOG("%s", error.c_str());
        return false;
      }
    }
    return true;
  });
}

}  // namespace fileindexd::TALO::FILEINDEX
