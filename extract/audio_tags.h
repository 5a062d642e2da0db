// SPDX-License-Identifier: GPL-2.0-or-later
// Tags and properties of a file of sound, whatever its container.
#pragma once

#include "extract/format.h"

namespace fileindexd {

struct AudioTags {
  bool is_found = false;      // the library knows the file and found something in it
  bool has_duration = false;  // duration and bit rate went into the sink
};

// The content chooses how the file is read; its name only where the content tells nothing.
AudioTags PutAudioTags(const Document& document, ContentSink& sink);

}  // namespace fileindexd
