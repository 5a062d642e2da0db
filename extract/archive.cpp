// SPDX-License-Identifier: GPL-2.0-or-later
#include <algorithm>
#include <string>
#include <string_view>

#include "base/utf8.h"
#include "extract/charset.h"
#include "extract/decoder.h"
#include "extract/format.h"
#include "extract/media_text.h"
#include "extract/memory_file.h"
#include "extract/nested.h"
#include "extract/unpacker.h"

namespace fileindexd {

namespace {

constexpr int MAX_NAMES = 10'000;

std::string_view LastComponent(std::string_view path) {
  while (path.ends_with('/')) {
    path.remove_suffix(1);
  }
  return path.substr(path.rfind('/') + 1);  // npos + 1 is 0
}

// Members without words are not worth the unpacking: only text is wanted of them.
bool IsWordless(std::string_view name) {
  return HasEnding(
      name,
      "jpg jpeg png gif webp heic tif tiff bmp ico mp3 flac ogg opus m4a wav mp4 mkv avi "
      "mov webm exe dll so o a ttf otf woff class pyc");
}

// "paper.pdf.gz" holds "paper.pdf".
std::string BareName(const std::string& name) {
  const size_t dot = name.rfind('.');
  return dot == std::string::npos || dot == 0 ? name : name.substr(0, dot);
}

// Of a long one, the beginning.
bool ReadBytes(Unpacker& archive, Allowance& allowance, MemoryFile& member) {
  const bool is_whole = archive.ReadAll(Allowance::MAX_MEMBER_BYTES, member);
  if (member.size >= Allowance::MAX_MEMBER_BYTES) {
    allowance.NoteBound();
  }
  return is_whole;
}

void ReadMember(Unpacker& archive, const Document& document, Allowance& allowance,
                ContentSink& sink) {
  MemoryFile member;
  (void)ReadBytes(archive, allowance, member);
  if (member.size > 0) {
    const std::string name(LastComponent(archive.name));
    ReadNestedText(ReadDocument, member.AsDocument(name, document.depth + 1), sink);
  }
}

// One compressed file is what it holds, fields and all.
bool ReadBare(Unpacker& archive, const Document& document, Allowance& allowance, ContentSink& sink,
              std::string& why) {
  MemoryFile member;
  const bool is_whole = ReadBytes(archive, allowance, member);
  if (!is_whole && member.size == 0) {
    why = "damaged";
    return false;
  }
  bool is_good =
      ReadDocument(member.AsDocument(BareName(document.name), document.depth + 1), sink, why);
  sink.converter.clear();  // it would be given the compressed bytes
  if (archive.is_broken) {
    why = "damaged";
    is_good = false;
  }
  return is_good;
}

// All of them together tell their charset better than each for itself.
void SetForeignNames(std::string_view names, ContentSink& sink) {
  if (names.empty()) {
    return;
  }
  const std::string known = ToUtf8(names, GuessNamesCharset(names));
  for (std::string_view rest = known; !rest.empty();) {
    const size_t end = std::min(rest.find('\n'), rest.size() - 1);
    sink.Set(ContentField::MEMBERS, rest.substr(0, end));
    rest.remove_prefix(end + 1);
  }
}

}  // namespace

bool ReadArchive(const Document& document, ContentSink& sink, std::string& why) {
  sink.SetKind(Kind::DOCUMENT);
  if (document.depth >= Allowance::MAX_DEPTH) {
    return true;  // an archive so deep inside others counts as a member without text
  }
  Allowance allowance;
  Unpacker archive;
  if (!archive.Open(document, Unpacker::Formats::ALL, why)) {
    return false;
  }

  int names = 0;
  int read = 0;
  std::string foreign;  // names in a charset that the archive does not tell, a line each
  bool is_encrypted = false;
  while (archive.Next()) {
    if (archive.is_bare) {
      return ReadBare(archive, document, allowance, sink, why);
    }
    if (++names > MAX_NAMES) {
      allowance.NoteBound();
      break;
    }
    if (IsUtf8(archive.name)) {
      sink.Set(ContentField::MEMBERS, archive.name);
    } else if (foreign.size() < ContentSink::MAX_FIELD) {
      foreign += archive.name + "\n";
    }
    is_encrypted = is_encrypted || archive.is_encrypted;
    if (archive.is_file && !archive.is_encrypted && !sink.IsFull() && !IsWordless(archive.name) &&
        allowance.TakeMember()) {
      ++read;
      ReadMember(archive, document, allowance, sink);
    }
  }
  SetForeignNames(foreign, sink);
  if ((is_encrypted && read == 0) || archive.is_closed) {
    why = "encrypted";
  } else if (archive.is_damaged) {
    why = names == 0 && !archive.is_compressed ? "not an archive" : "damaged";
  } else if (archive.is_broken) {
    why = "damaged";
  }
  return why.empty();
}

}  // namespace fileindexd
