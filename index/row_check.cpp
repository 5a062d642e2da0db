// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/row_check.h"

#include <algorithm>
#include <cmath>
#include <numbers>

#include "base/utf8.h"
#include "index/content_text.h"
#include "index/entry_table.h"
#include "state/layout.h"

namespace fileindexd {

namespace {

// What was read is known, be it only half of it.
const FileFacts* ReadFactsOf(const Candidate& candidate) {
  return candidate.facts.has_value() && candidate.facts->state != ContentState::WAITING
             ? &*candidate.facts
             : nullptr;
}

}  // namespace

bool NeedsFacts(const QueryNode& node) {
  switch (node.part) {
    case Part::RANGE:
      return node.column == Column::FIELD;
    case Part::IS:
      return node.property == Property::DUPLICATE;
    case Part::NEAR:
    case Part::HAS:
    case Part::CONTENT:
      return true;
    default:
      return std::any_of(node.below.begin(), node.below.end(), NeedsFacts);
  }
}

int RowCheck::Matches(const QueryNode& node, Candidate& candidate, bool& matches) {
  switch (node.part) {
    case Part::AND:
    case Part::OR:
      return MatchesGroup(node, candidate, matches);
    case Part::NOT: {
      const int code = Matches(node.below.front(), candidate, matches);
      matches = !matches;
      return code;
    }
    default:
      return MatchesLeaf(node, candidate, matches);
  }
}

int RowCheck::MatchesGroup(const QueryNode& node, Candidate& candidate, bool& matches) {
  const bool decides = node.part == Part::OR;  // one such part does
  matches = !decides;
  for (const bool looks_further : {false, true}) {
    for (const QueryNode& below : node.below) {
      if (NeedsFacts(below) != looks_further) {
        continue;
      }
      const int code = Matches(below, candidate, matches);
      if (code != SQLITE_OK || matches == decides) {
        return code;
      }
    }
  }
  matches = !decides;
  return SQLITE_OK;
}

int RowCheck::InName(const QueryNode& word, Candidate& candidate, bool& matches) {
  const WordSet& set = sets.Of(word);
  matches = set.names.Has(candidate.entry.id);
  if (matches || !set.asks_names || sets.Rarest().names.Has(candidate.entry.id)) {
    return SQLITE_OK;
  }
  const int code = rows.NeedFacts(candidate);
  if (code != SQLITE_OK || !candidate.facts.has_value() ||
      !sets.Rarest().texts.Has(candidate.facts->text)) {
    return code;
  }
  return sets.AskName(word, candidate.entry.id, matches);
}

int RowCheck::InText(const QueryNode& word, Candidate& candidate, bool& matches) {
  const WordSet& set = sets.Of(word);
  matches = false;
  if (set.texts.IsEmpty() && !set.asks_texts) {
    return SQLITE_OK;
  }
  const int code = rows.NeedFacts(candidate);
  if (code != SQLITE_OK || !candidate.facts.has_value() || candidate.facts->text == 0) {
    return code;
  }
  const int64_t text = candidate.facts->text;
  matches = set.texts.Has(text);
  if (matches || !set.asks_texts || sets.Rarest().texts.Has(text) ||
      !sets.Rarest().names.Has(candidate.entry.id)) {
    return SQLITE_OK;
  }
  return sets.AskText(word, text, matches);
}

// What is known without asking first.
int RowCheck::MatchesWord(const QueryNode& word, Candidate& candidate, bool& matches) {
  matches = sets.Of(word).names.Has(candidate.entry.id);
  int code = matches ? SQLITE_OK : InText(word, candidate, matches);
  if (code == SQLITE_OK && !matches) {
    code = InName(word, candidate, matches);
  }
  return code;
}

int RowCheck::MatchesLeaf(const QueryNode& node, Candidate& candidate, bool& matches) {
  if (NeedsFacts(node)) {
    const int code = rows.NeedFacts(candidate);
    if (code != SQLITE_OK) {
      return code;
    }
  }
  const Entry& entry = candidate.entry;
  const auto among = [&node](int64_t number) {
    return std::find(node.numbers.begin(), node.numbers.end(), number) != node.numbers.end();
  };
  switch (node.part) {
    case Part::WORD:
      return MatchesWord(node, candidate, matches);
    case Part::NAME_PATTERN:
      return InName(node, candidate, matches);
    case Part::EXACT_NAME:
      matches = rows.FoldedName(candidate) == folder.Parts(node.text);
      return SQLITE_OK;
    case Part::KIND: {
      Kind kind = Kind::OTHER;
      const int code = rows.KindOf(candidate, kind);
      matches = among(static_cast<int64_t>(kind));
      return code;
    }
    case Part::EXT:
      matches = MatchesEnding(node, candidate);
      return SQLITE_OK;
    case Part::PATH:
      matches = MatchesPath(node, candidate);
      return SQLITE_OK;
    case Part::SHARE:
      matches = sets.Of(node).everything;
      return SQLITE_OK;
    case Part::OWNER:
      matches = among(entry.owner);
      return SQLITE_OK;
    case Part::UNDER:
      matches = Covers(node.names.front(), entry.path);
      return SQLITE_OK;
    case Part::RANGE:
      matches = MatchesRange(node, candidate);
      return SQLITE_OK;
    case Part::NEAR:
      matches = DistanceOf(node, candidate).value_or(node.radius + 1) <= node.radius;
      return SQLITE_OK;
    case Part::IS:
      if (node.property == Property::DUPLICATE) {
        return rows.HasTwin(candidate, matches);
      }
      matches = MatchesProperty(node.property, entry);
      return SQLITE_OK;
    default:
      matches = MatchesContent(node, candidate);
      return SQLITE_OK;
  }
}

bool RowCheck::MatchesPath(const QueryNode& node, const Candidate& candidate) {
  const NamePattern& pattern = paths.try_emplace(&node, node).first->second;
  return pattern.Fits(folder.Parts(ToUtf8(candidate.entry.path)));
}

bool RowCheck::MatchesEnding(const QueryNode& node, Candidate& candidate) {
  const std::string& name = rows.FoldedName(candidate);
  return candidate.entry.kind != Kind::FOLDER &&
         std::any_of(node.names.begin(), node.names.end(), [&](const std::string& ending) {
           return HasEnding(name, folder.Parts(ending));
         });
}

bool RowCheck::MatchesProperty(Property property, const Entry& entry) {
  switch (property) {
    case Property::FILE:
      return entry.thing == Thing::FILE;
    case Property::FOLDER:
      return entry.thing == Thing::DIRECTORY;
    case Property::LINK:
      return entry.thing == Thing::LINK;
    case Property::EMPTY:
      return entry.thing == Thing::FILE && entry.size == 0;
    case Property::HIDDEN:
      return LastComponent(entry.path).starts_with('.');
    case Property::DUPLICATE:
      break;
  }
  return false;
}

bool RowCheck::MatchesContent(const QueryNode& node, const Candidate& candidate) {
  if (node.part == Part::CONTENT) {
    const ContentState state =
        candidate.facts.has_value() ? candidate.facts->state : ContentState::WAITING;
    const ContentStage stage = state == ContentState::WAITING ? ContentStage::WAITING
                               : state == ContentState::DONE  ? ContentStage::DONE
                                                              : ContentStage::FAILED;
    return candidate.entry.content_wanted && stage == node.stage;
  }

  const FileFacts* facts = ReadFactsOf(candidate);
  if (facts == nullptr) {
    return false;
  }
  if (node.presence == Presence::TEXT) {
    return facts->length > 0 && (facts->fields & NO_TEXT) == 0;
  }
  if (node.presence == Presence::CONTENT) {
    const bool has_number =
        std::any_of(facts->numbers.begin(), facts->numbers.end(),
                    [](const std::optional<int64_t>& number) { return number.has_value(); });
    return facts->length > 0 || has_number;
  }
  if (node.presence == Presence::LOCATION) {
    return facts->Number(ContentField::LATITUDE).has_value() &&
           facts->Number(ContentField::LONGITUDE).has_value();
  }
  return IsNumberField(node.field) ? facts->Number(node.field).has_value()
                                   : (facts->fields >> static_cast<int>(node.field) & 1) != 0;
}

bool RowCheck::MatchesRange(const QueryNode& node, const Candidate& candidate) {
  const std::optional<int64_t> number = NumberOf(node, candidate);
  return number.has_value() && *number >= node.lowest && *number <= node.highest;
}

std::optional<int64_t> NumberOf(const QueryNode& range, const Candidate& candidate) {
  const bool is_folder = candidate.entry.thing == Thing::DIRECTORY;
  switch (range.column) {
    case Column::SIZE:
      return is_folder ? std::nullopt : std::optional(candidate.entry.size);
    case Column::MODIFIED:
      return is_folder ? std::nullopt : std::optional(candidate.entry.mtime);
    case Column::ADDED:
      return candidate.entry.first_seen;
    case Column::FIELD:
      break;
  }
  const FileFacts* facts = ReadFactsOf(candidate);
  return facts == nullptr ? std::nullopt : facts->Number(range.field);
}

// On a sphere: half a percent wrong at most.
std::optional<double> DistanceOf(const QueryNode& near, const Candidate& candidate) {
  constexpr double EARTH_RADIUS = 6'371'000;
  constexpr double STORED = 1e7;
  constexpr double RADIANS = std::numbers::pi / 180;
  const FileFacts* facts = ReadFactsOf(candidate);
  if (facts == nullptr || !facts->Number(ContentField::LATITUDE).has_value() ||
      !facts->Number(ContentField::LONGITUDE).has_value()) {
    return std::nullopt;
  }
  const double from = near.latitude * RADIANS;
  const double to = static_cast<double>(*facts->Number(ContentField::LATITUDE)) / STORED * RADIANS;
  const double east =
      static_cast<double>(*facts->Number(ContentField::LONGITUDE)) / STORED * RADIANS -
      near.longitude * RADIANS;
  const double chord = std::pow(std::sin((to - from) / 2), 2) +
                       std::cos(from) * std::cos(to) * std::pow(std::sin(east / 2), 2);
  return 2 * EARTH_RADIUS * std::asin(std::sqrt(std::clamp(chord, 0.0, 1.0)));
}

}  // namespace fileindexd
