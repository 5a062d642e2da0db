// SPDX-License-Identifier: GPL-2.0-or-later
// The parts of one message: its text, and what is attached.
#pragma once

#include <gmime/gmime.h>

#include "extract/format.h"
#include "extract/nested.h"

namespace fileindexd {

class MailParts {
 public:
  MailParts(const Document& read_document, ContentSink& text_sink)
      : document(read_document), sink(text_sink) {}

  // Adds the text of a message's body, the names of what is attached and the text of that.
  void Take(GMimeMessage* message);

  bool is_encrypted = false;

 private:
  void TakeObject(GMimeObject* object, int level);
  void TakeMultipart(GMimeMultipart* multipart, int level);
  void TakeInnerMessage(GMimeMessage* message, int level);
  void TakePart(GMimePart* part);
  void AddBody(GMimePart* part);
  void AddAttachment(GMimePart* part, const std::string& name);

  const Document& document;
  ContentSink& sink;
  Allowance allowance;
  int parts = 0;
  bool has_body = false;  // of these alternatives one is read: of the rest what is attached counts
};

// One line for each header that is there: from, to, subject.
void AddHeaderText(GMimeMessage* message, ContentSink& sink);
std::string AddressesOf(InternetAddressList* list);

}  // namespace fileindexd
