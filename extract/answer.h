// SPDX-License-Identifier: GPL-2.0-or-later
// What the service and its closed helper say to each other, over a stream socket.
//
//   service:  job*                    one at a time: the next after the answer
//   helper:   ready (begun (answer | unread))*
//
//   job     = length text-cap name    in one message, the file's descriptor with it
//   ready   = length record           READY alone
//   begun   = length record           BEGUN alone: it has the job, and whatever happens to it now
//                                     may be the file's doing
//   unread  = length record           UNREAD alone
//   answer  = length record*          KIND and SAMPLE at least
//   record  = tag size value
//
//   length    4 bytes: of what follows
//   text-cap  4 bytes
//   name      the rest: the last component of the file's path, any bytes, at most MAX_JOB_NAME
//   tag       1 byte; tags rise from record to record, so none comes twice
//   size      4 bytes: of the value
//
//   tag            value
//   1 … 18         a ContentField's text: clean (see IsCleanText), 1 to MAX_FIELD bytes
//   64 … 77        a ContentField's number, 8 bytes: plausible (see IsPlausible)
//   TEXT           clean, 1 to text-cap bytes
//   CUT            empty: there was more text than the cap takes
//   KIND           1 byte: a Kind, but no FOLDER
//   SAMPLE         8 bytes
//   CONVERTER      name of a program that reads the file's text better: a clean line, 1 to
//                  MAX_REASON bytes
//   FAILED         the file cannot be read, and why: a clean line, 1 to MAX_REASON bytes
//   BEGUN          empty
//   READY          1 byte ANSWER_VERSION, and which formats are left out: a clean line, up to
//                  MAX_REASON bytes
//   UNREAD         the disk did not give the file's bytes, which tells nothing about the file, and
//                  why: a clean line, 1 to MAX_REASON bytes
//
// Numbers are little-endian. The helper may have been taken over by a file: whoever receives from
// it believes nothing that is not checked here.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/content.h"

namespace fileindexd {

constexpr uint8_t ANSWER_VERSION = 2;

constexpr uint8_t TAG_TEXT = 128;
constexpr uint8_t TAG_CUT = 129;
constexpr uint8_t TAG_KIND = 130;
constexpr uint8_t TAG_SAMPLE = 131;
constexpr uint8_t TAG_CONVERTER = 132;
constexpr uint8_t TAG_FAILED = 133;
constexpr uint8_t TAG_BEGUN = 134;
constexpr uint8_t TAG_READY = 135;
constexpr uint8_t TAG_UNREAD = 136;

constexpr size_t MAX_JOB_NAME = 4096;
constexpr size_t MAX_REASON = 512;

struct JobOrder {
  uint32_t text_cap = 0;
  std::string name;
};

struct Answer {
  enum class Sort { ANSWER, BEGUN, READY, UNREAD };

  Sort sort = Sort::ANSWER;
  std::string left_out;  // of READY; the rest is of ANSWER, the reason of UNREAD as well
  Content content;
  std::string converter;
  bool has_failed = false;
  std::string reason;
};

// A name that is too long loses its beginning: the ending tells more.
std::string EncodeJob(const JobOrder& job);
// Of one whole message.
std::optional<JobOrder> DecodeJob(std::string_view frame);

// Reasons are cleaned and cut; content is taken as a ContentSink makes it.
std::string EncodeAnswer(const Answer& answer);

// The largest frame that a helper may send for a text of `text_cap` bytes, its length included.
size_t MaxFrame(size_t text_cap);
// Bytes of the frame that `received` begins with, its length included; 0 while the length is not
// all there. May be more than MaxFrame allows, and then is nonsense.
size_t FrameSize(std::string_view received);
// Of one whole frame. None, and `fault` then says why, when it is not exactly as written above.
std::optional<Answer> DecodeAnswer(std::string_view frame, size_t text_cap, std::string& fault);

}  // namespace fileindexd
