// SPDX-License-Identifier: GPL-2.0-or-later
// A hash that finds files which are probably the same without reading them wholly.
#pragma once

#include <cstdint>

#include "extract/format.h"

namespace fileindexd {

// XXH3 of the file's first, middle and last 64 KiB, of all of it where it is no longer than that,
// and of its size. What is no longer there counts as not there. False when something cannot be
// read, which is noted as the document's fault.
bool SampleFile(const Document& document, uint64_t& sample);

}  // namespace fileindexd
