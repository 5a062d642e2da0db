// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/nested.h"
#include "tests/unit/extract/documents/fixture.h"
#include "tests/unit/extract/documents/packing.h"

namespace fileindexd {

namespace {

constexpr char HEAD[] =
    "From: =?utf-8?q?=C3=85sa?= Lind <asa@example.org>\n"
    "To: Quay <quay@example.org>, crane@example.org\nCc: mate@example.org\n"
    "Subject: =?iso-8859-1?q?Gr=FC=DFe?= =?utf-8?b?6K6h5YiS?=\n"
    "Date: Thu, 02 Jan 2020 05:04:05 +0200\nMIME-Version: 1.0\n";

std::string Base64(const std::string& bytes) {
  constexpr char LETTERS[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  std::string text;
  for (size_t at = 0; at < bytes.size(); at += 3) {
    uint32_t triple = 0;
    for (size_t i = 0; i < 3; ++i) {
      triple = triple << 8 | (at + i < bytes.size() ? static_cast<uint8_t>(bytes[at + i]) : 0);
    }
    for (size_t i = 0; i < 4; ++i) {
      text += at + i <= bytes.size() ? LETTERS[triple >> (18 - 6 * i) & 63] : '=';
    }
    text += at % 48 == 45 ? "\n" : "";
  }
  return text + "\n";
}

std::string Multipart(const std::string& type, const std::vector<std::string>& parts) {
  std::string text = "Content-Type: multipart/" + type + "; boundary=\"==" + type + "\"\n\n";
  for (const std::string& part : parts) {
    text += "--==" + type + "\n" + part + "\n";
  }
  return text + "--==" + type + "--\n";
}

std::string Attached(const std::string& name, const std::string& bytes) {
  return "Content-Type: application/octet-stream\nContent-Transfer-Encoding: base64\n"
         "Content-Disposition: attachment; filename=\"" +
         name + "\"\n\n" + Base64(bytes);
}

const std::string PLAIN =
    "Content-Type: text/plain; charset=iso-8859-2\nContent-Transfer-Encoding: quoted-printable\n\n"
    "The light=\nhouse p=F8ed\n";
const std::string PAGE =
    "Content-Type: text/html; charset=koi8-r\n\n<meta "
    "charset=utf-8><p>\xd0\xd2\xc9\xd7\xc5\xd4</p>\n";

std::string Letter() {
  return HEAD + Multipart("mixed", {Multipart("alternative", {PLAIN, PAGE}),
                                    Attached("notes.txt", "attached words"),
                                    Attached("pack.zip", Zipped({{"in.txt", "packed words"}}))});
}

}  // namespace

TEST(MailTest, HeadersTextAndAttachmentsAreFound) {
  const Reading reading = ReadBytes(ReadMessage, "a.eml", Letter());

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_EQ(reading.content.kind, Kind::DOCUMENT);
  EXPECT_EQ(reading.Text(ContentField::FROM), "\u00c5sa Lind <asa@example.org>");
  EXPECT_EQ(reading.Text(ContentField::TO),
            "Quay <quay@example.org>, crane@example.org, mate@example.org");
  EXPECT_EQ(reading.Text(ContentField::SUBJECT), "Gr\u00fc\u00dfe\u8ba1\u5212");
  EXPECT_EQ(reading.Number(ContentField::SENT), 1577934245);
  EXPECT_EQ(reading.Text(ContentField::ATTACHMENTS), "notes.txt\npack.zip");
  EXPECT_EQ(reading.Text(ContentField::MEMBERS), "");
  EXPECT_EQ(reading.content.text, "The lighthouse p\u0159ed attached words packed words");
}

TEST(MailTest, APageIsReadByTheCharsetOfItsHeader) {
  const Reading reading = ReadBytes(ReadMessage, "a.eml", HEAD + PAGE);

  EXPECT_EQ(reading.content.text, "\u043f\u0440\u0438\u0432\u0435\u0442");
}

TEST(MailTest, ACharsetIsWhatPeopleMeanByItsName) {
  EXPECT_EQ(ReadBytes(ReadMessage, "a.eml",
                      std::string(HEAD) + "Content-Type: text/plain; charset=ISO-8859-1\n\n"
                                          "\x93quay\x94 \x80\n")
                .content.text,
            "\u201cquay\u201d \u20ac");
}

TEST(MailTest, TextWithoutACharsetIsGuessed) {
  EXPECT_EQ(ReadBytes(ReadMessage, "a.eml", std::string(HEAD) + "\nna\u00efve \u8ba1\u5212\n")
                .content.text,
            "na\u00efve \u8ba1\u5212");
}

TEST(MailTest, AMessageWithinAMessageIsRead) {
  const Reading reading =
      ReadBytes(ReadMessage, "a.eml",
                HEAD + Multipart("mixed", {"Content-Type: message/rfc822\n\nSubject: inner\nFrom: "
                                           "deckhand@example.org\n\ninner words\n"}));

  EXPECT_EQ(reading.content.text, "deckhand@example.org inner inner words");
  EXPECT_EQ(reading.Text(ContentField::SUBJECT), "Gr\u00fc\u00dfe\u8ba1\u5212");
}

TEST(MailTest, WhatIsAttachedToAnAlternativeIsFoundItsTextIsNotReadTwice) {
  const Reading reading = ReadBytes(
      ReadMessage, "a.eml",
      HEAD + Multipart("alternative", {PLAIN, Multipart("mixed", {PAGE, Attached("notes.txt",
                                                                                 "attached "
                                                                                 "words")})}));

  EXPECT_EQ(reading.content.text, "The lighthouse p\u0159ed attached words");
  EXPECT_EQ(reading.Text(ContentField::ATTACHMENTS), "notes.txt");
}

TEST(MailTest, AnAttachedMessageHasItsName) {
  const Reading reading =
      ReadBytes(ReadMessage, "a.eml",
                HEAD + Multipart("alternative", {PLAIN,
                                                 "Content-Type: message/rfc822\n"
                                                 "Content-Disposition: attachment; "
                                                 "filename=\"tide.eml\"\n\n"
                                                 "Subject: inner\n\ninner words\n"}));

  EXPECT_EQ(reading.Text(ContentField::ATTACHMENTS), "tide.eml");
  EXPECT_EQ(reading.content.text, "The lighthouse p\u0159ed inner inner words");
}

// Its words lie in the signature's own wrapping.
TEST(MailTest, WhatIsSignedOrPackedIsNotSaidToBeEncrypted) {
  const std::string type = "Content-Type: application/pkcs7-mime; name=smime.p7m";
  for (const std::string sort :
       {"Signed-Data", "compressed-data", "certs-only", "signed-receipt"}) {
    const Reading open_one =
        ReadBytes(ReadMessage, "a.eml", HEAD + type + "; smime-type=" + sort + "\n\nxyz\n");
    EXPECT_TRUE(open_one.is_good) << sort << ": " << open_one.why;
  }
  EXPECT_EQ(ReadBytes(ReadMessage, "a.eml", HEAD + type + "\n\nxyz\n").why, "encrypted");
  EXPECT_EQ(
      ReadBytes(ReadMessage, "a.eml", HEAD + type + "; smime-type=enveloped-data\n\nxyz\n").why,
      "encrypted");
}

TEST(MailTest, APartOfAFormatNeedsNoName) {
  const Reading reading = ReadBytes(
      ReadMessage, "a.eml",
      HEAD + Multipart("mixed", {"Content-Type: text/plain\n\nbody\n",
                                 "Content-Type: application/rtf\n\n{\\rtf1 dues of the quay}\n",
                                 "Content-Type: APPLICATION/RTF\n\n{\\rtf1 tolls of the gate}\n",
                                 "Content-Type: application/pgp-signature\n\nsealed\n"}));
  EXPECT_THAT(reading.content.text, testing::HasSubstr("dues of the quay"));
  EXPECT_THAT(reading.content.text, testing::HasSubstr("tolls of the gate"));
  EXPECT_THAT(reading.content.text, testing::Not(testing::HasSubstr("sealed")));
}

TEST(MailTest, AnEncryptedMessageKeepsItsHeaders) {
  const Reading reading = ReadBytes(
      ReadMessage, "a.eml",
      HEAD + Multipart("encrypted", {"Content-Type: application/pgp-encrypted\n\nVersion: 1\n",
                                     "Content-Type: application/octet-stream\n\nxyz\n"}));

  EXPECT_EQ(reading.why, "encrypted");
  EXPECT_EQ(reading.Text(ContentField::FROM), "\u00c5sa Lind <asa@example.org>");
}

TEST(MailTest, AllMessagesOfAMailboxAreText) {
  const std::string box = "From a@example.org Thu Jan  2 03:04:05 2020\n" + Letter() +
                          "\nFrom b@example.org Thu Jan  2 03:04:05 2020\n"
                          "Subject: second\nFrom: b@example.org\n\nlast words\n";

  const Reading reading = ReadBytes(ReadMailbox, "a.mbox", box);

  ASSERT_TRUE(reading.is_good) << reading.why;
  EXPECT_THAT(reading.content.text,
              testing::HasSubstr("Gr\u00fc\u00dfe\u8ba1\u5212 The lighthouse"));
  EXPECT_THAT(reading.content.text, testing::EndsWith("b@example.org second last words"));
  EXPECT_EQ(reading.Text(ContentField::ATTACHMENTS), "notes.txt\npack.zip");
  EXPECT_EQ(reading.Text(ContentField::SUBJECT), "");
}

TEST(MailTest, WhatIsNoMessageIsSaidInWords) {
  EXPECT_EQ(ReadBytes(ReadMessage, "a.eml", "").why, "not a message");
  EXPECT_EQ(ReadBytes(ReadMessage, "a.eml", "words without headers\n").why, "not a message");
  EXPECT_EQ(ReadBytes(ReadMailbox, "a.mbox", "words").why, "not a mailbox");
}

// Those that are too deep are left out; what stands before them is found.
TEST(MailTest, PartsWithinPartsWithoutEndEnd) {
  std::string deep = HEAD;
  for (int i = 0; i < 5000; ++i) {
    const std::string mark = std::to_string(i);
    deep += "Content-Type: multipart/mixed; boundary=\"" + mark + "\"\n\n--" + mark + "\n";
    if (i < 3) {
      deep += "\nlevel " + mark + "\n--" + mark + "\n";
    }
  }

  const Reading reading = ReadBytes(ReadDocument, "a.eml", deep + "\ndeep\n");

  EXPECT_TRUE(reading.is_good) << reading.why;
  EXPECT_TRUE(reading.content.is_cut);
  EXPECT_EQ(reading.Text(ContentField::TO).substr(0, 4), "Quay");
  EXPECT_EQ(reading.content.text, "level 0 level 1 level 2");
}

TEST(MailTest, WhatABoundKeepsFromBeingReadIsTold) {
  const std::vector<std::string> most(Allowance::MAX_MEMBERS, Attached("a.txt", "words"));
  std::vector<std::string> more = most;
  more.push_back(more.back());
  const std::vector<Member> members(Allowance::MAX_MEMBERS + 1, {"a.txt", "words"});
  const std::string packed = Attached("a.zip", Zipped(members));
  const std::string blanks(Allowance::MAX_MEMBER_BYTES + 1, '\n');
  const std::string is_long = "Content-Disposition: attachment; filename=a.txt\n\n" + blanks;
  const std::vector<std::string> parts(10'001, "Content-Type: image/png\n\nx");
  const struct {
    const char* what;
    std::string bytes;
    bool is_cut;
  } rows[] = {{"as many parts as are read", Multipart("mixed", most), false},
              {"more", Multipart("mixed", more), true},
              {"more in an archive", Multipart("mixed", {packed}), true},
              {"a long part", Multipart("mixed", {is_long}), true},
              {"parts that are not read", Multipart("mixed", parts), true}};
  for (const auto& row : rows) {
    EXPECT_EQ(ReadBytes(ReadDocument, "a.eml", HEAD + row.bytes).content.is_cut, row.is_cut)
        << row.what;
    EXPECT_EQ(ReadBytes(ReadDocument, "a.mbox", "From x\n" + (HEAD + row.bytes)).content.is_cut,
              row.is_cut)
        << row.what << ", in a mailbox";
  }
}

TEST(MailTest, DamageIsSurvived) {
  ExpectSurvivesDamage(ReadMessage, "a.eml", Letter());
  ExpectSurvivesDamage(ReadMailbox, "a.mbox", "From x\n" + Letter() + "\nFrom y\n" + Letter());
}

}  // namespace fileindexd
