// SPDX-License-Identifier: GPL-2.0-or-later
//
// DESIGN. A "*" among bytes and a "**" among components are both compared greedily: each takes
// nothing at first, and when what follows fails, the last one takes one more. Going back further is
// never needed, since whatever an earlier one could leave is there for the last one to take. So no
// pattern costs more than the product of the lengths.
#include "state/exclude_pattern.h"

#include <cctype>
#include <utility>

namespace fileindexd {

namespace {

using Token = ExcludePattern::Token;
using Atom = ExcludePattern::Atom;
using Part = ExcludePattern::Part;

constexpr size_t NONE = std::string::npos;

unsigned char Value(char byte) {
  return static_cast<unsigned char>(byte);
}

// By ASCII alone: names are bytes, in no locale.
bool IsInClass(std::string_view name, int byte) {
  const bool upper = byte >= 'A' && byte <= 'Z';
  const bool lower = byte >= 'a' && byte <= 'z';
  const bool digit = byte >= '0' && byte <= '9';
  const bool graph = byte > ' ' && byte < 0x7f;
  const bool letter = upper || lower;
  return (name == "alnum" && (letter || digit)) || (name == "alpha" && letter) ||
         (name == "blank" && (byte == ' ' || byte == '\t')) ||
         (name == "cntrl" && (byte < ' ' || byte == 0x7f)) || (name == "digit" && digit) ||
         (name == "graph" && graph) || (name == "lower" && lower) ||
         (name == "print" && (graph || byte == ' ')) ||
         (name == "punct" && graph && !letter && !digit) ||
         (name == "space" && (byte == ' ' || (byte >= '\t' && byte <= '\r'))) ||
         (name == "upper" && upper) ||
         (name == "xdigit" &&
          (digit || (byte >= 'a' && byte <= 'f') || (byte >= 'A' && byte <= 'F')));
}

bool IsClass(std::string_view name) {
  for (const char* known : {"alnum", "alpha", "blank", "cntrl", "digit", "graph", "lower", "print",
                            "punct", "space", "upper", "xdigit"}) {
    if (name == known) {
      return true;
    }
  }
  return false;
}

// Reads one pattern from left to right.
class Reader {
 public:
  explicit Reader(std::string_view pattern) : text(pattern) {}

  // Null, or what is wrong.
  const char* Read(std::vector<Part>& parts, bool name_alone) {
    Part part;
    size_t begin = 0;
    while (at < text.size()) {
      // An escaped slash is a slash.
      const bool escaped = text[at] == '\\' && at + 1 < text.size() && text[at + 1] == '/';
      if (text[at] == '/' || escaped) {
        End(std::move(part), text.substr(begin, at - begin), name_alone, parts);
        if (escaped && parts.back().any_depth) {
          parts.push_back(AnyName());  // as git has it: not none
        }
        part = {};
        at += escaped ? 2 : 1;
        begin = at;
        continue;
      }
      if (const char* wrong = ReadAtom(part); wrong != nullptr) {
        return wrong;
      }
    }
    End(std::move(part), text.substr(begin), name_alone, parts);
    if (parts.back().any_depth) {
      parts.push_back(AnyName());  // at the end: all that is below, not the directory itself
    }
    return nullptr;
  }

 private:
  static Part AnyName() {
    Part part;
    part.atoms.push_back({Token::ANY_BYTES, 0, 0});
    return part;
  }

  static void End(Part&& part, std::string_view written, bool name_alone,
                  std::vector<Part>& parts) {
    part.any_depth = !name_alone && written.size() >= 2 && written.find_first_not_of('*') == NONE;
    parts.push_back(std::move(part));
  }

  const char* ReadAtom(Part& part) {
    const char byte = text[at++];
    if (byte == '*') {
      if (part.atoms.empty() || part.atoms.back().token != Token::ANY_BYTES) {
        part.atoms.push_back({Token::ANY_BYTES, 0, 0});
      }
      return nullptr;
    }

    ++part.shortest;
    if (byte == '[') {
      part.atoms.push_back({Token::SET, 0, part.sets.size()});
      return ReadSet(part.sets.emplace_back());
    }
    if (byte == '\\') {
      if (at == text.size()) {
        return "nothing follows the backslash at its end";
      }
      part.atoms.push_back({Token::BYTE, text[at++], 0});
      return nullptr;
    }
    part.atoms.push_back({byte == '?' ? Token::ANY_BYTE : Token::BYTE, byte, 0});
    return nullptr;
  }

  // Behind the "[". A "]" that comes first stands for itself.
  const char* ReadSet(std::bitset<256>& set) {
    const bool negated = at < text.size() && (text[at] == '!' || text[at] == '^');
    at += negated ? 1 : 0;
    int before = -1;  // what a range may begin with
    for (bool first = true;; first = false) {
      if (at == text.size()) {
        return "its bracket is not closed";
      }
      if (text[at] == ']' && !first) {
        break;
      }
      if (const char* wrong = ReadSetItem(set, before); wrong != nullptr) {
        return wrong;
      }
    }
    ++at;
    if (negated) {
      set.flip();
    }
    set.reset('/');
    return nullptr;
  }

  const char* ReadSetItem(std::bitset<256>& set, int& before) {
    if (text.substr(at).starts_with("[:")) {
      const size_t end = text.find(']', at + 2);
      if (end == NONE) {
        return "its bracket is not closed";
      }
      if (end > at + 2 && text[end - 1] == ':') {
        return ReadClass(text.substr(at + 2, end - 1 - (at + 2)), end + 1, set, before);
      }
    }

    const bool range =
        text[at] == '-' && before >= 0 && at + 1 < text.size() && text[at + 1] != ']';
    at += range ? 1 : 0;
    if (text[at] == '\\' && ++at == text.size()) {
      return "its bracket is not closed";
    }
    const int byte = Value(text[at++]);
    for (int each = range ? before : byte; each <= byte; ++each) {
      set.set(static_cast<size_t>(each));
    }
    before = range ? -1 : byte;
    return nullptr;
  }

  const char* ReadClass(std::string_view name, size_t end, std::bitset<256>& set, int& before) {
    if (!IsClass(name)) {
      return "it names a class of bytes that there is not";
    }
    for (int byte = 0; byte < 256; ++byte) {
      if (IsInClass(name, byte)) {
        set.set(static_cast<size_t>(byte));
      }
    }
    at = end;
    before = -1;
    return nullptr;
  }

  std::string_view text;
  size_t at = 0;
};

bool Takes(const Part& part, const Atom& atom, char byte) {
  switch (atom.token) {
    case Token::BYTE:
      return atom.byte == byte;
    case Token::SET:
      return part.sets[atom.set][Value(byte)];
    default:
      return true;
  }
}

bool MatchesName(const Part& part, std::string_view name) {
  const std::vector<Atom>& atoms = part.atoms;
  if (name.size() < part.shortest) {
    return false;
  }
  // Most names end otherwise than "*.o" does.
  if (!name.empty() && !atoms.empty() && atoms.back().token == Token::BYTE &&
      atoms.back().byte != name.back()) {
    return false;
  }

  size_t next = 0;
  size_t star = NONE;  // the last "*" that was met, and how far it reaches
  size_t reach = 0;
  for (size_t i = 0; i < name.size();) {
    if (next < atoms.size() && atoms[next].token == Token::ANY_BYTES) {
      star = next++;
      reach = i;
    } else if (next < atoms.size() && Takes(part, atoms[next], name[i])) {
      ++next;
      ++i;
    } else if (star != NONE) {
      next = star + 1;
      i = ++reach;
    } else {
      return false;
    }
  }
  return next == atoms.size() ||
         (next + 1 == atoms.size() && atoms[next].token == Token::ANY_BYTES);
}

// A blank at the end counts only behind a backslash that is itself not escaped.
std::string_view WithoutTrailingBlanks(std::string_view text) {
  size_t end = 0;
  for (size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '\\') {
      ++i;
      end = i < text.size() ? i + 1 : text.size();
    } else if (text[i] != ' ') {
      end = i + 1;
    }
  }
  return text.substr(0, end);
}

std::string Named(const std::string& text) {
  constexpr size_t SHOWN = 100;
  return "exclude pattern \"" + (text.size() <= SHOWN ? text : text.substr(0, SHOWN) + "...") +
         "\": ";
}

}  // namespace

bool ReadExcludePattern(const std::string& text, ExcludePattern& pattern, std::string& error) {
  if (text.size() > MAX_EXCLUDE_LENGTH) {
    error = Named(text) + "longer than " + std::to_string(MAX_EXCLUDE_LENGTH) + " bytes";
    return false;
  }
  if (text.find_first_of(std::string_view("\n\0", 2)) != NONE) {
    error = Named(text) + "holds a newline or a NUL";
    return false;
  }

  ExcludePattern read;
  std::string_view rest = WithoutTrailingBlanks(text);
  read.negated = rest.starts_with('!');
  rest.remove_prefix(read.negated ? 1 : 0);
  read.directory_only = rest.ends_with('/');
  rest.remove_suffix(read.directory_only ? 1 : 0);
  read.name_alone = rest.find('/') == NONE;
  rest.remove_prefix(rest.starts_with('/') ? 1 : 0);
  const char* wrong =
      rest.empty() ? "names nothing" : Reader(rest).Read(read.parts, read.name_alone);
  if (wrong != nullptr) {
    error = Named(text) + wrong;
    return false;
  }
  pattern = std::move(read);
  return true;
}

bool MatchesExcludePattern(const ExcludePattern& pattern,
                           const std::vector<std::string_view>& components, size_t count) {
  const std::vector<Part>& parts = pattern.parts;
  if (pattern.name_alone) {
    return MatchesName(parts.front(), components[count - 1]);
  }

  size_t next = 0;
  size_t star = NONE;
  size_t reach = 0;
  for (size_t i = 0; i < count;) {
    if (next < parts.size() && parts[next].any_depth) {
      star = next++;
      reach = i;
    } else if (next < parts.size() && MatchesName(parts[next], components[i])) {
      ++next;
      ++i;
    } else if (star != NONE) {
      next = star + 1;
      i = ++reach;
    } else {
      return false;
    }
  }
  while (next < parts.size() && parts[next].any_depth) {
    ++next;
  }
  return next == parts.size();
}

}  // namespace fileindexd
