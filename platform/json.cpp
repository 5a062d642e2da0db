// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/json.h"

#include <json/reader.h>
#include <json/writer.h>

#include <cstring>
#include <exception>
#include <memory>
#include <sstream>

namespace fileindexd::Json {

namespace {

::Json::CharReader* MakeReader() {
  ::Json::CharReaderBuilder builder;
  builder["collectComments"] = false;
  builder["allowComments"] = false;
  builder["allowTrailingCommas"] = false;
  builder["allowSpecialFloats"] = false;
  builder["strictRoot"] = false;
  builder["skipBom"] = false;
  return builder.newCharReader();
}

::Json::StreamWriter* MakeWriter() {
  ::Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  builder["emitUTF8"] = true;
  return builder.newStreamWriter();
}

// The reader lets two things through that it is told to refuse: comments inside an object or an
// array, and a comma behind an empty key's value. Outside of strings neither a slash nor a comma
// before a closing bracket has any place in JSON.
bool HasCommentOrTrailingComma(const std::string& text) {
  bool in_string = false;
  bool after_comma = false;
  for (size_t i = 0; i < text.size(); ++i) {
    const char byte = text[i];
    if (in_string) {
      i += byte == '\\' ? 1 : 0;
      in_string = byte != '"';
    } else if (byte == '/' || (after_comma && (byte == '}' || byte == ']'))) {
      return true;
    } else if (byte == '"') {
      in_string = true;
      after_comma = false;
    } else if (strchr(" \t\r\n", byte) == nullptr) {
      after_comma = byte == ',';
    }
  }
  return false;
}

bool IsBlank(const std::string& text, size_t from) {
  return text.find_first_not_of(" \t\r\n", from) == std::string::npos;
}

}  // namespace

bool Value::fromString(const std::string& text) {
  // A reader made anew for each line costs three to four times the parse itself.
  thread_local const std::unique_ptr<::Json::CharReader> reader(MakeReader());

  try {
    ::Json::Value parsed;
    if (HasCommentOrTrailingComma(text) ||
        !reader->parse(text.data(), text.data() + text.size(), &parsed, nullptr)) {
      return false;
    }

    // The reader stops at a NUL or at a byte that begins no token, and calls that the end.
    if (!IsBlank(text, static_cast<size_t>(parsed.getOffsetLimit()))) {
      return false;
    }

    swap(parsed);
    return true;
  } catch (const std::exception&) {  // nesting beyond the reader's limit
    return false;
  }
}

std::string Value::toString() const {
  thread_local const std::unique_ptr<::Json::StreamWriter> writer(MakeWriter());

  std::ostringstream text;
  writer->write(*this, &text);
  return text.str();
}

}  // namespace fileindexd::Json
