// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/client.h"

#include "ctl/output.h"

namespace fileindexd {

Reply AskDaemon(const std::string& type, const Json::Value& data) {
  Json::Value command(Json::objectValue);
  command["type"] = type;
  command["data"] = data;
  return SendToDaemon(ToText(command));
}

int CodeOfReply(Reply reply, const std::string& subject) {
  switch (reply) {
    case Reply::DONE:
    case Reply::NOT_RUNNING:
      return EXIT_DONE;
    case Reply::REFUSED:
      return Fail(EXIT_FAILED, "%s: the daemon could not do it, its log tells why",
                  subject.c_str());
    case Reply::NO_ANSWER:
      break;
  }
  return Fail(EXIT_NO_DAEMON, "%s: the daemon does not answer", subject.c_str());
}

int CodeOfNeededReply(Reply reply, const std::string& subject) {
  if (reply == Reply::NOT_RUNNING) {
    return Fail(EXIT_NO_DAEMON, "%s: the daemon does not run", subject.c_str());
  }

  return CodeOfReply(reply, subject);
}

}  // namespace fileindexd
