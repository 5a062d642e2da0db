// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/documents/fixture.h"

#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <random>

#include "extract/memory_file.h"
#include "tests/unit/extract/behind_doors.h"
#include "tests/unit/extract/file_bounds.h"

namespace fileindexd {

namespace {

constexpr size_t SMALL_CAP = 64 * 1024;

void ExpectWithinBounds(FormatReader reader, const std::string& name, const std::string& bytes) {
  Reading reading;
  try {
    reading = ReadBytes(reader, name, bytes, {0, SMALL_CAP});
  } catch (const std::exception&) {
    return;  // a reader may throw: the helper's loop catches it
  }
  EXPECT_EQ(reading.is_good, reading.why.empty()) << reading.why;
  EXPECT_LE(reading.content.text.size(), SMALL_CAP);
  for (const TextField& field : reading.content.texts) {
    EXPECT_LE(field.text.size(), ContentSink::MAX_FIELD);
    EXPECT_FALSE(field.text.empty());
  }
}

void ReadDamaged(FormatReader reader, const std::string& name, const std::string& bytes) {
  LimitMemory();
  for (size_t tenth = 0; tenth < 10; ++tenth) {
    AllowSeconds();
    ExpectWithinBounds(reader, name, bytes.substr(0, bytes.size() * tenth / 10));
  }
  for (unsigned seed = 1; seed <= DamageSeeds(); ++seed) {
    std::mt19937 random(seed);
    std::string damaged = bytes;
    const size_t flips = 1 + random() % 32;
    for (size_t i = 0; i < flips; ++i) {
      const size_t at = random() % damaged.size();
      damaged[at] = static_cast<char>(damaged[at] ^ (1 << random() % 8));
    }
    SCOPED_TRACE(testing::Message() << name << ", seed " << seed);
    AllowSeconds();
    ExpectWithinBounds(reader, name, damaged);
  }
}

}  // namespace

std::string Reading::Text(ContentField field) const {
  for (const TextField& known : content.texts) {
    if (known.field == field) {
      return known.text;
    }
  }
  return "";
}

std::optional<int64_t> Reading::Number(ContentField field) const {
  for (const NumberField& known : content.numbers) {
    if (known.field == field) {
      return known.number;
    }
  }
  return std::nullopt;
}

Reading ReadBytes(FormatReader reader, const std::string& name, const std::string& bytes,
                  const ReadingOptions& options) {
  MemoryFile file;
  Reading reading;
  if (!file.Open() || !file.Append(bytes)) {
    ADD_FAILURE() << "no memory for a file of " << bytes.size() << " bytes";
    return reading;
  }
  ContentSink sink(options.text_cap);
  reading.is_good = reader(file.AsDocument(name, options.depth), sink, reading.why);
  reading.content = sink.content;
  reading.converter = sink.converter;
  return reading;
}

void ExpectSurvivesDamage(FormatReader reader, const std::string& name, const std::string& bytes) {
  ExpectSameBehindDoors(name, bytes);
  // In a process of its own, as the helper is one, and within the helper's bounds.
  const pid_t child = fork();
  ASSERT_GE(child, 0);
  if (child == 0) {
    ReadDamaged(reader, name, bytes);
    (void)fflush(nullptr);
    _exit(testing::Test::HasFailure() ? 1 : 0);
  }
  int status = 0;
  ASSERT_EQ(waitpid(child, &status, 0), child);
  EXPECT_EQ(status, 0) << name << ": too slow, too big, or a crash";
}

}  // namespace fileindexd
