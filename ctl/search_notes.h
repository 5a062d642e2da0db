// SPDX-License-Identifier: GPL-2.0-or-later
// What is said beside the hits of a search: where they would stand for people, else on standard
// error.
#pragma once

#include <optional>

#include "ctl/terminal/screen.h"
#include "index/search.h"
#include "state/settings.h"

namespace fileindexd {

// Of a question without any hit: a folder that is not there, an operator in small letters, a
// question that has some, or what in it is no field. People are told at least that there is none.
void TellNothingFound(const Question& question, const Answer& answer,
                      const std::optional<Screen>& screen);

// Shares whose words are not yet those of the language that is wanted.
void TellOfWords(const Settings& settings, const Answer& answer,
                 const std::optional<Screen>& screen);

// There are hits, and the question leaves them all out. On a screen alone.
void TellNothingBehind(const Question& question, const Answer& answer,
                       const std::optional<Screen>& screen);

// Nobody has said how many were wanted.
void TellOfMore(uint64_t shown, const std::optional<Screen>& screen);

}  // namespace fileindexd
