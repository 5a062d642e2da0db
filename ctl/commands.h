// SPDX-License-Identifier: GPL-2.0-or-later
// The commands, and what the command line gave them.
//
// Each takes the arguments as they were written, writes its results and its error line, and returns
// the exit code (output.h).
#pragma once

#include <optional>
#include <string>
#include <vector>

namespace fileindexd {

// Filled by the command line; a command reads those that it has. None: not given.
struct Arguments {
  std::string share;
  std::string path;
  std::string code;   // of an event
  std::string level;  // "debug" or "error"
  std::string query;
  std::optional<std::string> path_old;
  std::optional<std::string> data;
  std::optional<std::string> until;
  std::optional<std::string> duration;
  std::optional<std::string> in_share;
  std::optional<std::string> kind;
  std::optional<std::string> under;
  std::optional<std::string> limit;
  std::optional<std::string> offset;
  std::optional<std::string> timeout;
  std::optional<std::string> sort;
  std::optional<std::string> question;  // of info
  std::optional<std::string> by;
  std::optional<std::string> largest;
  std::optional<std::string> growth;
  std::optional<std::string> language;
  std::optional<bool> document;
  std::optional<bool> audio;
  std::optional<bool> video;
  std::optional<bool> photo;
  std::vector<std::string> excludes;
  bool no_excludes = false;
  bool all = false;
  bool json = false;
  bool count = false;
  bool repair = false;
  bool nul_ended = false;
  bool follow = false;
  bool wait = false;
  bool retry = false;
  bool reverse = false;
  bool terms = false;
  bool duplicates = false;
};

using Command = int (*)(const Arguments& arguments);

int ShareAdd(const Arguments& arguments);
int ShareRemove(const Arguments& arguments);
int ShareList(const Arguments& arguments);
int ShareAccept(const Arguments& arguments);
int ShareSet(const Arguments& arguments);

int FolderAdd(const Arguments& arguments);
int FolderSet(const Arguments& arguments);
int FolderRemove(const Arguments& arguments);
int FolderList(const Arguments& arguments);

int Reindex(const Arguments& arguments);
int Event(const Arguments& arguments);

int Pause(const Arguments& arguments);
int Resume(const Arguments& arguments);
int LogLevel(const Arguments& arguments);
int WorkerDrop(const Arguments& arguments);
int WorkerRevive(const Arguments& arguments);

int Status(const Arguments& arguments);
int Search(const Arguments& arguments);
int Dump(const Arguments& arguments);
int Verify(const Arguments& arguments);
int Failed(const Arguments& arguments);
int Info(const Arguments& arguments);
int Stats(const Arguments& arguments);

}  // namespace fileindexd
