// SPDX-License-Identifier: GPL-2.0-or-later
// The JSON value that crosses the seam: jsoncpp's own, with parsing and writing as members.
//
// All readers (`asString`, `asBool`, `asUInt`, `asInt64`, `isMember`, `get`) behave as jsoncpp
// documents them and throw a std::exception where it does: `asString` of an object or an array,
// `isMember` and `get` on anything that is neither an object nor null.
#pragma once

#include <json/value.h>

#include <string>
#include <utility>

namespace fileindexd::Json {

using ::Json::arrayValue;
using ::Json::nullValue;
using ::Json::objectValue;
using ::Json::stringValue;
using ::Json::uintValue;
using ::Json::ValueType;

class Value : public ::Json::Value {
 public:
  using ::Json::Value::Value;
  Value() = default;
  // Implicit: what `get` and `operator[]` return is the base, and is used as a Value.
  Value(const ::Json::Value& other) : ::Json::Value(other) {}        // NOLINT(runtime/explicit)
  Value(::Json::Value&& other) : ::Json::Value(std::move(other)) {}  // NOLINT(runtime/explicit)

  // Parses a whole text: one value of any kind, white space around it, nothing else. No comments,
  // no trailing commas, no special numbers; the last of equal keys holds; bytes that are not UTF-8
  // are kept. False on anything else, the value unchanged. Never throws.
  bool fromString(const std::string& text);

  // The value on one line, without a newline at its end. Bytes that are not UTF-8 stay as they are.
  std::string toString() const;
};

}  // namespace fileindexd::Json
