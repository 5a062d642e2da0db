// SPDX-License-Identifier: GPL-2.0-or-later
// A second telling of how operations fold, written for plainness alone: values instead of pointers,
// recursion instead of descent. Random batches are given to both and compared node by node.
#pragma once

#include <string>
#include <vector>

#include "platform/json.h"

namespace fileindexd {

struct ModelNode {
  int op;
  std::string path;
  Json::Value data;
  std::vector<ModelNode> children;
};

class Model {
 public:
  void Insert(int op, const std::string& path, const Json::Value& data);
  std::string Render() const;             // as Render of a tree
  std::vector<std::string> Walk() const;  // as Walk of a tree

  std::vector<ModelNode> root;  // none or one
};

}  // namespace fileindexd
