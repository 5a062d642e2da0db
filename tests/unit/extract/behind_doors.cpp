// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/behind_doors.h"

#include <gtest/gtest.h>
#include <poll.h>

#include <clocale>
#include <cstdlib>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "base/landlock.h"
#include "extract/choice.h"
#include "extract/format.h"
#include "extract/memory_file.h"
#include "extract/pool.h"
#include "tests/unit/extract/namespaces.h"

namespace fileindexd {

namespace {

constexpr size_t TEXT_CAP = 1 << 20;
constexpr int LIMIT_MS = 1'200'000;  // reached only by a fault

struct Walls {
  const char* what;
  const char* program;
  bool has_files;
};

constexpr Walls WALLS[] = {{"Landlock", HELPER, true},
                           {"an own root", WITHOUT_LANDLOCK, true},
                           {"no walls", WITHOUT_WALLS, false}};

struct Found {
  bool is_good = false;
  std::string why;
  Content content;
  std::string converter;
};

Found ReadInTheOpen(const Document& document) {
  static const bool is_prepared = [] {
    std::string error;
    (void)setenv("TZ", "UTC0", 1);  // NOLINT(concurrency-mt-unsafe): nothing else runs
    const bool is_loaded = LoadMagic(error);
    EXPECT_TRUE(is_loaded) << error;
    return is_loaded;
  }();
  EXPECT_TRUE(is_prepared);
  const std::string locale = setlocale(LC_ALL, nullptr);
  (void)setlocale(LC_ALL, "C.UTF-8");
  Found found;
  ContentSink sink(TEXT_CAP);
  try {
    found.is_good = ReadDocument(document, sink, found.why);
  } catch (const std::exception& error) {
    found.why = error.what();
  }
  (void)setlocale(LC_ALL, locale.c_str());
  found.content = std::move(sink.content);
  found.converter = std::move(sink.converter);
  return found;
}

ExtractPool& PoolOf(const Walls& walls) {
  static std::vector<std::unique_ptr<ExtractPool>> pools(std::size(WALLS));
  std::unique_ptr<ExtractPool>& pool = pools.at(static_cast<size_t>(&walls - WALLS));
  if (pool == nullptr) {
    PoolOptions options;
    options.program = walls.program;
    options.text_cap = TEXT_CAP;
    std::string error;
    pool = ExtractPool::Open(options, error);
    EXPECT_NE(pool, nullptr) << error;
  }
  return *pool;
}

ExtractOutcome ReadByHelper(ExtractPool& pool, const Document& document) {
  ExtractJob job;
  job.name = document.name;
  job.file = std::make_shared<ScopedFd>(dup(document.file));
  EXPECT_EQ(lseek(job.file->fd, 0, SEEK_SET), 0);
  pool.Submit(std::move(job));
  while (true) {
    std::vector<ExtractOutcome> outcomes = pool.Work();
    if (!outcomes.empty()) {
      return std::move(outcomes.front());
    }
    std::vector<pollfd> polled;
    pool.AddPolled(polled);
    if (poll(polled.data(), polled.size(), LIMIT_MS) == 0) {
      ADD_FAILURE() << "no outcome";
      return {};
    }
  }
}

// By the number of the field, as answers have them.
std::map<int, std::string> FieldsOf(const Content& content) {
  std::map<int, std::string> fields;
  for (const TextField& field : content.texts) {
    fields[static_cast<int>(field.field)] = field.text;
  }
  for (const NumberField& field : content.numbers) {
    fields[static_cast<int>(field.field)] = std::to_string(field.number);
  }
  return fields;
}

void ExpectSame(const ExtractOutcome& outcome, const Found& open) {
  EXPECT_EQ(outcome.reason, open.why);
  EXPECT_EQ(outcome.result,
            open.is_good ? ExtractOutcome::Result::DONE : ExtractOutcome::Result::FAILED);
  EXPECT_EQ(outcome.content.kind, open.content.kind);
  EXPECT_EQ(FieldsOf(outcome.content), FieldsOf(open.content));
  if (open.converter.empty()) {
    EXPECT_EQ(outcome.content.text, open.content.text);
  } else {
    EXPECT_FALSE(outcome.content.text.empty());
  }
}

}  // namespace

void ExpectSameBehindDoors(const std::string& name, const std::string& bytes) {
  MemoryFile file;
  ASSERT_TRUE(file.Open() && file.Append(bytes));
  const Document document = file.AsDocument(name, 0);
  const Found open = ReadInTheOpen(document);
  const bool uses_files = FormatOfName(name) == Format::PDF || !open.converter.empty();
  static const bool has_own_roots = HasOwnRoots();
  static const bool has_any_walls = has_own_roots || LandlockVersion() >= 1;
  for (const Walls& walls : WALLS) {
    if (!has_own_roots && walls.program == std::string_view(WITHOUT_LANDLOCK)) {
      continue;  // the same as no walls, on this host
    }
    const bool has_files = walls.has_files && has_any_walls;
    SCOPED_TRACE(testing::Message() << name << " behind " << walls.what);
    ExtractPool& pool = PoolOf(walls);
    const ExtractOutcome outcome = ReadByHelper(pool, document);
    EXPECT_EQ(pool.LeftOut().empty(), has_files) << pool.LeftOut();
    if (uses_files && !has_files) {
      EXPECT_EQ(outcome.result, ExtractOutcome::Result::FAILED);
      EXPECT_TRUE(outcome.reason.starts_with("left out: ")) << outcome.reason;
    } else {
      ExpectSame(outcome, open);
    }
  }
}

}  // namespace fileindexd
