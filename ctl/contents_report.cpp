// SPDX-License-Identifier: GPL-2.0-or-later
#include "ctl/contents_report.h"

#include "index/kind.h"

namespace fileindexd {

namespace {

constexpr Kind KINDS[] = {Kind::DOCUMENT, Kind::AUDIO, Kind::VIDEO, Kind::PHOTO, Kind::OTHER};

const ContentCounts::OfKind& Of(const ContentCounts& counts, Kind kind) {
  return counts.kinds[static_cast<size_t>(kind)];
}

void SetCounts(Json::Value& object, const ContentCounts::OfKind& counts, const char* prefix) {
  const std::string before = prefix;
  object[before + "waiting"] = static_cast<Json::UInt64>(counts.waiting);
  object[before + "done"] = static_cast<Json::UInt64>(counts.done);
  object[before + "failed"] = static_cast<Json::UInt64>(counts.failed);
}

std::string CountsText(const ContentCounts::OfKind& counts) {
  std::string text = std::to_string(counts.done) + " read";
  if (counts.waiting > 0) {
    text += ", " + std::to_string(counts.waiting) + " waiting";
  }
  if (counts.failed > 0) {
    text += ", " + std::to_string(counts.failed) + " failed";
  }
  return text;
}

}  // namespace

ContentsReport ReportContents(const Share& share, uint64_t wanted) {
  ContentsReport report;
  ContentsReader reader;
  const IndexError opened = reader.Open(share.name);
  if (opened == IndexError::PATH_NOT_FOUND) {
    report.counts.all.waiting = wanted;
  } else if (opened != IndexError::NONE) {
    report.problem = IndexErrorText(opened);
  } else if (!reader.Count(report.counts) ||
             !reader.FindWordsProgress(share.language, report.words)) {
    report.problem = "cannot be read";
  }
  return report;
}

void AddContents(Json::Value& object, const ContentsReport& report) {
  SetCounts(object, report.counts.all, "contents_");
  object["contents_not_kept"] = static_cast<Json::UInt64>(report.counts.not_kept);
  object["contents_last_minute"] = static_cast<Json::UInt64>(report.counts.done_last_minute);
  object["contents_by_kind"] = Json::objectValue;
  for (const Kind kind : KINDS) {
    SetCounts(object["contents_by_kind"][KindText(kind)], Of(report.counts, kind), "");
  }
  object["words_made_anew"] = WordsObject(report.words);
  if (!report.problem.empty()) {
    object["contents_problem"] = report.problem;
  }
}

Json::Value WordsObject(const std::optional<WordsProgress>& words) {
  if (!words) {
    return {};
  }
  Json::Value object(Json::objectValue);
  object["language"] = words->language;
  object["wanted"] = words->wanted;
  object["done"] = static_cast<Json::UInt64>(words->done);
  object["total"] = static_cast<Json::UInt64>(words->total);
  return object;
}

std::string WordsText(const WordsProgress& words) {
  return "not made anew for " + words.wanted + " yet, " + std::to_string(words.done) + " of " +
         std::to_string(words.total) + " texts done; those for " + words.language + " are found";
}

std::string ContentsText(const ContentsReport& report) {
  if (!report.problem.empty()) {
    return report.problem;
  }

  std::string text = CountsText(report.counts.all);
  if (report.counts.not_kept > 0) {
    text += ", " + std::to_string(report.counts.not_kept) + " with nothing to keep";
  }
  if (report.counts.done_last_minute > 0) {
    text += ", " + std::to_string(report.counts.done_last_minute) + " in the last minute";
  }
  std::string kinds;
  for (const Kind kind : KINDS) {
    const ContentCounts::OfKind& counts = Of(report.counts, kind);
    if (counts.done + counts.waiting + counts.failed > 0) {
      kinds += std::string(kinds.empty() ? "" : "; ") + KindText(kind) + ": " + CountsText(counts);
    }
  }
  return kinds.empty() ? text : text + " (" + kinds + ")";
}

}  // namespace fileindexd
