// SPDX-License-Identifier: GPL-2.0-or-later
// The databases that questions are put to, filled by the libraries, without any daemon.
#pragma once

#include <string>

#include "bench/question_corpus.h"

namespace fileindexd {

// Makes the shares of the corpus in the state folder that is in force, their roots, and fills their
// entries and contents; the same rows into a database of the bare engine in `bare_folder`; and, in
// `names_file`, all names, one a line. Every failure ends the program.
void FillQuestions(const QuestionCorpus& corpus, const std::string& bare_folder,
                   const std::string& names_file);

}  // namespace fileindexd
