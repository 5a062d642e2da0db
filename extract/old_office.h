// SPDX-License-Identifier: GPL-2.0-or-later
// Text out of the streams of old office documents.
//
// Word before 1997 is left to a converter: `sink.converter` is set then.
#pragma once

#include <string>
#include <string_view>

#include "extract/format.h"

namespace fileindexd {

// `document` is the stream "WordDocument", `table0` and `table1` are "0Table" and "1Table".
bool AddWordText(std::string_view document, std::string_view table0, std::string_view table1,
                 ContentSink& sink, std::string& why);
// The stream "Workbook" or "Book", or all of a workbook from before compound files.
bool AddWorkbookText(std::string_view workbook, ContentSink& sink, std::string& why);
// The same, of a version before that of 1997.
bool AddOldWorkbookText(std::string_view workbook, ContentSink& sink, std::string& why);
// Whether a file that begins so is a workbook without a compound file around it.
bool IsBareWorkbook(std::string_view begin);
// The streams "PowerPoint Document" and "Current User".
bool AddSlidesText(std::string_view slides, std::string_view current_user, ContentSink& sink,
                   std::string& why);

}  // namespace fileindexd
