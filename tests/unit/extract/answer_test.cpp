// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/answer.h"

#include <gtest/gtest.h>

#include <string>

#include "extract/format.h"

namespace fileindexd {

namespace {

constexpr size_t CAP = 100;

std::string Number(uint64_t number, int bytes) {
  std::string made;
  for (int at = 0; at < bytes; ++at) {
    made += static_cast<char>(number >> (8 * at) & 0xFF);
  }
  return made;
}

std::string Record(int tag, const std::string& value) {
  return static_cast<char>(tag) + Number(value.size(), 4) + value;
}

std::string Frame(const std::string& body) {
  return Number(body.size(), 4) + body;
}

// The least that an answer holds.
std::string Least() {
  return Record(TAG_KIND, std::string(1, '\1')) + Record(TAG_SAMPLE, Number(7, 8));
}

std::string FaultOf(const std::string& frame) {
  std::string fault;
  return DecodeAnswer(frame, CAP, fault) ? "" : fault;
}

TEST(AnswerTest, WhatIsEncodedComesBack) {
  Answer sent;
  sent.content.kind = Kind::PHOTO;
  sent.content.numbers = {{ContentField::LONGITUDE, -5}, {ContentField::PAGES, 1}};
  sent.content.texts = {{ContentField::MEMBERS, "a\nb"}, {ContentField::TITLE, "T\xC3\xA9"}};
  sent.content.text = "words of it";
  sent.content.is_cut = true;
  sent.content.sample = 0xFEDCBA9876543210U;
  sent.converter = "catdoc";
  sent.has_failed = true;
  sent.reason = " damaged\n\xFF here ";

  std::string fault;
  const auto got = DecodeAnswer(EncodeAnswer(sent), CAP, fault);
  ASSERT_TRUE(got) << fault;
  EXPECT_EQ(got->sort, Answer::Sort::ANSWER);
  EXPECT_EQ(got->content.kind, Kind::PHOTO);
  ASSERT_EQ(got->content.texts.size(), 2u);
  EXPECT_EQ(got->content.texts[0].text, "T\xC3\xA9");
  EXPECT_EQ(got->content.texts[1].text, "a\nb");
  ASSERT_EQ(got->content.numbers.size(), 2u);
  EXPECT_EQ(got->content.numbers[1].number, -5);
  EXPECT_EQ(got->content.text, "words of it");
  EXPECT_TRUE(got->content.is_cut);
  EXPECT_EQ(got->content.sample, 0xFEDCBA9876543210U);
  EXPECT_EQ(got->converter, "catdoc");
  EXPECT_TRUE(got->has_failed);
  EXPECT_EQ(got->reason, "damaged here");
}

TEST(AnswerTest, WhatStandsAloneComesBack) {
  Answer sent;
  sent.sort = Answer::Sort::READY;
  sent.left_out = "PDF";
  std::string fault;
  const auto got = DecodeAnswer(EncodeAnswer(sent), CAP, fault);
  ASSERT_TRUE(got) << fault;
  EXPECT_EQ(got->sort, Answer::Sort::READY);
  EXPECT_EQ(got->left_out, "PDF");

  sent.sort = Answer::Sort::BEGUN;
  const auto begun = DecodeAnswer(EncodeAnswer(sent), CAP, fault);
  ASSERT_TRUE(begun) << fault;
  EXPECT_EQ(begun->sort, Answer::Sort::BEGUN);

  sent.sort = Answer::Sort::UNREAD;
  sent.reason = "a disk\tthat fails";
  const auto unread = DecodeAnswer(EncodeAnswer(sent), CAP, fault);
  ASSERT_TRUE(unread) << fault;
  EXPECT_EQ(unread->sort, Answer::Sort::UNREAD);
  EXPECT_EQ(unread->reason, "a disk that fails");
}

TEST(AnswerTest, TheLeastAnswerIsTaken) {
  EXPECT_EQ(FaultOf(Frame(Least())), "");
}

TEST(AnswerTest, NonsenseIsRefused) {
  const std::string long_field(ContentSink::MAX_FIELD + 1, 'x');
  const std::string title = Record(1, "t");
  const std::string rows[] = {
      "",
      "\1",
      Frame(""),
      Frame("\1"),
      Frame(Least()) + "x",
      Frame(Least()).substr(0, 20),
      Frame(Least() + "\x86"),
      Frame(Record(TAG_KIND, std::string(1, '\1'))),         // no sample
      Frame(Record(TAG_SAMPLE, Number(7, 8))),               // no kind
      Frame(title + title + Least()),                        // twice
      Frame(Record(2, "a") + title + Least()),               // falling
      Frame(std::string(1, '\0') + Number(0, 4) + Least()),  // no such tag
      Frame(Record(19, "x") + Least()),
      Frame(Record(78, Number(1, 8)) + Least()),
      Frame(Least() + Record(200, "x")),
      Frame(static_cast<char>(1) + Number(0xFFFFFFFF, 4) + Least()),  // beyond the frame
      Frame(Record(1, "") + Least()),
      Frame(Record(1, "a\tb") + Least()),
      Frame(Record(1, "a\xC3") + Least()),
      Frame(Record(1, long_field) + Least()),
      Frame(Record(64, Number(1, 4)) + Least()),
      Frame(Record(64, Number(0, 8)) + Least()),
      Frame(Record(77, Number(6, 8)) + Least()),
      Frame(Record(TAG_TEXT, std::string(CAP + 1, 'x')) + Least()),
      Frame(Record(TAG_TEXT, "") + Least()),
      Frame(Record(TAG_TEXT, "\xED\xA0\x80") + Least()),
      Frame(Record(TAG_CUT, "x") + Least()),
      Frame(Record(TAG_KIND, std::string(1, '\5')) + Record(TAG_SAMPLE, Number(7, 8))),
      Frame(Record(TAG_KIND, std::string(1, '\xFF')) + Record(TAG_SAMPLE, Number(7, 8))),
      Frame(Record(TAG_KIND, "") + Record(TAG_SAMPLE, Number(7, 8))),
      Frame(Record(TAG_KIND, std::string(1, '\1')) + Record(TAG_SAMPLE, Number(7, 7))),
      Frame(Least() + Record(TAG_FAILED, "")),
      Frame(Least() + Record(TAG_FAILED, std::string(MAX_REASON + 1, 'x'))),
      Frame(Least() + Record(TAG_FAILED, "two\nlines")),
      Frame(Least() + Record(TAG_CONVERTER, "cat\ndoc")),
      Frame(Least() + Record(TAG_CONVERTER, "\x1B[2J")),
      Frame(Record(TAG_READY, "")),
      Frame(Record(TAG_READY, "\x7F")),
      Frame(Record(TAG_READY, "\2\t")),
      Frame(Record(TAG_READY, "\2PDF\nRTF")),
      Frame(Least() + Record(TAG_READY, "\2")),
      Frame(Record(TAG_READY, "\1")),  // another version
      Frame(Record(TAG_UNREAD, "")),
      Frame(Record(TAG_UNREAD, "two\nlines")),
      Frame(Record(TAG_UNREAD, std::string(MAX_REASON + 1, 'x'))),
      Frame(Least() + Record(TAG_UNREAD, "x")),
      Frame(Record(TAG_UNREAD, "x") + Record(TAG_UNREAD, "x")),
      Frame(Record(TAG_BEGUN, "x")),
      Frame(Least() + Record(TAG_BEGUN, "")),
      Frame(Record(TAG_BEGUN, "") + Record(TAG_READY, "\2")),
  };
  for (size_t row = 0; row < std::size(rows); ++row) {
    EXPECT_NE(FaultOf(rows[row]), "") << "row " << row;
  }
}

TEST(AnswerTest, EveryCutOfAnAnswerIsRefused) {
  const std::string whole = Frame(Record(1, "title") + Record(TAG_TEXT, "text") + Least());
  for (size_t length = 0; length < whole.size(); ++length) {
    EXPECT_NE(FaultOf(whole.substr(0, length)), "") << length;
    // With a length that fits, a cut between two records leaves kind or sample out.
    if (length >= 4) {
      EXPECT_NE(FaultOf(Frame(whole.substr(4, length - 4))), "") << length;
    }
  }
}

TEST(AnswerTest, TheLargestAnswerIsWithinItsBound) {
  Answer sent;
  for (unsigned tag = 1; tag < TAG_TEXT; ++tag) {
    const auto field = static_cast<ContentField>(tag);
    if (!IsContentField(static_cast<uint8_t>(tag))) {
      continue;
    }
    if (IsNumberField(field)) {
      sent.content.numbers.push_back({field, 1});
    } else {
      sent.content.texts.push_back({field, std::string(ContentSink::MAX_FIELD, 'x')});
    }
  }
  sent.content.text.assign(CAP, 'x');
  sent.content.is_cut = true;
  sent.has_failed = true;
  sent.reason.assign(2 * MAX_REASON, 'x');
  sent.converter.assign(MAX_REASON, 'x');
  const std::string frame = EncodeAnswer(sent);
  EXPECT_LE(frame.size(), MaxFrame(CAP));
  EXPECT_EQ(FaultOf(frame), "");
}

TEST(AnswerTest, JobsComeBack) {
  const auto got = DecodeJob(EncodeJob({1 << 20, "a\n\xFF.txt"}));
  ASSERT_TRUE(got);
  EXPECT_EQ(got->text_cap, 1u << 20);
  EXPECT_EQ(got->name, "a\n\xFF.txt");

  const auto long_one = DecodeJob(EncodeJob({1, std::string(10'000, 'x') + ".txt"}));
  ASSERT_TRUE(long_one);
  EXPECT_EQ(long_one->name.size(), MAX_JOB_NAME);
  EXPECT_TRUE(long_one->name.ends_with("x.txt"));

  EXPECT_FALSE(DecodeJob(""));
  EXPECT_FALSE(DecodeJob(EncodeJob({1, "abc"}).substr(0, 10)));
  EXPECT_FALSE(DecodeJob(EncodeJob({1, "abc"}) + "x"));
}

}  // namespace

}  // namespace fileindexd
