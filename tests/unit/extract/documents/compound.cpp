// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/documents/compound.h"

#include <gsf/gsf.h>

namespace fileindexd {

namespace {

void AddProperty(GsfDocMetaData* summary, const char* name, const std::string& text) {
  GValue* value = g_new0(GValue, 1);
  g_value_init(value, G_TYPE_STRING);
  g_value_set_string(value, text.c_str());
  gsf_doc_meta_data_insert(summary, g_strdup(name), value);
}

}  // namespace

std::string Le16(uint32_t number) {
  return {static_cast<char>(number), static_cast<char>(number >> 8)};
}

std::string Le32(uint32_t number) {
  return Le16(number) + Le16(number >> 16);
}

std::string Wide(const std::u16string& text) {
  std::string bytes;
  for (const char16_t unit : text) {
    bytes += Le16(unit);
  }
  return bytes;
}

std::string Compound(const std::vector<Member>& streams, const std::string& title,
                     const std::string& author) {
  GsfOutput* memory = gsf_output_memory_new();
  GsfOutfile* file = gsf_outfile_msole_new(memory);
  for (const Member& stream : streams) {
    GsfOutput* child = gsf_outfile_new_child(file, stream.name.c_str(), FALSE);
    gsf_output_write(child, stream.bytes.size(),
                     reinterpret_cast<const guint8*>(stream.bytes.data()));
    gsf_output_close(child);
    g_object_unref(child);
  }
  if (!title.empty()) {
    GsfDocMetaData* summary = gsf_doc_meta_data_new();
    AddProperty(summary, GSF_META_NAME_TITLE, title);
    AddProperty(summary, GSF_META_NAME_CREATOR, author);
    GsfOutput* child = gsf_outfile_new_child(file, "\005SummaryInformation", FALSE);
    gsf_doc_meta_data_write_to_msole(summary, child, FALSE);
    gsf_output_close(child);
    g_object_unref(child);
    g_object_unref(summary);
  }
  gsf_output_close(GSF_OUTPUT(file));
  g_object_unref(file);
  const auto* bytes = gsf_output_memory_get_bytes(GSF_OUTPUT_MEMORY(memory));
  std::string made(reinterpret_cast<const char*>(bytes),
                   static_cast<size_t>(gsf_output_size(memory)));
  g_object_unref(memory);
  return made;
}

}  // namespace fileindexd
