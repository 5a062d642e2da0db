// SPDX-License-Identifier: GPL-2.0-or-later
// Prints what the closed helper finds in files: extract_try PROGRAM FILE…
#include <fcntl.h>

#include <cstdio>

#include "extract/pool.h"

namespace fileindexd {

namespace {

void Print(const char* name, const ExtractOutcome& outcome) {
  constexpr const char* RESULTS[] = {"done", "failed", "killed", "lost", "unread"};
  printf("== %s: %s %s\n", name, RESULTS[static_cast<int>(outcome.result)], outcome.reason.c_str());
  printf("   kind %d sample %016llx%s\n", static_cast<int>(outcome.content.kind),
         static_cast<unsigned long long>(outcome.content.sample),
         outcome.content.is_cut ? " cut" : "");
  for (const TextField& text : outcome.content.texts) {
    printf("   %d: %s\n", static_cast<int>(text.field), text.text.c_str());
  }
  for (const NumberField& number : outcome.content.numbers) {
    printf("   %d: %lld\n", static_cast<int>(number.field), static_cast<long long>(number.number));
  }
  printf("   %zu bytes: %.200s\n", outcome.content.text.size(), outcome.content.text.c_str());
}

int Try(int argc, char** argv) {
  PoolOptions options;
  options.program = argv[1];
  std::string error;
  const auto pool = ExtractPool::Open(options, error);
  if (!pool) {
    (void)fprintf(stderr, "%s\n", error.c_str());
    return 1;
  }

  for (int at = 2; at < argc; ++at) {
    const std::string path = argv[at];
    ExtractJob job;
    job.file = std::make_shared<ScopedFd>(open(path.c_str(), O_RDONLY | O_CLOEXEC));
    job.name = path.substr(path.rfind('/') + 1);
    pool->Submit(std::move(job));
    std::vector<ExtractOutcome> outcomes;
    while ((outcomes = pool->Work()).empty()) {
      std::vector<pollfd> polled;
      pool->AddPolled(polled);
      (void)poll(polled.data(), polled.size(), 100);
    }
    Print(argv[at], outcomes[0]);
  }
  if (!pool->LeftOut().empty()) {
    printf("left out: %s\n", pool->LeftOut().c_str());
  }
  return 0;
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  return argc < 3 ? 2 : fileindexd::Try(argc, argv);
}
