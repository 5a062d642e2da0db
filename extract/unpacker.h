// SPDX-License-Identifier: GPL-2.0-or-later
// Members of an archive, one after the other, as they lie in the file.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "extract/format.h"
#include "extract/memory_file.h"
#include "extract/nested.h"

struct archive;

namespace fileindexd {

// Bounded by the file's allowance. No program is started for a compression that the library does
// not know itself.
class Unpacker {
 public:
  enum class Formats { ZIP, ALL };  // ALL: one file that is only compressed, too

  Unpacker() = default;
  ~Unpacker();
  Unpacker(const Unpacker&) = delete;
  Unpacker& operator=(const Unpacker&) = delete;

  // The document must outlive this object.
  bool Open(const Document& document, Formats formats, std::string& why);

  // Goes to the next member. False at the end, where the archive is damaged (see `is_damaged`) and
  // where the allowance is spent.
  bool Next();
  // The current member's next bytes: 0 at its end, -1 where they cannot be had.
  ssize_t Read(char* into, size_t count);
  // All of the current member's bytes. False where they cannot be had or are more than `limit`;
  // what comes before that is there.
  bool ReadAll(size_t limit, std::string& bytes);
  bool ReadAll(int64_t limit, MemoryFile& file);

  // Of the current member.
  std::string name;   // any bytes
  int64_t size = -1;  // as the archive says; -1: it does not
  bool is_file = false;
  bool is_encrypted = false;

  bool is_damaged = false;
  bool is_broken = false;      // bytes of a member that was read could not be had
  bool is_closed = false;      // not even the names can be had without a password
  bool is_bare = false;        // no archive, one compressed file
  bool is_compressed = false;  // the whole is, as far as its beginning tells

 private:
  // The document, as the library asks for it.
  struct Source {
    explicit Source(const Document& read_document) : document(read_document), block(BLOCK, '\0') {}
    const Document& document;
    int64_t position = 0;
    std::string block;
  };
  static ssize_t ReadBlock(struct archive* packed, void* source, const void** block);
  static int64_t Skip(struct archive* packed, void* source, int64_t count);
  static int64_t Seek(struct archive* packed, void* source, int64_t offset, int from);

  static constexpr size_t BLOCK = 64 * 1024;

  bool UseFormats(Formats formats);
  // The rest of the current member. False where the allowance is spent.
  bool PassOver();

  Allowance allowance;
  std::optional<Source> source;
  struct archive* packed = nullptr;
  bool is_inside = false;  // there is a current member, perhaps not read to its end
  int64_t counted = 0;     // bytes that the allowance was asked for
};

}  // namespace fileindexd
