// SPDX-License-Identifier: GPL-2.0-or-later
// reindex, event.
#include <json/reader.h>

#include <exception>
#include <memory>
#include <optional>

#include "ctl/commands.h"
#include "ctl/output.h"
#include "ctl/places.h"
#include "state/event_codes.h"
#include "state/queue_content.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

// The same JSON on one line. None when it is none.
std::optional<std::string> CompactJson(const std::string& text) {
  Json::CharReaderBuilder builder;
  builder["collectComments"] = false;
  builder["allowComments"] = false;
  builder["allowTrailingCommas"] = false;
  builder["failIfExtra"] = true;
  const std::unique_ptr<Json::CharReader> reader(builder.newCharReader());

  try {
    Json::Value value;
    if (!reader->parse(text.data(), text.data() + text.size(), &value, nullptr)) {
      return std::nullopt;
    }

    return ToText(value);
  } catch (const std::exception&) {  // nesting beyond the reader's limit
    return std::nullopt;
  }
}

}  // namespace

int Reindex(const Arguments& arguments) {
  Session session;
  std::string path;
  if (!session.Open() || !ResolveInShare(*session.settings, arguments.path, path)) {
    return EXIT_FAILED;
  }

  std::string error;
  return AppendEvent(session.settings->ShareOfPath(path)->name, CUSTOM_EVENT_REINDEX, path, {},
                     Durability::NONE, error)
             ? EXIT_DONE
             : Fail(EXIT_FAILED, "%s", error.c_str());
}

int Event(const Arguments& arguments) {
  const std::optional<uint32_t> code = EventCode(arguments.code);
  if (!code) {
    return Fail(EXIT_USAGE, "event: %s: not an event's code or name", arguments.code.c_str());
  }
  std::string data;
  if (arguments.data) {
    const std::optional<std::string> compact = CompactJson(*arguments.data);
    if (!compact) {
      return Fail(EXIT_USAGE, "event: --data: not JSON: %s", arguments.data->c_str());
    }
    data = *compact;
  }

  Session session;
  if (!session.Open()) {
    return EXIT_FAILED;
  }
  const Share* share = session.FindShare(arguments.share);
  if (share == nullptr) {
    return EXIT_FAILED;
  }
  std::string error;
  const std::string line = EventLine(*code, arguments.path, arguments.path_old, data);
  return AppendToQueue(share->name, {line}, error) ? EXIT_DONE
                                                   : Fail(EXIT_FAILED, "%s", error.c_str());
}

}  // namespace fileindexd
