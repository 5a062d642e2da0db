// SPDX-License-Identifier: GPL-2.0-or-later
// Random questions, and beside each what it means, said in the plainest way: a test of one file.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "tests/unit/index/plain_world.h"

namespace fileindexd {

using PlainTest = std::function<bool(const PlainFile&)>;

struct PlainQuestion {
  std::string text;
  PlainTest test;
  bool is_positive = true;  // says what to find, not only what not to
};

class QuestionMaker {
 public:
  QuestionMaker(PlainWorld& of_world, unsigned seed) : world(of_world), chance(seed) {}

  PlainQuestion Tree(size_t depth);

  PlainWorld& world;
  Chance chance;

 private:
  PlainQuestion Leaf();
  PlainQuestion Words();
  PlainQuestion NamePattern();
  PlainQuestion ExactName();
  PlainQuestion PathPiece();
  PlainQuestion KindOrEnding();
  PlainQuestion Size();
  PlainQuestion Time();
  PlainQuestion Number();
  PlainQuestion Near();
  PlainQuestion Is();
  PlainQuestion Has();
  PlainQuestion Stage();
  PlainQuestion Place();
  PlainQuestion Negated(const PlainQuestion& of);
  PlainQuestion Group(bool any, size_t depth);
};

}  // namespace fileindexd
