// SPDX-License-Identifier: GPL-2.0-or-later
// The kinds whose contents a folder may want, as options and as JSON keys.
#pragma once

#include <json/value.h>

#include <optional>
#include <string>

#include "ctl/commands.h"
#include "state/settings.h"

namespace fileindexd {

struct ContentKind {
  const char* name;
  bool ContentFlags::*flag;
  std::optional<bool> Arguments::*argument;
};

constexpr ContentKind CONTENT_KINDS[] = {
    {"document", &ContentFlags::document, &Arguments::document},
    {"audio", &ContentFlags::audio, &Arguments::audio},
    {"video", &ContentFlags::video, &Arguments::video},
    {"photo", &ContentFlags::photo, &Arguments::photo},
};

// {"document": bool, ...}
Json::Value FlagsObject(const ContentFlags& flags);

// "document,photo"; "names" where no contents are wanted.
std::string FlagsText(const ContentFlags& flags);

}  // namespace fileindexd
