// SPDX-License-Identifier: GPL-2.0-or-later
// What the shipped units leave to the service and its helpers: their rights, and their priority.
#include <fcntl.h>
#include <sched.h>
#include <sys/prctl.h>
#include <sys/wait.h>

#include <fstream>
#include <sstream>
#include <string>
#include <utility>
#include <vector>

#include "base/capabilities.h"
#include "pool_fixture.h"
#include "tests/unit/extract/namespaces.h"

namespace fileindexd {

namespace {

int CapabilityOfName(const std::string& name) {
  const std::pair<const char*, int> rows[] = {{"CAP_DAC_OVERRIDE", CAP_DAC_OVERRIDE},
                                              {"CAP_DAC_READ_SEARCH", CAP_DAC_READ_SEARCH},
                                              {"CAP_FOWNER", CAP_FOWNER},
                                              {"CAP_SETUID", CAP_SETUID},
                                              {"CAP_SETGID", CAP_SETGID},
                                              {"CAP_KILL", CAP_KILL},
                                              {"CAP_SETPCAP", CAP_SETPCAP}};
  for (const auto& [known, number] : rows) {
    if (name == known) {
      return number;
    }
  }
  ADD_FAILURE() << "a capability that this test does not know: " << name;
  return 0;
}

// What the unit sets `key` to, in the order of its lines.
std::vector<std::string> ValuesOf(const std::string& unit, const std::string& key) {
  std::ifstream lines(std::string(UNITS) + "/" + unit);
  std::vector<std::string> values;
  for (std::string line; std::getline(lines, line);) {
    if (line.starts_with(key + "=")) {
      values.push_back(line.substr(key.size() + 1));
    }
  }
  return values;
}

uint64_t BoundingSetOf(const std::string& unit) {
  uint64_t set = 0;
  for (const std::string& value : ValuesOf(unit, "CapabilityBoundingSet")) {
    std::istringstream names(value);
    for (std::string name; names >> name;) {
      set |= CapabilityBit(CapabilityOfName(name));
    }
  }
  EXPECT_NE(set, 0u) << unit;
  return set;
}

class UnitsTest : public PoolFixture {
 public:
  // What a service with these rights gets from its helper.
  std::string ReadWithin(const char* helper, uint64_t capabilities, const std::string& name,
                         const char* bytes) {
    int ends[2] = {-1, -1};
    EXPECT_EQ(pipe2(ends, O_CLOEXEC), 0);
    const ScopedFd reading(ends[0]);
    ScopedFd writing(ends[1]);
    const pid_t service = fork();
    if (service == 0) {
      std::string told = "rights cannot be given up";
      if (BoundCapabilities(capabilities) && KeepCapabilities(capabilities) &&
          prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0) {
        PoolOptions options;
        options.program = helper;
        OpenPool(options);
        const ExtractOutcome outcome = Run(name, bytes);
        told = Told(outcome) + ": " + outcome.content.text;
        pool.reset();
      }
      (void)!write(writing.fd, told.data(), told.size());
      _exit(0);
    }
    writing.Close();
    char told[512] = {};
    const ssize_t length = read(reading.fd, told, sizeof(told));
    int status = 0;
    EXPECT_EQ(waitpid(service, &status, 0), service);
    return {told, static_cast<size_t>(std::max<ssize_t>(length, 0))};
  }
};

TEST_F(UnitsTest, HelpersCloseTheirDoorsWithTheRightsOfTheUnits) {
  if (geteuid() != 0) {
    GTEST_SKIP() << "only the superuser has rights to give up";
  }
  for (const char* unit : {"talocontentsearchd.service.in", "fileindexd.service.in"}) {
    const uint64_t set = BoundingSetOf(unit);
    EXPECT_EQ(ReadWithin(HELPER, set, "a.txt", "some words"), "done: some words") << unit;
    EXPECT_EQ(ReadWithin(HELPER, set, "a.rtf", "{\\rtf1\\ansi some words}"), "done: some words")
        << unit;
  }
}

// Each line alone: the last one of a key counts, and helpers inherit all of them.
TEST_F(UnitsTest, ReadingContentsWaitsForEverybodyElse) {
  const std::pair<const char*, const char*> rows[] = {{"CPUSchedulingPolicy", "idle"},
                                                      {"IOSchedulingClass", "idle"},
                                                      {"CPUWeight", "idle"},
                                                      {"IOWeight", "1"}};
  for (const auto& [key, value] : rows) {
    EXPECT_EQ(ValuesOf("talocontentsearchd.service.in", key), std::vector<std::string>{value})
        << key;
  }
}

TEST_F(UnitsTest, WithoutLandlockTheyHaveAnOwnRootAllTheSame) {
  if (geteuid() != 0 || !HasUserNamespaces()) {
    GTEST_SKIP() << "takes a superuser, and user namespaces for everybody";
  }
  const uint64_t set = BoundingSetOf("talocontentsearchd.service.in");
  EXPECT_EQ(ReadWithin(WITHOUT_LANDLOCK, set, "a.txt", "some words"), "done: some words");
  EXPECT_EQ(ReadWithin(WITHOUT_LANDLOCK, set, "a.rtf", "{\\rtf1\\ansi some words}"),
            "done: some words");
}

}  // namespace

}  // namespace fileindexd
