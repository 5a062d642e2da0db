// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/ole_file.h"

#include <gsf/gsf.h>

#include <algorithm>

#include "extract/gobject.h"

namespace fileindexd {

namespace {

void StartLibrary() {
  static const bool is_started = [] {
    SilenceGlib();
    gsf_init();
    return true;
  }();
  (void)is_started;
}

std::string TextOf(const GValue* value) {
  if (value == nullptr) {
    return "";
  }
  if (G_VALUE_HOLDS_STRING(value)) {
    const char* text = g_value_get_string(value);
    return text != nullptr ? text : "";
  }
  return "";
}

std::string KeywordsOf(const GValue* value) {
  if (value == nullptr || !VAL_IS_GSF_DOCPROP_VECTOR(const_cast<GValue*>(value))) {
    return TextOf(value);
  }
  std::string keywords;
  // Deprecated in favour of a function that the library declares and does not hold.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"
  const GValueArray* array = gsf_value_get_docprop_varray(value);
#pragma GCC diagnostic pop
  for (guint i = 0; array != nullptr && i < array->n_values; ++i) {
    keywords += (keywords.empty() ? "" : ", ") + TextOf(&array->values[i]);
  }
  return keywords;
}

const GValue* Find(const GsfDocMetaData* summary, const char* name) {
  const GsfDocProp* property = gsf_doc_meta_data_lookup(summary, name);
  return property != nullptr ? gsf_doc_prop_get_val(property) : nullptr;
}

}  // namespace

OleFile::~OleFile() {
  if (infile != nullptr) {
    g_object_unref(infile);
  }
}

bool OleFile::Open(const Document& document, std::string& why) {
  StartLibrary();
  file.emplace(document);
  const GOwned<GsfInput> input(
      file->stream == nullptr ? nullptr : gsf_input_stdio_new_FILE("document", file->stream, TRUE));
  if (!input) {
    why = "cannot be read";
    return false;
  }
  GError* error = nullptr;
  infile = gsf_infile_msole_new(input.get(), &error);
  if (infile == nullptr) {
    g_clear_error(&error);
    why = "not a compound file, or damaged";
    return false;
  }
  return true;
}

bool OleFile::Has(const char* stream) const {
  const GOwned<GsfInput> child(gsf_infile_child_by_name(infile, stream));
  return child != nullptr;
}

std::string OleFile::Stream(const char* stream) const {
  std::string bytes;
  const GOwned<GsfInput> child(gsf_infile_child_by_name(infile, stream));
  if (!child) {
    return bytes;
  }
  constexpr gsf_off_t STEP = 64 * 1024;
  gsf_off_t left = std::min<gsf_off_t>(gsf_input_size(child.get()), MAX_STREAM);
  while (left > 0) {
    const auto count = static_cast<size_t>(std::min(left, STEP));
    const guint8* block = gsf_input_read(child.get(), count, nullptr);
    if (block == nullptr) {
      break;
    }
    bytes.append(reinterpret_cast<const char*>(block), count);
    left -= static_cast<gsf_off_t>(count);
  }
  return bytes;
}

void OleFile::SetSummary(ContentSink& sink) const {
  const GOwned<GsfInput> stream(gsf_infile_child_by_name(infile, "\005SummaryInformation"));
  const GOwned<GsfDocMetaData> summary(gsf_doc_meta_data_new());
  if (!stream || gsf_input_size(stream.get()) > static_cast<gsf_off_t>(1 << 20)) {
    return;
  }
  GError* error = gsf_doc_meta_data_read_from_msole(summary.get(), stream.get());
  g_clear_error(&error);  // what was read before it counts

  sink.Set(ContentField::TITLE, TextOf(Find(summary.get(), GSF_META_NAME_TITLE)));
  sink.Set(ContentField::AUTHOR, TextOf(Find(summary.get(), GSF_META_NAME_INITIAL_CREATOR)));
  sink.Set(ContentField::AUTHOR, TextOf(Find(summary.get(), GSF_META_NAME_CREATOR)));
  sink.Set(ContentField::SUBJECT, TextOf(Find(summary.get(), GSF_META_NAME_SUBJECT)));
  sink.Set(ContentField::DESCRIPTION, TextOf(Find(summary.get(), GSF_META_NAME_DESCRIPTION)));
  sink.Set(ContentField::KEYWORDS, KeywordsOf(Find(summary.get(), GSF_META_NAME_KEYWORDS)));
  const GValue* created = Find(summary.get(), GSF_META_NAME_DATE_CREATED);
  if (created != nullptr && VAL_IS_GSF_TIMESTAMP(created)) {
    const auto* timestamp = static_cast<const GsfTimestamp*>(g_value_get_boxed(created));
    if (timestamp != nullptr) {
      sink.Set(ContentField::CREATED, int64_t{timestamp->timet});
    }
  }
  const GValue* pages = Find(summary.get(), GSF_META_NAME_PAGE_COUNT);
  if (pages != nullptr && G_VALUE_HOLDS_INT(pages) && g_value_get_int(pages) > 0) {
    sink.Set(ContentField::PAGES, int64_t{g_value_get_int(pages)});
  }
}

}  // namespace fileindexd
