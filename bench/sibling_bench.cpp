// SPDX-License-Identifier: GPL-2.0-or-later
// One test of a sibling while a path is inserted, against the same test on two strings made anew.
//
// An insertion below a node tests each of its children twice: whether it covers the path, then
// whether the new node covers it. So both sides make two tests for each child here. What an
// insertion costs beside its tests (its node, its copy of the list of children) counts as ours.
#include <cstdio>
#include <cstdlib>
#include <new>

#include "bench/measure.h"
#include "optree/op_tree.h"

namespace {

uint64_t allocations = 0;  // by the one thread that there is

void* Allocate(size_t size) {
  ++allocations;
  void* memory = malloc(size);
  if (memory == nullptr) {
    abort();
  }
  return memory;
}

}  // namespace

void* operator new(size_t size) {
  return Allocate(size);
}
void* operator new[](size_t size) {
  return Allocate(size);
}
void operator delete(void* memory) noexcept {
  free(memory);
}
void operator delete[](void* memory) noexcept {
  free(memory);
}
void operator delete(void* memory, size_t /*size*/) noexcept {
  free(memory);
}
void operator delete[](void* memory, size_t /*size*/) noexcept {
  free(memory);
}

namespace fileindexd {

namespace {

constexpr uint64_t SIBLINGS = 20000;
constexpr uint64_t INSERTIONS = 20;  // for each round
constexpr const char* FOLDER = "/volume1/projects/department/folder";

std::string Name(uint64_t number) {
  char name[32];
  snprintf(name, sizeof(name), "/report-%08u.odt", static_cast<unsigned>(number));
  return FOLDER + std::string(name);
}

// The tree as so many insertions leave it, without their cost.
void Fill(OpTree& tree, uint64_t siblings) {
  const Json::Value none;
  tree.root = new OpNode(OP_ADD, FOLDER, none);
  for (uint64_t number = 0; number < siblings; ++number) {
    auto* child = new OpNode(OP_ADD, Name(number), none);
    child->parent = tree.root;
    tree.root->children.push_back(child);
  }
  // Room for what is inserted, so that growing the list is not taken for the cost of a test.
  tree.root->children.reserve(siblings + INSERTIONS);
}

struct TestCost {
  double seconds = 0;        // for each test
  uint64_t allocations = 0;  // of all insertions
};

TestCost InsertionCost(uint64_t siblings) {
  OpTree tree(FOLDER);
  Fill(tree, siblings);
  std::vector<std::string> paths;
  for (uint64_t number = 0; number < INSERTIONS; ++number) {
    paths.push_back(Name(siblings + number));
  }
  const Json::Value none;

  const uint64_t before = allocations;
  const double seconds = TimeOf([&] {
    for (const std::string& path : paths) {
      tree.Insert(OP_ADD, path, none);
    }
  });
  const uint64_t after = allocations;

  if (tree.root->children.size() != siblings + INSERTIONS) {
    Fail("an insertion is missing");
  }
  return {seconds / static_cast<double>(2 * siblings * INSERTIONS), after - before};
}

bool IsCoveredByMadeAnew(const std::string& path, const std::string& name) {
  const std::string text = path + "/";
  const std::string prefix = name + "/";
  return text.starts_with(prefix);
}

double ReferenceCost(uint64_t siblings) {
  OpTree tree(FOLDER);
  Fill(tree, siblings);

  uint64_t covered = 0;
  const double seconds = TimeOf([&] {
    for (uint64_t number = 0; number < INSERTIONS; ++number) {
      const std::string path = Name(siblings + number);
      for (const OpNode* child : tree.root->children) {
        covered += IsCoveredByMadeAnew(path, child->name) ? 1 : 0;
      }
      for (const OpNode* child : tree.root->children) {
        covered += IsCoveredByMadeAnew(child->name, path) ? 1 : 0;
      }
    }
  });

  if (covered != 0) {
    Fail("a sibling covers another");
  }
  return seconds / static_cast<double>(2 * siblings * INSERTIONS);
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  using namespace fileindexd;  // NOLINT(google-build-using-namespace): the program itself
  const uint64_t siblings = Scaled(SIBLINGS, DivisorFrom(argc, argv), 20);
  (void)InsertionCost(1);  // the buffers that a thread keeps are made once

  std::vector<double> ours;
  std::vector<double> reference;
  uint64_t of_tests = 0;
  for (int round = 0; round < ROUNDS; ++round) {
    const TestCost cost = InsertionCost(siblings);
    ours.push_back(cost.seconds);
    reference.push_back(ReferenceCost(siblings));
    // What an insertion beside a single sibling allocates, it allocates whatever their number.
    of_tests = cost.allocations - InsertionCost(1).allocations;
  }

  PrintTimes("one of " + std::to_string(siblings) + " sibling tests / made anew", Median(ours),
             Median(reference), 1.0 / 3);
  const double tests = static_cast<double>(2 * siblings * INSERTIONS);
  PrintRow("heap allocations in one sibling test", std::to_string(of_tests), "-",
           static_cast<double>(of_tests) / tests, 0);
  return 0;
}
