// SPDX-License-Identifier: GPL-2.0-or-later
#include <utility>

#include "tests/unit/search/scripted.h"

namespace fileindexd {

struct ExtractPool::Impl {};

ScriptedPool& Pool() {
  static ScriptedPool pool;
  return pool;
}

void ScriptedPool::End(ExtractOutcome::Result result, const std::string& text) {
  ExtractOutcome& outcome = outcomes.emplace_back();
  outcome.id = running.front().id;
  outcome.result = result;
  outcome.content.text = text;
  outcome.reason = "the reason";
  running.pop_front();
}

std::unique_ptr<ExtractPool> ExtractPool::Open(const PoolOptions& /*options*/, std::string& error) {
  if (!Pool().opening_error.empty()) {
    error = Pool().opening_error;
    return nullptr;
  }
  return std::unique_ptr<ExtractPool>(new ExtractPool(nullptr));
}

ExtractPool::ExtractPool(std::unique_ptr<Impl> opened) : impl(std::move(opened)) {}
ExtractPool::~ExtractPool() = default;

size_t ExtractPool::Room() const {
  return Pool().room - Running();
}

size_t ExtractPool::Running() const {
  return Pool().running.size();
}

void ExtractPool::Submit(ExtractJob&& job) {
  Pool().running.push_back(std::move(job));
}

void ExtractPool::AddPolled(std::vector<pollfd>& /*polled*/) const {}

std::chrono::steady_clock::time_point ExtractPool::Due() const {
  return std::chrono::steady_clock::time_point::max();
}

std::vector<ExtractOutcome> ExtractPool::Work(std::chrono::steady_clock::time_point /*now*/) {
  return std::exchange(Pool().outcomes, {});
}

void ExtractPool::Abort() {
  ++Pool().aborts;
  Pool().running.clear();
  Pool().outcomes.clear();
}

std::string ExtractPool::LeftOut() const {
  return Pool().left_out;
}

}  // namespace fileindexd
