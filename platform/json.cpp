// SPDX-License-Identifier: GPL-2.0-or-later
#include "platform/json.h"

#include <json/reader.h>
#include <json/writer.h>

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
  return builder.newCharReader();
}

::Json::StreamWriter* MakeWriter() {
  ::Json::StreamWriterBuilder builder;
  builder["indentation"] = "";
  builder["emitUTF8"] = true;
  return builder.newStreamWriter();
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
    if (!reader->parse(text.data(), text.data() + text.size(), &parsed, nullptr)) {
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
