// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/query_reach.h"

#include <algorithm>
#include <cstdint>
#include <iterator>
#include <set>

#include "index/search.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

// Of the entries of a share: none of them answers, some may, all do. In this order.
enum class Reach : uint8_t { NONE, SOME, ALL };

Reach Opposite(Reach reach) {
  return reach == Reach::NONE ? Reach::ALL : reach == Reach::ALL ? Reach::NONE : Reach::SOME;
}

Reach ReachOfFolder(const std::string& path, const std::string& share, const Question& question) {
  const auto root = question.roots.find(share);
  if (root == question.roots.end()) {
    return Reach::SOME;
  }
  if (Covers(path, root->second)) {
    return Reach::ALL;
  }
  return Covers(root->second, path) ? Reach::SOME : Reach::NONE;
}

Reach ReachOf(const QueryNode& node, const std::string& share, const Question& question) {
  switch (node.part) {
    case Part::SHARE:
      return std::find(node.names.begin(), node.names.end(), share) == node.names.end()
                 ? Reach::NONE
                 : Reach::ALL;
    case Part::UNDER:
      return ReachOfFolder(node.names.front(), share, question);
    case Part::NOT:
      return Opposite(ReachOf(node.below.front(), share, question));
    case Part::AND:
    case Part::OR:
      break;
    default:
      return Reach::SOME;
  }
  Reach reach = node.part == Part::AND ? Reach::ALL : Reach::NONE;
  for (const QueryNode& below : node.below) {
    const Reach of_one = ReachOf(below, share, question);
    reach = node.part == Part::AND ? std::min(reach, of_one) : std::max(reach, of_one);
  }
  return reach;
}

}  // namespace

std::vector<std::string> ReachedShares(const QueryNode& tree, const Question& question) {
  const std::set<std::string> shares(question.shares.begin(), question.shares.end());
  std::vector<std::string> reached;
  std::copy_if(
      shares.begin(), shares.end(), std::back_inserter(reached),
      [&](const std::string& share) { return ReachOf(tree, share, question) != Reach::NONE; });
  return reached;
}

}  // namespace fileindexd
