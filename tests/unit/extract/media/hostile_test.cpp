// SPDX-License-Identifier: GPL-2.0-or-later
// Damaged files: a reader comes back from each of them, with something or with a reason.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <random>
#include <string_view>

#include "extract/characters.h"
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

unsigned Seeds() {
  // NOLINTNEXTLINE(concurrency-mt-unsafe): nothing else runs
  const char* scale = std::getenv("FILEINDEXD_TEST_SCALE");
  return scale != nullptr && std::string_view(scale) == "long" ? 1000 : 20;
}

std::string FormatName(const testing::TestParamInfo<Victim>& info) {
  return "of_" + info.param.sample.name.substr(info.param.sample.name.rfind('.') + 1);
}

class HostileMediaTest : public testing::TestWithParam<Victim> {
 protected:
  void Survive(const std::string& bytes, const std::string& what) {
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
  for (size_t tenth = 0; tenth < 10; tenth++) {
    Survive(whole.substr(0, whole.size() * tenth / 10), "tenth " + std::to_string(tenth));
  }
}

TEST_P(HostileMediaTest, WithBitsTurned) {
  const unsigned seeds = Seeds();
  for (unsigned seed = 1; seed <= seeds; seed++) {
    std::mt19937 random(seed);
    std::string bytes = GetParam().sample.bytes;
    const size_t turned = 1 + random() % 16;
    for (size_t i = 0; i < turned; i++) {
      // Half of them in the first kilobyte, where the structure is.
      const size_t range = i % 2 == 0 ? bytes.size() : std::min<size_t>(bytes.size(), 1024);
      bytes[random() % range] ^= static_cast<char>(1 << random() % 8);
    }
    Survive(bytes, "seed " + std::to_string(seed));
  }
}

TEST_P(HostileMediaTest, WithHugeNumbersInIt) {
  const std::string& whole = GetParam().sample.bytes;
  for (size_t at = 4; at + 4 < std::min<size_t>(whole.size(), 400); at += 4) {
    std::string bytes = whole;
    bytes.replace(at, 4, Hex("7fffffff"));
    Survive(bytes, "at " + std::to_string(at));
  }
}

INSTANTIATE_TEST_SUITE_P(Formats, HostileMediaTest, testing::ValuesIn(Victims()), FormatName);

TEST(HostileMediaReaderTest, ABoxWithinItselfEnds) {
  std::string boxes = Box("free", "");
  for (int depth = 0; depth < 20000; depth++) {
    boxes = Box(depth % 2 == 0 ? "moov" : "trak", boxes);
    if (boxes.size() > 160000) {
      break;
    }
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
      Read(ReadAudio, {"a.mp3", "ID3" + Hex("0300 00 00000000") + std::string(80 << 20, '\xff')});

  EXPECT_TRUE(found.is_read || !found.why.empty());
}

}  // namespace

}  // namespace fileindexd
