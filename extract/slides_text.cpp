// SPDX-License-Identifier: GPL-2.0-or-later
// A presentation is a tree of records, version and instance u16, type u16, length u32, bytes; those
// of version 15 hold records. Saving appends, so the stream holds what was deleted, too. What is
// alive is found from the last edit: "Current User" says where that begins, it names a directory of
// objects (id and count u32, offset u32 × count)* and the edit before it. The newest offset of an
// id counts.
#include <algorithm>
#include <map>
#include <set>
#include <string>

#include "base/utf8.h"
#include "extract/little_endian.h"
#include "extract/nested.h"
#include "extract/old_office.h"
#include "extract/utf16.h"

namespace fileindexd {

namespace {

enum RecordType : uint16_t {
  RECORD_MASTER = 0x03F8,
  RECORD_STRING = 0x0FBA,  // of many uses; its instance tells which
  RECORD_PAGE_EDGES = 0x0FD9,
  RECORD_TAG_DATA = 0x138B,  // records of later versions
  RECORD_COMMENT = 0x2EE0,
  RECORD_TEXT_WIDE = 0x0FA0,
  RECORD_TEXT_SHORT = 0x0FA8,
  RECORD_HANDOUT = 0x0FC9,
  RECORD_TEXTS = 0x0FF0,
  RECORD_EDIT = 0x0FF5,
  RECORD_DIRECTORY = 0x1772,
};

constexpr size_t HEADER = 8;
constexpr int MAX_DEPTH = 32;
constexpr int MAX_EDITS = 10'000;
constexpr size_t MAX_OBJECTS = 100'000;
constexpr uint32_t TOKEN_ENCRYPTED = 0xF3D1C4DF;

class SlidesText {
 public:
  SlidesText(std::string_view slides, ContentSink& text_sink) : bytes(slides), sink(text_sink) {}

  // False where the last edit says that it is encrypted. Edits that share a directory, which none
  // do that were saved, may not have it read again and again: all directories together are no
  // longer than the stream.
  bool FindObjects(uint32_t edit) {
    size_t left = bytes.Size();
    for (int i = 0; i < MAX_EDITS && left > 0 && objects.size() < MAX_OBJECTS &&
                    bytes.Word(edit + 2) == RECORD_EDIT;
         ++i) {
      constexpr uint32_t LENGTH_WITH_KEY = 32;
      if (bytes.Long(edit + 4) >= LENGTH_WITH_KEY && bytes.Long(edit + 36) != 0) {
        return false;
      }
      left -= std::min(left, TakeDirectory(bytes.Long(edit + 20), left));
      const uint32_t before = bytes.Long(edit + 16);
      if (before == 0 || before >= edit) {
        break;
      }
      edit = before;
    }
    return true;
  }

  void Add() {
    const Allowance allowance;
    if (objects.empty()) {
      AddRecords(0, bytes.Size(), 0, 0);
      return;
    }
    std::set<size_t> done;
    for (const auto& object : objects) {
      if (sink.IsFull() || allowance.IsSpent()) {
        return;
      }
      if (done.insert(object.second).second) {
        AddRecord(object.second, bytes.Size(), 0, 0);
      }
    }
  }

 private:
  // At most `limit` bytes; returns how many were taken.
  size_t TakeDirectory(size_t begin, size_t limit) {
    if (bytes.Word(begin + 2) != RECORD_DIRECTORY) {
      return 0;
    }
    const size_t length = std::min<size_t>(bytes.Long(begin + 4), limit);
    const size_t end = std::min(bytes.Size(), begin + HEADER + length);
    size_t at = begin + HEADER;
    while (at + 4 <= end && objects.size() < MAX_OBJECTS) {
      const uint32_t first = bytes.Long(at) & 0xFFFFF;
      const uint32_t count = bytes.Long(at) >> 20;
      at += 4;
      for (uint32_t i = 0; i < count && at + 4 <= end && objects.size() < MAX_OBJECTS; ++i) {
        objects.emplace(first + i, bytes.Long(at));
        at += 4;
      }
    }
    return at - begin;
  }

  void AddRecords(size_t begin, size_t end, uint16_t around, int depth) {
    for (size_t at = begin; at + HEADER <= end && !sink.IsFull();) {
      at = AddRecord(at, end, around, depth);
    }
  }

  // Heads and feet of pages, and who says what in a comment.
  static bool IsWord(uint16_t around, uint16_t instance) {
    return (around == RECORD_PAGE_EDGES && instance <= 2) ||
           (around == RECORD_COMMENT && instance <= 1);
  }

  // `around` is the type of the record that holds it. Returns where the next one begins.
  size_t AddRecord(size_t at, size_t end, uint16_t around, int depth) {
    constexpr uint16_t CONTAINER = 0xF;
    const uint16_t version = bytes.Word(at) & 0xF;
    const uint16_t instance = static_cast<uint16_t>(bytes.Word(at) >> 4);
    const uint16_t type = bytes.Word(at + 2);
    const size_t begin = at + HEADER;
    const size_t length = bytes.Long(at + 4);
    const size_t record_end = std::min(end, begin + length);
    if (begin > end) {
      return end;
    }

    // Masters hold "click to edit"; their texts are the list of the instance 1.
    const bool is_master =
        type == RECORD_MASTER || type == RECORD_HANDOUT || (type == RECORD_TEXTS && instance == 1);
    const bool holds_records = version == CONTAINER || type == RECORD_TAG_DATA;
    if (holds_records && !is_master && depth < MAX_DEPTH) {
      AddRecords(begin, record_end, type, depth + 1);
    } else if (type == RECORD_TEXT_WIDE || (type == RECORD_STRING && IsWord(around, instance))) {
      sink.AddText(Utf16ToUtf8(bytes.Part(begin, record_end - begin)));
      sink.AddText("\n");
    } else if (type == RECORD_TEXT_SHORT) {
      std::string text;
      for (const char byte : bytes.Part(begin, record_end - begin)) {
        AppendUtf8(static_cast<uint8_t>(byte), text);
      }
      sink.AddText(text);
      sink.AddText("\n");
    }
    return record_end;
  }

  LittleEndian bytes;
  ContentSink& sink;
  std::map<uint32_t, size_t> objects;  // offsets by ids
};

}  // namespace

bool AddSlidesText(std::string_view slides, std::string_view current_user, ContentSink& sink,
                   std::string& why) {
  const LittleEndian user(current_user);
  SlidesText text(slides, sink);
  if (user.Long(12) == TOKEN_ENCRYPTED || !text.FindObjects(user.Long(16))) {
    why = "encrypted";
    return false;
  }
  text.Add();
  return true;
}

}  // namespace fileindexd
