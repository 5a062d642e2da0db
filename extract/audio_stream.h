// SPDX-License-Identifier: GPL-2.0-or-later
// A file as the tag library sees it: read only, by descriptor, within a bound.
#pragma once

#include <taglib/tiostream.h>

#include <cstdint>
#include <string>

#include "extract/format.h"

namespace fileindexd {

// The library opens by path and reads in tiny steps; this reads by descriptor and in blocks. A
// search for a frame goes through the whole file where there is none, so what is read in all is
// bounded: beyond it the file seems to end.
class AudioStream : public TagLib::IOStream {
 public:
  // The document must outlive it.
  explicit AudioStream(const Document& read_document)
      : document(read_document), size(read_document.size) {}

  // The names are the library's.
  // NOLINTBEGIN(readability-identifier-naming)
  TagLib::FileName name() const override { return ""; }
  TagLib::ByteVector readBlock(unsigned long length) override;
  void writeBlock(const TagLib::ByteVector&) override {}
  void insert(const TagLib::ByteVector&, unsigned long, unsigned long) override {}
  void removeBlock(unsigned long, unsigned long) override {}
  bool readOnly() const override { return true; }
  bool isOpen() const override { return true; }
  void seek(long offset, Position from) override;
  long tell() const override { return static_cast<long>(position); }
  long length() override { return static_cast<long>(size); }
  void truncate(long) override {}
  // NOLINTEND(readability-identifier-naming)

  static constexpr int64_t MAX_READ = 64 << 20;   // bytes read from the file in all
  static constexpr int64_t MAX_CALLS = 200'000;   // blocks asked for
  static constexpr int64_t MAX_BLOCK = 32 << 20;  // a tag with its pictures

 private:
  bool Fill();

  const Document& document;
  int64_t size;  // bytes
  int64_t position = 0;
  int64_t read_bytes = 0;
  int64_t calls = 0;
  std::string block;        // bytes of the file from block_start
  int64_t block_start = 0;  // meaningless while the block is empty
};

}  // namespace fileindexd
