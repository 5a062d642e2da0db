// SPDX-License-Identifier: GPL-2.0-or-later
// Which reader a file gets.
#pragma once

#include <string_view>

#include "extract/format.h"

namespace fileindexd {

enum class Format {
  NONE,  // nothing that is read
  TEXT,
  HTML,
  XML,
  PDF,
  OFFICE_ZIP,
  EPUB,
  OLD_OFFICE,
  RTF,
  MESSAGE,
  MAILBOX,
  ARCHIVE,
  AUDIO,
  VIDEO,
  PHOTO,
};

// By the name's ending, letter case ignored; NONE where it tells nothing.
Format FormatOfName(std::string_view name);
// By what libmagic calls the content.
Format FormatOfMime(std::string_view mime);

// Loads libmagic's database while its file can still be opened. False, and `error` then says why,
// on failure: names are all that tells then.
bool LoadMagic(std::string& error);
// From now on formats whose libraries open files of their own are not read.
void LeaveOutFileUsers();

}  // namespace fileindexd
