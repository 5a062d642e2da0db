// SPDX-License-Identifier: GPL-2.0-or-later
#include <gmime/gmime.h>

#include "extract/document_stream.h"
#include "extract/format.h"
#include "extract/gobject.h"
#include "extract/mail_parts.h"
#include "extract/memory_file.h"
#include "extract/nested.h"

namespace fileindexd {

namespace {

constexpr char MAILBOX_MARK[] = "From ";

void StartLibrary() {
  static const bool is_started = [] {
    SilenceGlib();
    g_mime_init();
    return true;
  }();
  (void)is_started;
}

// Parts' bytes are fetched from the file when they are wanted, so that a big attachment lies in no
// memory before.
GOwned<GMimeParser> ParserOf(const DocumentStream& file, int64_t size, GMimeFormat format) {
  StartLibrary();
  // Bounded: where the file ends is forgotten by the C library when a part is fetched.
  const GOwned<GMimeStream> stream(g_mime_stream_file_new_with_bounds(file.stream, 0, size));
  g_mime_stream_file_set_owner(GMIME_STREAM_FILE(stream.get()), FALSE);
  GOwned<GMimeParser> parser(g_mime_parser_new_with_stream(stream.get()));
  g_mime_parser_set_format(parser.get(), format);
  g_mime_parser_set_persist_stream(parser.get(), TRUE);
  return parser;
}

bool HasHeaders(GMimeMessage* message) {
  for (const char* name : {"From", "To", "Subject", "Date", "Message-ID", "Received",
                           "Content-Type", "MIME-Version"}) {
    if (g_mime_object_get_header(GMIME_OBJECT(message), name) != nullptr) {
      return true;
    }
  }
  return false;
}

void SetFields(GMimeMessage* message, ContentSink& sink) {
  sink.Set(ContentField::FROM, AddressesOf(g_mime_message_get_from(message)));
  sink.Set(ContentField::TO, AddressesOf(g_mime_message_get_to(message)));
  sink.Set(ContentField::TO, AddressesOf(g_mime_message_get_cc(message)));
  sink.Set(ContentField::TO, AddressesOf(g_mime_message_get_bcc(message)));
  const char* subject = g_mime_message_get_subject(message);
  sink.Set(ContentField::SUBJECT, subject != nullptr ? std::string_view(subject) : "");
  GDateTime* sent = g_mime_message_get_date(message);
  if (sent != nullptr) {
    sink.Set(ContentField::SENT, int64_t{g_date_time_to_unix(sent)});
  }
}

}  // namespace

bool ReadMessage(const Document& document, ContentSink& sink, std::string& why) {
  sink.SetKind(Kind::DOCUMENT);
  const Allowance allowance;
  const bool is_marked = FirstBytes(document, 5) == MAILBOX_MARK;
  const DocumentStream file(document);
  if (file.HasFailed()) {
    why = "cannot be read";
    return false;
  }
  const GOwned<GMimeParser> parser =
      ParserOf(file, document.size, is_marked ? GMIME_FORMAT_MBOX : GMIME_FORMAT_MESSAGE);
  const GOwned<GMimeMessage> message(g_mime_parser_construct_message(parser.get(), nullptr));
  if (!message || !HasHeaders(message.get())) {
    why = "not a message";
    return false;
  }
  SetFields(message.get(), sink);
  MailParts parts(document, sink);
  parts.Take(message.get());
  if (parts.is_encrypted && sink.content.text.empty()) {
    why = "encrypted";
  }
  return why.empty();
}

// The headers of its messages are words among others: no single one is the mailbox's own.
bool ReadMailbox(const Document& document, ContentSink& sink, std::string& why) {
  sink.SetKind(Kind::DOCUMENT);
  const Allowance allowance;
  if (FirstBytes(document, 5) != MAILBOX_MARK) {
    why = "not a mailbox";
    return false;
  }
  const DocumentStream file(document);
  if (file.HasFailed()) {
    why = "cannot be read";
    return false;
  }
  const GOwned<GMimeParser> parser = ParserOf(file, document.size, GMIME_FORMAT_MBOX);
  while (!sink.IsFull() && !allowance.IsSpent() && !file.HasFailed() &&
         g_mime_parser_eos(parser.get()) == 0) {
    const GOwned<GMimeMessage> message(g_mime_parser_construct_message(parser.get(), nullptr));
    if (!message) {
      why = "damaged";
      return false;
    }
    AddHeaderText(message.get(), sink);
    MailParts(document, sink).Take(message.get());
  }
  return true;
}

}  // namespace fileindexd
