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
#include "state/queue_writer.h"
#include "state/queued_lines.h"

namespace fileindexd {

namespace {

int Queue(const std::string& share, const std::string& line) {
  std::string error;
  if (!AppendToQueue(share, {line}, error)) {
    return Fail(EXIT_FAILED, "%s", error.c_str());
  }
  return EXIT_DONE;
}

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

  const std::string& share = session.settings->ShareOfPath(path)->name;
  return Queue(share, EventLine(CUSTOM_EVENT_REINDEX, ReindexPath(share, path)));
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
  return Queue(share->name, EventLine(*code, arguments.path, arguments.path_old, data));
}

}  // namespace fileindexd
