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

size_t EndOfDigits(const std::string& text, size_t at) {
  while (text[at] >= '0' && text[at] <= '9') {
    ++at;
  }
  return at;
}

// Behind the number that begins there; npos where none does.
size_t EndOfNumber(const std::string& text, size_t at) {
  const size_t whole = at + (text[at] == '-' ? 1 : 0);
  size_t end = EndOfDigits(text, whole);
  if (end == whole || (text[whole] == '0' && end > whole + 1)) {
    return std::string::npos;
  }

  if (text[end] == '.') {
    const size_t fraction = end + 1;
    end = EndOfDigits(text, fraction);
    if (end == fraction) {
      return std::string::npos;
    }
  }
  if (text[end] == 'e' || text[end] == 'E') {
    const size_t sign = end + 1;
    const size_t exponent = sign + (text[sign] == '-' || text[sign] == '+' ? 1 : 0);
    end = EndOfDigits(text, exponent);
    if (end == exponent) {
      return std::string::npos;
    }
  }
  return end;
}

bool BeginsNumber(char byte) {
  return (byte >= '0' && byte <= '9') || byte == '-' || byte == '+';
}

// The reader lets three things through that are no JSON: comments inside an object or an array, a
// comma behind an empty key's value, and numbers that lack a part or have a zero or a plus in
// front. Outside of strings neither a slash nor a comma before a closing bracket has any place.
bool HasWhatTheReaderLetsThrough(const std::string& text) {
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
    } else if (BeginsNumber(byte)) {
      const size_t end = EndOfNumber(text, i);
      if (end == std::string::npos) {
        return true;
      }
      i = end - 1;
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
    if (HasWhatTheReaderLetsThrough(text) ||
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
