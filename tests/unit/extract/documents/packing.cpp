// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/documents/packing.h"

#include <archive.h>
#include <archive_entry.h>
#include <gtest/gtest.h>

#include <clocale>

namespace fileindexd {

std::string Packed(const Packing& packing, const std::vector<Member>& members) {
  const locale_t utf8 = newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr);
  const locale_t before = uselocale(utf8);
  std::string bytes(1 << 20, '\0');
  for (const Member& member : members) {
    bytes.resize(bytes.size() + member.bytes.size() + 4096);
  }
  size_t used = 0;
  struct archive* made = archive_write_new();
  EXPECT_EQ(archive_write_set_format(made, packing.format), ARCHIVE_OK);
  EXPECT_EQ(archive_write_add_filter(made, packing.filter), ARCHIVE_OK);
  if (!packing.passphrase.empty()) {
    archive_write_set_passphrase(made, packing.passphrase.c_str());
  }
  EXPECT_EQ(archive_write_set_options(made, packing.options.c_str()), ARCHIVE_OK)
      << archive_error_string(made);
  archive_write_set_bytes_in_last_block(made, 1);
  EXPECT_EQ(archive_write_open_memory(made, bytes.data(), bytes.size(), &used), ARCHIVE_OK);
  for (const Member& member : members) {
    struct archive_entry* entry = archive_entry_new();
    archive_entry_set_pathname_utf8(entry, member.name.c_str());
    archive_entry_set_filetype(entry, AE_IFREG);
    archive_entry_set_perm(entry, 0644);
    archive_entry_set_size(entry, static_cast<la_int64_t>(member.bytes.size()));
    EXPECT_EQ(archive_write_header(made, entry), ARCHIVE_OK) << archive_error_string(made);
    archive_write_data(made, member.bytes.data(), member.bytes.size());
    archive_entry_free(entry);
  }
  EXPECT_EQ(archive_write_close(made), ARCHIVE_OK) << archive_error_string(made);
  archive_write_free(made);
  uselocale(before);
  freelocale(utf8);
  bytes.resize(used);
  return bytes;
}

std::string Zipped(const std::vector<Member>& members) {
  return Packed({ARCHIVE_FORMAT_ZIP, ARCHIVE_FILTER_NONE, "", ""}, members);
}

}  // namespace fileindexd
