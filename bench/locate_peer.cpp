// SPDX-License-Identifier: GPL-2.0-or-later
#include "bench/locate_peer.h"

#include <sys/wait.h>
#include <unistd.h>

#include <fstream>

#include "bench/daemon.h"
#include "bench/measure.h"

namespace fileindexd {

namespace {

constexpr const char* PROGRAM = "/usr/bin/plocate";
constexpr const char* BUILDER = "/usr/sbin/plocate-build";

void MakeDatabase(const std::string& names_file, const std::string& database) {
  const Ended ended =
      RunProgram({BUILDER, "--plaintext", "--require-visibility", "no", names_file, database});
  if (ended.status != 0) {
    Fail("plocate-build failed on " + names_file);
  }
}

}  // namespace

bool LocatePeer::IsInstalled() {
  return access(PROGRAM, X_OK) == 0 && access(BUILDER, X_OK) == 0;
}

LocatePeer::LocatePeer(const std::string& names_file, const std::string& folder)
    : database(folder + "/names.plocate"),
      one_line(folder + "/one-line.plocate"),
      output(folder + "/plocate-said") {
  const std::string line = folder + "/one-line";
  std::ofstream(line) << "nothing\n";
  MakeDatabase(names_file, database);
  MakeDatabase(line, one_line);
}

uint64_t LocatePeer::CountIn(const std::string& of, const std::string& part) const {
  const Ended ended = RunProgram({PROGRAM, "-c", "-i", "-d", of, part}, output);
  uint64_t count = 0;
  // It ends with 1 where it finds nothing.
  if (!WIFEXITED(ended.status) || WEXITSTATUS(ended.status) > 1 ||
      !(std::ifstream(output) >> count)) {
    Fail("plocate failed");
  }
  return count;
}

double LocatePeer::TimeOfCount(const std::string& part) const {
  return TimeOf([&] { (void)CountIn(database, part); });
}

double LocatePeer::TimeOfStart(const std::string& part) const {
  return TimeOf([&] { (void)CountIn(one_line, part); });
}

}  // namespace fileindexd
