// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/gobject.h"

namespace fileindexd {

void SilenceGlib() {
  g_log_set_default_handler([](const gchar*, GLogLevelFlags, const gchar*, gpointer) {}, nullptr);
  g_set_print_handler([](const gchar*) {});
  g_set_printerr_handler([](const gchar*) {});
}

}  // namespace fileindexd
