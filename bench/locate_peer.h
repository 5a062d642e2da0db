// SPDX-License-Identifier: GPL-2.0-or-later
// plocate on a database of its own, where it is installed.
#pragma once

#include <cstdint>
#include <string>

namespace fileindexd {

class LocatePeer {
 public:
  // Makes its database of the lines of `names_file` in `folder`, and one of a single line beside
  // it. Ends the program where that fails.
  LocatePeer(const std::string& names_file, const std::string& folder);

  static bool IsInstalled();

  // How many names hold `part`, whatever their letters' case.
  uint64_t Count(const std::string& part) const { return CountIn(database, part); }
  // Seconds for that, with the start of the process.
  double TimeOfCount(const std::string& part) const;
  // Seconds for the same in the database of one line: what starting costs.
  double TimeOfStart(const std::string& part) const;

 private:
  uint64_t CountIn(const std::string& of, const std::string& part) const;

  std::string database;
  std::string one_line;
  std::string output;
};

}  // namespace fileindexd
