// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/request.h"

#include <json/reader.h>

#include <exception>
#include <memory>

#include "state/layout.h"

namespace fileindexd {

namespace {

// Empty on success, else what is wrong.
std::string ReadShares(const Json::Value& shares, std::vector<std::string>& names) {
  if (shares.isNull()) {
    return {};
  }
  if (!shares.isArray()) {
    return "shares: not an array";
  }

  for (const Json::Value& share : shares) {
    if (!share.isString() || !IsValidShareName(share.asString())) {
      return "shares: not the name of a share";
    }
    names.push_back(share.asString());
  }
  return {};
}

}  // namespace

std::string ReadRequest(const std::string& text, Request& request) {
  Json::CharReaderBuilder builder;
  builder["collectComments"] = false;
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
  try {
    Json::Value value;
    if (!reader->parse(text.data(), text.data() + text.size(), &value, nullptr) ||
        !value.isObject()) {
      return "not a JSON object";
    }
    if (value["type"] == "status") {
      request.type = Request::Type::STATUS;
      return {};
    }
    if (value["type"] == "sync") {
      request.type = Request::Type::SYNC;
      return ReadShares(value["shares"], request.shares);
    }
    return "type: neither \"status\" nor \"sync\"";
  } catch (const std::exception& error) {  // nested too deeply
    return error.what();
  }
}

}  // namespace fileindexd
