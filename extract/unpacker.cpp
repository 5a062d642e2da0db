// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/unpacker.h"

#include <archive.h>
#include <archive_entry.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <clocale>
#include <cstdio>

#include "extract/read_at.h"

namespace fileindexd {

namespace {

// Members' names are converted to the locale's charset; in the C locale every letter that is not
// ASCII would be lost. The process's locale stays as it is.
class Utf8Locale {
 public:
  Utf8Locale() : made(newlocale(LC_CTYPE_MASK, "C.UTF-8", nullptr)) {
    if (made != nullptr) {
      before = uselocale(made);
    }
  }
  ~Utf8Locale() {
    if (made != nullptr) {
      uselocale(before);
      freelocale(made);
    }
  }
  Utf8Locale(const Utf8Locale&) = delete;
  Utf8Locale& operator=(const Utf8Locale&) = delete;

 private:
  locale_t made;
  locale_t before = nullptr;
};

bool IsUsable(int code) {
  return code == ARCHIVE_OK || code == ARCHIVE_WARN;
}

// The library says of what is compressed and cut early only that it is no archive.
bool BeginsCompressed(const Document& document) {
  const std::string begin = FirstBytes(document, 4);
  return begin.starts_with("\x1F\x8B") || begin.starts_with("BZh") ||
         begin.starts_with("\xFD\x37zX") || begin.starts_with("\x28\xB5\x2F\xFD");
}

// What the library has no method for is not damaged. It has no code for that, and many words.
bool IsUnknownMethod(const char* error) {
  const std::string_view words = error != nullptr ? error : "";
  return words.find("upported") != std::string_view::npos ||  // unsupported, not supported
         words.find("codec ID") != std::string_view::npos;
}

}  // namespace

Unpacker::~Unpacker() {
  if (packed != nullptr) {
    archive_read_free(packed);
  }
}

bool Unpacker::UseFormats(Formats formats) {
  if (formats == Formats::ZIP) {
    return archive_read_support_format_zip(packed) == ARCHIVE_OK;
  }
  // One by one: "all" of the library's filters includes those that start a program.
  for (const auto support :
       {archive_read_support_filter_gzip,     archive_read_support_filter_bzip2,
        archive_read_support_filter_compress, archive_read_support_filter_lzma,
        archive_read_support_filter_xz,       archive_read_support_filter_lzip,
        archive_read_support_filter_zstd,     archive_read_support_filter_lz4,
        archive_read_support_filter_rpm,      archive_read_support_format_zip,
        archive_read_support_format_tar,      archive_read_support_format_7zip,
        archive_read_support_format_rar,      archive_read_support_format_rar5,
        archive_read_support_format_iso9660,  archive_read_support_format_ar,
        archive_read_support_format_cab,      archive_read_support_format_cpio,
        archive_read_support_format_lha,      archive_read_support_format_raw}) {
    if (support(packed) != ARCHIVE_OK) {
      return false;
    }
  }
  return true;
}

ssize_t Unpacker::ReadBlock(struct archive* packed, void* source, const void** block) {
  auto& from = *static_cast<Source*>(source);
  const size_t got = ReadAt(from.document, from.position, from.block.data(), BLOCK);
  if (got == 0 && errno != 0) {
    archive_set_error(packed, errno, "cannot be read");
    return ARCHIVE_FATAL;
  }
  from.position += static_cast<int64_t>(got);
  *block = from.block.data();
  return static_cast<ssize_t>(got);
}

// By whole blocks, and never beyond the end.
int64_t Unpacker::Skip(struct archive* /*packed*/, void* source, int64_t count) {
  auto& from = *static_cast<Source*>(source);
  constexpr auto STEP = static_cast<int64_t>(BLOCK);
  const int64_t left = std::max<int64_t>(from.document.size - from.position, 0);
  const int64_t skipped = std::min(count, left) / STEP * STEP;
  from.position += skipped;
  return skipped;
}

int64_t Unpacker::Seek(struct archive* /*packed*/, void* source, int64_t offset, int from_where) {
  auto& from = *static_cast<Source*>(source);
  const int64_t size = from.document.size;
  const int64_t start = from_where == SEEK_SET ? 0 : from_where == SEEK_CUR ? from.position : size;
  int64_t target = 0;
  if (__builtin_add_overflow(start, offset, &target) || target < 0) {
    return ARCHIVE_FATAL;
  }
  // Behind the end there is nothing, however far.
  from.position = std::min(target, size);
  return from.position;
}

bool Unpacker::Open(const Document& document, Formats formats, std::string& why) {
  packed = archive_read_new();
  if (packed == nullptr || !UseFormats(formats)) {
    why = "cannot be unpacked";
    return false;
  }
  source.emplace(document);
  (void)archive_read_set_callback_data(packed, &*source);  // these fail for no archive
  (void)archive_read_set_read_callback(packed, ReadBlock);
  (void)archive_read_set_skip_callback(packed, Skip);
  (void)archive_read_set_seek_callback(packed, Seek);
  if (archive_read_open1(packed) != ARCHIVE_OK) {
    why = BeginsCompressed(document) ? "damaged"
          : formats == Formats::ZIP  ? "not a ZIP file"
                                     : "not an archive";
    return false;
  }
  return true;
}

// Where passing a member over means unpacking it, the library would do that in one go, however long
// it takes.
bool Unpacker::PassOver() {
  const int format = archive_format(packed);
  const bool is_unpacked = archive_filter_count(packed) > 1 || size < 0 ||
                           format == ARCHIVE_FORMAT_7ZIP || format == ARCHIVE_FORMAT_RAR_V5 ||
                           format == ARCHIVE_FORMAT_CAB;
  int code = is_unpacked && is_inside ? ARCHIVE_OK : ARCHIVE_EOF;
  while (IsUsable(code)) {
    const void* block = nullptr;
    size_t length = 0;
    la_int64_t offset = 0;  // what lies between blocks is a hole, and costs nothing
    code = archive_read_data_block(packed, &block, &length, &offset);
    if (IsUsable(code)) {
      counted += static_cast<int64_t>(length);
      if (!allowance.TakeBytes(static_cast<int64_t>(length))) {
        return false;
      }
    }
  }
  is_inside = false;
  return true;  // what cannot be unpacked may still be followed by what can
}

bool Unpacker::Next() {
  const Utf8Locale locale;
  if (!PassOver()) {
    return false;
  }
  // A compressed stream is unpacked between its members' bytes, too.
  const int64_t unpacked = archive_filter_count(packed) > 1 ? archive_filter_bytes(packed, 0) : 0;
  const int64_t skipped = std::max<int64_t>(unpacked - counted, 0);
  counted += skipped;
  if (!allowance.TakeBytes(skipped)) {
    return false;
  }

  struct archive_entry* entry = nullptr;
  const int code = archive_read_next_header(packed, &entry);
  is_compressed = archive_filter_count(packed) > 1;
  if (!IsUsable(code)) {
    is_damaged = code != ARCHIVE_EOF;
    is_closed = is_damaged && archive_read_has_encrypted_entries(packed) > 0;
    return false;
  }
  const char* path = archive_entry_pathname(entry);
  name = path != nullptr ? path : "";
  size = archive_entry_size_is_set(entry) != 0 ? archive_entry_size(entry) : -1;
  is_file = archive_entry_filetype(entry) == AE_IFREG || archive_entry_filetype(entry) == 0;
  is_encrypted = archive_entry_is_encrypted(entry) != 0;
  is_inside = true;
  is_bare = archive_format(packed) == ARCHIVE_FORMAT_RAW;
  // Any file at all passes for one that is not even compressed.
  is_damaged = is_bare && archive_filter_count(packed) == 1;
  return !is_damaged;
}

ssize_t Unpacker::Read(char* into, size_t count) {
  const Utf8Locale locale;
  const ssize_t got = archive_read_data(packed, into, count);
  if (got < 0) {
    is_broken = is_broken || !IsUnknownMethod(archive_error_string(packed));
    return -1;
  }
  counted += got;
  return allowance.TakeBytes(got) ? got : -1;
}

bool Unpacker::ReadAll(size_t limit, std::string& bytes) {
  std::array<char, BLOCK> block;
  bytes.clear();
  for (;;) {
    const ssize_t got = Read(block.data(), block.size());
    if (got <= 0) {
      return got == 0;
    }
    const size_t taken = std::min(static_cast<size_t>(got), limit - bytes.size());
    bytes.append(block.data(), taken);
    if (taken < static_cast<size_t>(got)) {
      return false;
    }
  }
}

bool Unpacker::ReadAll(int64_t limit, MemoryFile& file) {
  std::array<char, BLOCK> block;
  if (!file.Open()) {
    return false;
  }
  for (;;) {
    const ssize_t got = Read(block.data(), block.size());
    if (got <= 0) {
      return got == 0;
    }
    const int64_t taken = std::min<int64_t>(got, limit - file.size);
    if (!file.Append(std::string_view(block.data(), static_cast<size_t>(taken))) || taken < got) {
      return false;
    }
  }
}

}  // namespace fileindexd
