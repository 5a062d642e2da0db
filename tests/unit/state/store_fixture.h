// SPDX-License-Identifier: GPL-2.0-or-later
// A state database that holds a share and a folder, for those who damage it.
#pragma once

#include <sys/types.h>

#include <array>
#include <functional>
#include <string>

#include "tests/unit/state/fixture.h"

namespace fileindexd {

class StoreDamageTest : public StateTest {
 protected:
  StoreDamageTest();

  static void Sql(const std::string& path, const char* sql);
  void ExpectAllThere(StateStore& store);

  std::string database;
  std::string copy;
};

// Another program, which SQLite would not let share anything with this one. It is there before this
// one opens a database, opens it when it is told to, does its deed, and ends.
class OtherProgram {
 public:
  using Deed = std::function<bool(StateStore&)>;
  explicit OtherProgram(const Deed& deed);
  explicit OtherProgram(const std::string& folder);  // that it adds
  OtherProgram(const OtherProgram&) = delete;
  OtherProgram& operator=(const OtherProgram&) = delete;
  ~OtherProgram();
  void Act();  // a test failure if the deed fails

 private:
  std::array<int, 2> ends{};
  pid_t child = -1;
};

}  // namespace fileindexd
