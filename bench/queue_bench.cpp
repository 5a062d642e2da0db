// SPDX-License-Identifier: GPL-2.0-or-later
// Draining a queue file into a tree, against parsing its lines and nothing else.
#include <unistd.h>

#include <cstdio>
#include <fstream>
#include <memory>

#include "bench/measure.h"
#include "bench/scratch.h"
#include "optree/op_tree.h"
#include "optree/queue.h"

namespace fileindexd {

namespace {

constexpr uint64_t LINES = 5000;
constexpr uint64_t FOLDERS = 50;
constexpr const char* SHARE = "/volume1/projects";

std::string Line(const std::string& path) {
  return R"({"event":8,"path":")" + path + R"("})";
}

// Each folder's own line stands before those of its files.
std::vector<std::string> MakeLines(uint64_t lines, uint64_t folders) {
  std::vector<std::string> made;
  char name[64];
  for (uint64_t folder = 0; folder < folders; ++folder) {
    snprintf(name, sizeof(name), "/department/folder-%04u", static_cast<unsigned>(folder));
    const std::string path = SHARE + std::string(name);
    made.push_back(Line(path));
    for (uint64_t file = 1; file < lines / folders; ++file) {
      snprintf(name, sizeof(name), "/report-%06u.odt", static_cast<unsigned>(file));
      made.push_back(Line(path + name));
    }
  }
  return made;
}

void WriteQueue(const std::string& path, const std::vector<std::string>& lines) {
  std::ofstream queue(path, std::ios::binary);
  for (const std::string& line : lines) {
    queue << line << '\n';
  }
  queue.close();
  if (!queue) {
    Fail("cannot write " + path);
  }
}

uint64_t CountNodes(OpTree& tree) {
  uint64_t nodes = 0;
  const OpTree::iterator end = tree.end();
  for (OpTree::iterator it = tree.begin(); it != end; ++it) {
    ++nodes;
  }
  return nodes;
}

double DrainTime(const std::string& queue_path, const std::vector<std::string>& lines) {
  WriteQueue(queue_path, lines);

  std::unique_ptr<OpTree> tree;
  const double seconds = TimeOf([&] { tree.reset(ReadQueue(SHARE, queue_path)); });

  if (tree == nullptr || CountNodes(*tree) != lines.size()) {
    Fail("the drained tree does not hold what the queue held");
  }
  unlink((queue_path + ".tmp").c_str());
  return seconds;
}

double ParseTime(const std::vector<std::string>& lines) {
  uint64_t parsed = 0;
  const double seconds = TimeOf([&] {
    for (const std::string& line : lines) {
      Json::Value value;
      parsed += value.fromString(line) ? 1 : 0;
    }
  });

  if (parsed != lines.size()) {
    Fail("a line did not parse");
  }
  return seconds;
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  using namespace fileindexd;  // NOLINT(google-build-using-namespace): the program itself
  const uint64_t divisor = DivisorFrom(argc, argv);
  const std::vector<std::string> lines =
      MakeLines(Scaled(LINES, divisor, 20), Scaled(FOLDERS, divisor, 2));
  const ScratchFolder scratch;

  std::vector<double> drains;
  std::vector<double> parses;
  for (int round = 0; round < ROUNDS; ++round) {
    drains.push_back(DrainTime(scratch.path + "/queue", lines));
    parses.push_back(ParseTime(lines));
  }

  PrintTimes("drain " + std::to_string(lines.size()) + " lines / parse them", Median(drains),
             Median(parses), 3);
  return 0;
}
