// SPDX-License-Identifier: GPL-2.0-or-later
// Damaged files: a reader comes back from each of them, with something or with a reason.
//
// They are read in a child, as the helper is one. What takes too much processor time there costs
// this one file, as it does in earnest: the film library counts up to any number that a damaged
// table names. What crashes is a failure.
#include <gtest/gtest.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <functional>
#include <random>
#include <string>

#include "extract/characters.h"
#include "tests/unit/extract/file_bounds.h"
#include "tests/unit/extract/media/bytes.h"
#include "tests/unit/extract/media/film_samples.h"
#include "tests/unit/extract/media/picture_samples.h"
#include "tests/unit/extract/media/reading.h"
#include "tests/unit/extract/media/sound_samples.h"

namespace fileindexd {

namespace {

struct Victim {
  FormatReader reader;
  Sample sample;
};

std::ostream& operator<<(std::ostream& out, const Victim& victim) {
  return out << victim.sample.name;
}

std::vector<Victim> Victims() {
  std::vector<Victim> victims;
  for (const Sample& sample : SoundSamples()) {
    victims.push_back({ReadAudio, sample});
  }
  for (const Sample& sample : FilmSamples()) {
    victims.push_back({ReadVideo, sample});
  }
  for (const Sample& sample : PictureSamples()) {
    victims.push_back({ReadPhoto, sample});
  }
  return victims;
}

std::string FormatName(const testing::TestParamInfo<Victim>& info) {
  return "of_" + info.param.sample.name.substr(info.param.sample.name.rfind('.') + 1);
}

constexpr size_t LATE_OF = 20;  // one of so many files may take more than its time

class HostileMediaTest : public testing::TestWithParam<Victim> {
 protected:
  // `make` gives the bytes of each of `count` files.
  static void SurviveAll(size_t count, const std::function<std::string(size_t)>& make) {
    void* shared =
        mmap(nullptr, sizeof(size_t), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(shared, MAP_FAILED);
    auto* next = static_cast<volatile size_t*>(shared);
    size_t late = 0;
    while (*next < count) {
      const pid_t child = fork();
      ASSERT_GE(child, 0);
      if (child == 0) {
        LimitMemory();
        for (size_t i = *next; i < count; i++) {
          *next = i + 1;
          AllowSeconds();
          Survive(make(i), "file " + std::to_string(i));
        }
        _exit(HasFailure() ? 1 : 0);
      }
      int status = 0;
      ASSERT_EQ(waitpid(child, &status, 0), child);
      const bool is_late = WIFSIGNALED(status) && WTERMSIG(status) == SIGXCPU;
      late += is_late ? 1 : 0;
      EXPECT_TRUE(is_late || status == 0) << "file " << *next - 1 << ", status " << status;
    }
    EXPECT_LE(late, 1 + count / LATE_OF) << "of " << count;
    (void)munmap(shared, sizeof(size_t));  // Cannot fail: it is whole.
  }

  static void Survive(const std::string& bytes, const std::string& what) {
    const Found found = Read(GetParam().reader, {GetParam().sample.name, bytes});

    EXPECT_TRUE(found.is_read || !found.why.empty()) << what;
    for (const TextField& field : found.content.texts) {
      EXPECT_TRUE(IsCleanText(field.text)) << what;
      EXPECT_LE(field.text.size(), ContentSink::MAX_FIELD) << what;
    }
    for (const NumberField& field : found.content.numbers) {
      EXPECT_TRUE(IsPlausible(field.field, field.number)) << what;
    }
  }
};

TEST_P(HostileMediaTest, CutAtEveryTenth) {
  const std::string& whole = GetParam().sample.bytes;
  SurviveAll(10, [&](size_t tenth) { return whole.substr(0, whole.size() * tenth / 10); });
}

TEST_P(HostileMediaTest, WithBitsTurned) {
  SurviveAll(DamageSeeds(), [&](size_t seed) {
    std::mt19937 random(static_cast<unsigned>(seed + 1));
    std::string bytes = GetParam().sample.bytes;
    const size_t turned = 1 + random() % 16;
    for (size_t i = 0; i < turned; i++) {
      // Half of them in the first kilobyte, where the structure is.
      const size_t range = i % 2 == 0 ? bytes.size() : std::min<size_t>(bytes.size(), 1024);
      bytes[random() % range] ^= static_cast<char>(1 << random() % 8);
    }
    return bytes;
  });
}

TEST_P(HostileMediaTest, WithHugeNumbersInIt) {
  const std::string& whole = GetParam().sample.bytes;
  const size_t places = std::min<size_t>(whole.size() / 4, 100);
  SurviveAll(places, [&](size_t place) {
    std::string bytes = whole;
    return bytes.replace(place * 4, 4, Hex("7fffffff"));
  });
}

INSTANTIATE_TEST_SUITE_P(Formats, HostileMediaTest, testing::ValuesIn(Victims()), FormatName);

TEST(HostileMediaReaderTest, ABoxWithinItselfEnds) {
  std::string boxes = Box("free", "");
  for (int depth = 0; depth < 2000; depth++) {
    boxes = Box(depth % 2 == 0 ? "moov" : "trak", boxes);
  }
  for (const FormatReader reader : {ReadAudio, ReadVideo, ReadPhoto}) {
    const Found found = Read(reader, {"a.mp4", Box("ftyp", "isom" + Big(0, 4)) + boxes});

    EXPECT_TRUE(found.is_read || !found.why.empty());
  }
}

TEST(HostileMediaReaderTest, DirectoriesInACircleEnd) {
  // The only directory names itself as the next one.
  const std::string bytes = PlainTiffHeader() + Little(0, 2) + Little(8, 4);

  EXPECT_EQ(Read(ReadPhoto, {"p.tif", bytes}).content.kind, Kind::PHOTO);
}

TEST(HostileMediaReaderTest, SoundWithoutAFrameIsNotSearchedForEver) {
  const Found found =
      Read(ReadAudio, {"a.mp3", "ID3" + Hex("0300 00 00000000") + std::string(24 << 20, '\xff')});

  EXPECT_TRUE(found.is_read || !found.why.empty());
}

}  // namespace

}  // namespace fileindexd
