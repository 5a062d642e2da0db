// SPDX-License-Identifier: GPL-2.0-or-later
// From a picture's metadata to our fields.
#pragma once

#include <exiv2/image.hpp>

#include "extract/format.h"

namespace fileindexd {

// Everything but the size in pixels. Throws what the library throws.
void PutPhotoFields(const Exiv2::Image& image, ContentSink& sink);

}  // namespace fileindexd
