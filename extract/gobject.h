// SPDX-License-Identifier: GPL-2.0-or-later
// Owner of one reference to an object of GLib's libraries.
#pragma once

#include <glib-object.h>

#include <memory>

namespace fileindexd {

struct GObjectUnref {
  void operator()(void* object) const { g_object_unref(object); }
};
template <typename Type>
using GOwned = std::unique_ptr<Type, GObjectUnref>;

// Damaged files make these libraries print their findings: not any more.
void SilenceGlib();

}  // namespace fileindexd
