// SPDX-License-Identifier: GPL-2.0-or-later
// One share while it is asked: its databases, open in one read transaction, and the run on them.
#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "index/cutter_pool.h"
#include "index/kept_statements.h"
#include "index/reader.h"
#include "index/share_run.h"

namespace fileindexd {

class AskedShare {
 public:
  explicit AskedShare(std::string share_name) : name(std::move(share_name)) {}

  // Opens what there is, or stays with what is open and still in its place, and sees one state of
  // it until Release. NONE, or why not.
  IndexError Open(bool with_contents);
  // Lets go of that state, so that the writer's log can be cut; what is open stays.
  void Release();

  // Opens, and asks. A database that was replaced meanwhile, or is just being made, is opened anew.
  // Never throws; what went wrong is in `failures`.
  void Ask(const Question& question, const Asked& asked, const HitOrder& order, uint64_t wanted);

  // For hits that are shown; touches those of this share alone. What cannot be made is left out:
  // the hit is one all the same. Never throws.
  void Complete(std::vector<Hit>& hits, CutterPool& cutters);

  std::string name;
  bool has_index = true;  // false: the last question met a share that was not indexed yet
  EntryReader reader;
  KeptStatements statements;  // of its connection
  bool has_contents = false;
  IndexError contents_error = IndexError::NONE;
  std::unique_ptr<ShareRun> run;  // of the last question; goes before the connection
  std::vector<Hit> hits;          // in order
  uint64_t total = 0;
  std::vector<std::string> failures;
  AskedWords words;  // where it has contents

 private:
  int RunOnce(const Question& question, const Asked& asked, const HitOrder& order, uint64_t wanted);
  void AskTries(const Question& question, const Asked& asked, const HitOrder& order,
                uint64_t wanted);
  IndexError OpenAnew(bool with_contents);
  int Begin();
  bool IsInPlace() const;
  void Fail(const std::string& what);

  NameMarker names;

  std::chrono::steady_clock::time_point deadline = std::chrono::steady_clock::time_point::max();
};

}  // namespace fileindexd
