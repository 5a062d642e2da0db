// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/index/plain_questions.h"

#include <algorithm>
#include <cmath>
#include <numbers>

namespace fileindexd {

namespace {

using Texts = std::vector<std::string>;
using NamedFields = std::vector<std::pair<std::string, ContentField>>;

// A range as questions write it, of whole numbers.
struct Limits {
  std::string text;
  int64_t lowest = INT64_MIN;
  int64_t highest = INT64_MAX;
};

// `low` is not above `high`. What is stored is counted in a smaller unit, `unit` of which make one:
// comparisons are exact, and a range holds all of its last one.
Limits RangeOf(Chance& chance, int64_t low, int64_t high, const std::string& unit_name,
               int64_t unit) {
  const auto text = [&](int64_t number) { return std::to_string(number) + unit_name; };
  switch (chance.Below(6)) {
    case 0:
      return {">" + text(low), low * unit + 1, INT64_MAX};
    case 1:
      return {">=" + text(low), low * unit, INT64_MAX};
    case 2:
      if (high > 0) {  // nothing is below 0, and to ask for it is refused
        return {"<" + text(high), INT64_MIN, high * unit - 1};
      }
      [[fallthrough]];
    case 3:
      return {"<=" + text(high), INT64_MIN, high * unit};
    case 4:
      return {text(low) + "..", low * unit, INT64_MAX};
    default:
      return {text(low) + ".." + text(high), low * unit, high * unit + unit - 1};
  }
}

// A month or a day of 2024, and its first and last second.
struct Day {
  std::string text;
  int64_t first = 0;
  int64_t last = 0;
};

Day AnyDay(Chance& chance) {
  tm begin{};
  begin.tm_year = 2024 - 1900;
  begin.tm_mon = static_cast<int>(chance.Below(12));
  begin.tm_mday = 1;
  tm end = begin;
  const bool is_month = chance.OneOf(2);
  if (is_month) {
    ++end.tm_mon;
  } else {
    begin.tm_mday = 1 + static_cast<int>(chance.Below(28));
    end.tm_mday = begin.tm_mday + 1;
  }
  char text[32];
  (void)strftime(text, sizeof(text), is_month ? "%Y-%m" : "%Y-%m-%d", &begin);
  return {text, timegm(&begin), timegm(&end) - 1};
}

// In seconds.
Limits TimesOf(Chance& chance) {
  const Day one = AnyDay(chance);
  const Day other = AnyDay(chance);
  switch (chance.Below(5)) {
    case 0:
      return {one.text, one.first, one.last};
    case 1:
      return {">" + one.text, one.last + 1, INT64_MAX};
    case 2:
      return {"<" + one.text, INT64_MIN, one.first - 1};
    case 3:
      return {"<=" + one.text, INT64_MIN, one.last};
    default: {
      const Day& early = one.first < other.first ? one : other;
      const Day& late = one.first < other.first ? other : one;
      return {early.text + ".." + late.text, early.first, late.last};
    }
  }
}

// By the angle between the two directions.
double Metres(double latitude, double longitude, double to_latitude, double to_longitude) {
  constexpr double RADIANS = std::numbers::pi / 180;
  const double cosine = std::sin(latitude * RADIANS) * std::sin(to_latitude * RADIANS) +
                        std::cos(latitude * RADIANS) * std::cos(to_latitude * RADIANS) *
                            std::cos((to_longitude - longitude) * RADIANS);
  return 6'371'000 * std::acos(std::clamp(cosine, -1.0, 1.0));
}

}  // namespace

PlainQuestion QuestionMaker::KindOrEnding() {
  if (chance.OneOf(2)) {
    return chance.OneOf(2)
               ? PlainQuestion{"ext:md",
                               [](const PlainFile& f) {
                                 return f.entry.kind != Kind::FOLDER && f.PlainName().size() > 3 &&
                                        f.PlainName().ends_with(".md");
                               }}
               : PlainQuestion{
                     "ext:jpg,mkv", [](const PlainFile& f) {
                       return f.entry.kind != Kind::FOLDER && f.PlainName().size() > 4 &&
                              (f.PlainName().ends_with(".jpg") || f.PlainName().ends_with(".mkv"));
                     }};
  }
  static const Texts NAMES = {"other", "document", "audio", "video", "photo", "folder"};
  const auto one = static_cast<Kind>(chance.Below(NAMES.size()));
  const auto other = static_cast<Kind>(chance.Below(NAMES.size()));
  return {"kind:" + NAMES[static_cast<size_t>(one)] + "," + NAMES[static_cast<size_t>(other)],
          [=](const PlainFile& f) {
            const Kind kind =
                f.entry.kind == Kind::OTHER && f.WasRead() ? f.content.kind : f.entry.kind;
            return kind == one || kind == other;
          }};
}

PlainQuestion QuestionMaker::Size() {
  const bool is_large = chance.OneOf(2);
  const int64_t low = chance.Between(0, is_large ? 4 : 4000);
  const int64_t high = low + chance.Between(0, is_large ? 2 : 4000);
  // "M" stands for no more than that many bytes.
  Limits limits = RangeOf(chance, is_large ? low << 20 : low, is_large ? high << 20 : high, "", 1);
  return {"size:" + limits.text, [=](const PlainFile& f) {
            return f.entry.thing != Thing::DIRECTORY && f.entry.size >= limits.lowest &&
                   f.entry.size <= limits.highest;
          }};
}

PlainQuestion QuestionMaker::Time() {
  const Limits limits = TimesOf(chance);
  const auto holds = [=](int64_t seconds) {
    return seconds >= limits.lowest && seconds <= limits.highest;
  };
  constexpr int64_t SECOND = 1'000'000'000;
  switch (chance.Below(4)) {
    case 0:
      return {"modified:" + limits.text, [=](const PlainFile& f) {
                return f.entry.thing != Thing::DIRECTORY && holds(f.entry.mtime / SECOND);
              }};
    case 1:
      return {"added:" + limits.text,
              [=](const PlainFile& f) { return holds(f.entry.first_seen / SECOND); }};
    default: {
      static const NamedFields FIELDS = {{"taken:", ContentField::TAKEN},
                                         {"created:", ContentField::CREATED},
                                         {"sent:", ContentField::SENT},
                                         {"recorded:", ContentField::RECORDED}};
      const auto& [name, field] = chance.Of(FIELDS);
      return {name + limits.text, [field = field, holds](const PlainFile& f) {
                const int64_t* time = f.Number(field);
                return time != nullptr && holds(*time);
              }};
    }
  }
}

PlainQuestion QuestionMaker::Number() {
  static const NamedFields FIELDS = {{"duration:", ContentField::DURATION},
                                     {"pages:", ContentField::PAGES},
                                     {"width:", ContentField::WIDTH},
                                     {"height:", ContentField::HEIGHT}};
  const auto& [name, field] = chance.Of(FIELDS);
  const bool is_duration = field == ContentField::DURATION;
  const int64_t low = chance.Between(0, is_duration ? 200 : 20);
  const Limits limits = RangeOf(chance, low, low + chance.Between(0, 20), is_duration ? "s" : "",
                                is_duration ? 1000 : 1);
  return {name + limits.text, [field = field, limits](const PlainFile& f) {
            const int64_t* number = f.Number(field);
            return number != nullptr && *number >= limits.lowest && *number <= limits.highest;
          }};
}

PlainQuestion QuestionMaker::Near() {
  const double latitude = 52 + static_cast<double>(chance.Below(1000)) / 1000;
  const double longitude = 13 + static_cast<double>(chance.Below(1000)) / 1000;
  const auto kilometres = static_cast<int>(1 + chance.Below(60));
  char text[64];
  (void)snprintf(text, sizeof(text), "near:%.3f,%.3f,%dkm", latitude, longitude, kilometres);
  return {text, [=](const PlainFile& f) {
            const int64_t* north = f.Number(ContentField::LATITUDE);
            const int64_t* east = f.Number(ContentField::LONGITUDE);
            return north != nullptr && east != nullptr &&
                   Metres(latitude, longitude, static_cast<double>(*north) / 1e7,
                          static_cast<double>(*east) / 1e7) <= kilometres * 1000.0;
          }};
}

PlainQuestion QuestionMaker::Is() {
  switch (chance.Below(6)) {
    case 0:
      return {"is:file", [](const PlainFile& f) { return f.entry.thing == Thing::FILE; }};
    case 1:
      return {"is:folder", [](const PlainFile& f) { return f.entry.thing == Thing::DIRECTORY; }};
    case 2:
      return {"is:link", [](const PlainFile& f) { return f.entry.thing == Thing::LINK; }};
    case 3:
      return {"is:empty",
              [](const PlainFile& f) { return f.entry.thing == Thing::FILE && f.entry.size == 0; }};
    case 4:
      return {"is:hidden", [](const PlainFile& f) { return f.PlainName().starts_with('.'); }};
    default:
      return {"is:duplicate", [of = &world](const PlainFile& f) { return of->HasTwin(f); }};
  }
}

PlainQuestion QuestionMaker::Has() {
  const auto has_words = [](const PlainFile& f) { return !f.text.empty() || !f.texts.empty(); };
  switch (chance.Below(5)) {
    case 0:
      return {"has:content", [=](const PlainFile& f) {
                return f.WasRead() && (has_words(f) || !f.content.numbers.empty());
              }};
    case 1:
      return {"has:text", [](const PlainFile& f) { return f.WasRead() && !f.text.empty(); }};
    case 2:
      return {"has:location",
              [](const PlainFile& f) { return f.Number(ContentField::LATITUDE) != nullptr; }};
    case 3:
      return {"has:pages",
              [](const PlainFile& f) { return f.Number(ContentField::PAGES) != nullptr; }};
    default:
      return {"has:author",
              [](const PlainFile& f) { return f.texts.contains(ContentField::AUTHOR); }};
  }
}

PlainQuestion QuestionMaker::Stage() {
  static const Texts NAMES = {"waiting", "done", "failed"};
  const size_t which = chance.Below(NAMES.size());
  return {"content:" + NAMES[which], [stage = static_cast<PlainStage>(which + 1)](
                                         const PlainFile& f) { return f.stage == stage; }};
}

PlainQuestion QuestionMaker::Place() {
  switch (chance.Below(3)) {
    case 0: {
      const std::string share = chance.Of(world.shares);
      return {"share:" + share, [=](const PlainFile& f) { return f.share == share; }};
    }
    case 1: {
      const auto owner = static_cast<uint32_t>(1000 + chance.Below(4));
      return {"owner:" + std::to_string(owner),
              [=](const PlainFile& f) { return f.entry.owner == owner; }};
    }
    default: {
      const std::string folder =
          chance.OneOf(4) ? chance.Of(world.files).entry.path : chance.Of(world.folders);
      return {"under:\"" + folder + "\"", [=](const PlainFile& f) {
                return f.entry.path == folder || f.entry.path.starts_with(folder + "/");
              }};
    }
  }
}

PlainQuestion QuestionMaker::Leaf() {
  switch (chance.Below(17)) {
    case 0:
      return NamePattern();
    case 1:
      return ExactName();
    case 2:
      return PathPiece();
    case 3:
      return KindOrEnding();
    case 4:
      return Size();
    case 5:
      return Time();
    case 6:
      return Number();
    case 7:
      return Near();
    case 8:
      return Is();
    case 9:
      return Has();
    case 10:
      return Stage();
    case 11:
    case 12:
      return Place();
    default:
      return Words();
  }
}

PlainQuestion QuestionMaker::Negated(const PlainQuestion& of) {
  const bool is_plain = of.text.find(' ') == std::string::npos;
  const bool has_sign = of.text.front() == '-';  // "--" negates nothing
  return {
      (chance.OneOf(2) && !has_sign ? "-" : "NOT ") + (is_plain ? of.text : "(" + of.text + ")"),
      [=](const PlainFile& f) { return !of.test(f); }, false};
}

// Of two or three parts.
PlainQuestion QuestionMaker::Group(bool any, size_t depth) {
  PlainQuestion group = Tree(depth);
  for (size_t more = 1 + chance.Below(2); more > 0; --more) {
    const PlainQuestion part = chance.OneOf(4) && !any ? Negated(Tree(depth)) : Tree(depth);
    const PlainQuestion before = group;
    group.text += (any ? " OR " : chance.OneOf(3) ? " AND " : " ") + part.text;
    group.test = [=](const PlainFile& f) {
      return any ? before.test(f) || part.test(f) : before.test(f) && part.test(f);
    };
    group.is_positive =
        any ? before.is_positive && part.is_positive : before.is_positive || part.is_positive;
  }
  group.text = "(" + group.text + ")";
  return group;
}

PlainQuestion QuestionMaker::Tree(size_t depth) {
  if (depth == 0 || chance.OneOf(5)) {
    return Leaf();
  }
  const size_t form = chance.Below(6);
  return form == 0 ? Negated(Tree(depth - 1)) : Group(form < 3, depth - 1);
}

}  // namespace fileindexd
