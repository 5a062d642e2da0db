// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/mail_parts.h"

#include <array>
#include <string>
#include <utility>

#include "base/ascii.h"
#include "extract/charset.h"
#include "extract/choice.h"
#include "extract/gobject.h"
#include "extract/memory_file.h"

namespace fileindexd {

namespace {

constexpr int MAX_LEVELS = 50;  // of parts within parts
constexpr int MAX_PARTS = 10'000;

// Sealed for anybody to open. Where nothing is said, it is encrypted.
bool IsOpen(GMimeObject* object) {
  const char* type = g_mime_object_get_content_type_parameter(object, "smime-type");
  const std::string name = LowerText(type != nullptr ? type : "");
  return name == "signed-data" || name == "compressed-data" || name == "certs-only" ||
         name == "signed-receipt";
}

// A document by its type alone, which has a reader; texts are bodies.
bool IsOfFormat(GMimeObject* object) {
  GMimeContentType* type = g_mime_object_get_content_type(object);
  char* mime = type != nullptr ? g_mime_content_type_get_mime_type(type) : nullptr;
  const std::string name = LowerText(mime != nullptr ? mime : "");
  const bool is_known = name.starts_with("application/") && FormatOfMime(name) != Format::NONE;
  g_free(mime);
  return is_known;
}

bool IsType(GMimeObject* object, const char* type, const char* subtype) {
  GMimeContentType* content_type = g_mime_object_get_content_type(object);
  return content_type != nullptr && g_mime_content_type_is_type(content_type, type, subtype) != 0;
}

// Empty where nobody looked at the text.
std::string CharsetOf(GMimePart* part) {
  const char* label = g_mime_object_get_content_type_parameter(GMIME_OBJECT(part), "charset");
  const std::string charset = label != nullptr ? MeantCharset(label) : "";
  return charset == "UNKNOWN-8BIT" ? "" : charset;
}

// Of the file that is attached; empty: none.
std::string NameOf(GMimeObject* object) {
  const char* name = g_mime_object_get_content_disposition_parameter(object, "filename");
  if (name == nullptr) {
    name = g_mime_object_get_content_type_parameter(object, "name");
  }
  return name != nullptr ? name : "";
}

// Appends a part's decoded bytes, from `charset` (empty: as they are) to UTF-8, up to the bound of
// a member. Nothing where the charset is not known.
bool Decode(GMimePart* part, const std::string& charset, Allowance& allowance, MemoryFile& file) {
  GMimeDataWrapper* content = g_mime_part_get_content(part);
  GMimeStream* packed = content != nullptr ? g_mime_data_wrapper_get_stream(content) : nullptr;
  if (packed == nullptr) {
    return false;
  }
  (void)g_mime_stream_reset(packed);  // fails on no stream that can be read at all
  const GOwned<GMimeStream> stream(g_mime_stream_filter_new(packed));
  const GOwned<GMimeFilter> decoder(
      g_mime_filter_basic_new(g_mime_data_wrapper_get_encoding(content), FALSE));
  g_mime_stream_filter_add(GMIME_STREAM_FILTER(stream.get()), decoder.get());
  if (!charset.empty()) {
    const GOwned<GMimeFilter> converter(g_mime_filter_charset_new(charset.c_str(), "utf-8"));
    if (!converter) {
      return false;
    }
    g_mime_stream_filter_add(GMIME_STREAM_FILTER(stream.get()), converter.get());
  }

  std::array<char, 64 * 1024> block;
  while (file.size < Allowance::MAX_MEMBER_BYTES) {
    const ssize_t got = g_mime_stream_read(stream.get(), block.data(), block.size());
    if (got <= 0 || !allowance.TakeBytes(got) ||
        !file.Append(std::string_view(block.data(), static_cast<size_t>(got)))) {
      break;
    }
  }
  if (file.size >= Allowance::MAX_MEMBER_BYTES) {
    allowance.NoteBound();
  }
  return true;
}

bool IsMedia(GMimeObject* object) {
  return IsType(object, "image", "*") || IsType(object, "audio", "*") ||
         IsType(object, "video", "*");
}

}  // namespace

std::string AddressesOf(InternetAddressList* list) {
  char* made = list != nullptr ? internet_address_list_to_string(list, nullptr, FALSE) : nullptr;
  std::string addresses = made != nullptr ? made : "";
  g_free(made);
  return addresses;
}

void AddHeaderText(GMimeMessage* message, ContentSink& sink) {
  const auto add = [&sink](const std::string& text) {
    sink.AddText("\n");
    sink.AddText(text);
  };
  const char* subject = g_mime_message_get_subject(message);
  add(AddressesOf(g_mime_message_get_from(message)));
  add(AddressesOf(g_mime_message_get_to(message)));
  add(AddressesOf(g_mime_message_get_cc(message)));
  add(subject != nullptr ? subject : "");
  sink.AddText("\n");
}

void MailParts::Take(GMimeMessage* message) {
  GMimeObject* body = g_mime_message_get_mime_part(message);
  if (body != nullptr) {
    TakeObject(body, 0);
  }
}

void MailParts::TakeObject(GMimeObject* object, int level) {
  if (level > MAX_LEVELS || ++parts > MAX_PARTS) {
    allowance.NoteBound();
    return;
  }
  if (allowance.IsSpent()) {
    return;
  }
  if (GMIME_IS_MULTIPART_ENCRYPTED(object) || IsType(object, "application", "pkcs7-mime")) {
    is_encrypted = is_encrypted || !IsOpen(object);
  } else if (GMIME_IS_MULTIPART(object)) {
    TakeMultipart(GMIME_MULTIPART(object), level);
  } else if (GMIME_IS_MESSAGE_PART(object)) {
    sink.Set(ContentField::ATTACHMENTS, NameOf(object));
    GMimeMessage* message = g_mime_message_part_get_message(GMIME_MESSAGE_PART(object));
    if (message != nullptr) {
      TakeInnerMessage(message, level);
    }
  } else if (GMIME_IS_PART(object)) {
    TakePart(GMIME_PART(object));
  }
}

// Of alternatives the plain text is enough, but for what is attached to the others; where it is
// empty they are read.
void MailParts::TakeMultipart(GMimeMultipart* multipart, int level) {
  const int count = g_mime_multipart_get_count(multipart);
  const size_t before = sink.content.text.size();
  const bool had_body = has_body;
  int plain = -1;
  if (IsType(GMIME_OBJECT(multipart), "multipart", "alternative")) {
    for (int i = 0; i < count && plain < 0; ++i) {
      GMimeObject* object = g_mime_multipart_get_part(multipart, i);
      if (IsType(object, "text", "plain")) {
        plain = i;
        TakeObject(object, level + 1);
      }
    }
  }
  has_body = had_body || sink.content.text.size() > before;
  for (int i = 0; i < count; ++i) {
    if (i != plain) {
      TakeObject(g_mime_multipart_get_part(multipart, i), level + 1);
    }
  }
  has_body = had_body;
}

void MailParts::TakeInnerMessage(GMimeMessage* message, int level) {
  const bool had_body = std::exchange(has_body, false);
  AddHeaderText(message, sink);
  GMimeObject* body = g_mime_message_get_mime_part(message);
  if (body != nullptr) {
    TakeObject(body, level + 1);
  }
  has_body = had_body;
}

void MailParts::TakePart(GMimePart* part) {
  GMimeObject* object = GMIME_OBJECT(part);
  const std::string name = NameOf(object);
  const char* disposition = g_mime_object_get_disposition(object);
  const bool is_attached =
      (disposition != nullptr && g_ascii_strcasecmp(disposition, "attachment") == 0) ||
      !name.empty() || IsOfFormat(object);
  sink.Set(ContentField::ATTACHMENTS, name);
  if (sink.IsFull() || IsMedia(object)) {
    return;
  }
  if (IsType(object, "text", "*") && !is_attached) {
    if (!has_body) {
      AddBody(part);
    }
  } else if (is_attached && document.depth < Allowance::MAX_DEPTH && allowance.TakeMember()) {
    AddAttachment(part, name);
  }
}

void MailParts::AddBody(GMimePart* part) {
  constexpr std::string_view UTF8_MARK = "\xEF\xBB\xBF";  // stronger than what a page says itself
  const std::string charset = CharsetOf(part);
  const FormatReader reader =
      IsType(GMIME_OBJECT(part), "text", "html") ? ReadHtml : FormatReader{ReadText};
  MemoryFile text;
  if (!charset.empty()) {
    if (!text.Open() || !text.Append(UTF8_MARK)) {
      return;
    }
    if (Decode(part, charset, allowance, text)) {
      ReadNestedText(reader, text.AsDocument("", document.depth + 1), sink);
      return;
    }
  }
  if (text.Open() && Decode(part, "", allowance, text) && text.size > 0) {
    ReadNestedText(reader, text.AsDocument("", document.depth + 1), sink);
  }
}

void MailParts::AddAttachment(GMimePart* part, const std::string& name) {
  MemoryFile file;
  if (file.Open() && Decode(part, "", allowance, file) && file.size > 0) {
    ReadNestedText(ReadDocument, file.AsDocument(name, document.depth + 1), sink);
  }
}

}  // namespace fileindexd
