// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/search.h"

#include <algorithm>
#include <deque>
#include <iterator>
#include <set>
#include <system_error>
#include <thread>
#include <utility>

#include "index/asked.h"
#include "index/asked_share.h"
#include "index/suggestion.h"

namespace fileindexd {

namespace {

constexpr uint64_t MOST_HITS = UINT64_MAX / 4;

// Side by side: a slow share holds up no other. The last one is asked by this thread.
void AskShares(const Question& question, const Asked& asked, const HitOrder& order, uint64_t wanted,
               std::deque<AskedShare>& shares) {
  std::vector<std::thread> threads;
  for (AskedShare& share : shares) {
    const auto ask = [&] { share.Ask(question, asked, order, wanted); };
    if (&share == &shares.back()) {
      ask();
      break;
    }
    try {
      threads.emplace_back(ask);
    } catch (const std::system_error&) {
      ask();  // no more threads: one after the other
    }
  }
  for (std::thread& thread : threads) {
    thread.join();
  }
}

// A suggestion that has no hit either is none.
bool HasHits(Question question, const std::string& text) {
  question.text = text;
  question.offset = 0;
  question.limit = 1;
  question.count_all = false;
  question.suggests = false;
  Answer answer;
  std::string error;
  return Ask(question, answer, error) && !answer.hits.empty();
}

}  // namespace

bool Ask(const Question& question, Answer& answer, std::string& error) {
  Asked asked;
  if (!asked.Read(question, error)) {
    return false;
  }

  const uint64_t offset = std::min(question.offset, MOST_HITS);
  const uint64_t limit = std::min(question.limit, MOST_HITS);
  const uint64_t wanted = limit == 0 ? 0 : offset + limit;
  const HitOrder order = {question.sort, question.reverse};
  std::deque<AskedShare> shares;
  for (const std::string& share :
       std::set<std::string>(question.shares.begin(), question.shares.end())) {
    shares.emplace_back(share);
  }
  if (!shares.empty()) {
    AskShares(question, asked, order, wanted, shares);
  }

  Answer made;
  BestHits best(wanted, order);
  for (AskedShare& share : shares) {
    made.total += share.total;
    std::move(share.failures.begin(), share.failures.end(), std::back_inserter(made.failures));
    for (Hit& hit : share.hits) {
      best.Add(std::move(hit));
    }
  }
  best.Cut();
  const auto skipped = static_cast<std::ptrdiff_t>(std::min<uint64_t>(offset, best.hits.size()));
  made.hits.assign(std::make_move_iterator(best.hits.begin() + skipped),
                   std::make_move_iterator(best.hits.end()));
  for (AskedShare& share : shares) {
    share.Complete(made.hits);
  }
  if (made.total == 0 && question.suggests) {
    made.suggestion = Suggest(asked, shares);
    made.suggestion =
        !made.suggestion.empty() && HasHits(question, made.suggestion) ? made.suggestion : "";
  }
  answer = std::move(made);
  return true;
}

}  // namespace fileindexd
