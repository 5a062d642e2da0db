// SPDX-License-Identifier: GPL-2.0-or-later
//
//   log     header(32) frame…
//   header  magic version page-size sequence salt salt checksum checksum
//   frame   page-number size-after-commit salt salt checksum checksum page
//
// of big-endian numbers of 4 bytes each; a size after a commit of 0: no commit.
//
// A frame belongs to the log while its salts are the header's; others are left from before. How far
// SQLite believes the log stands in the shared memory beside it: a number in the host's own order.
#include "index/log_check.h"

#include <endian.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cstdint>
#include <string>

#include "base/scoped_fd.h"

namespace fileindexd {

namespace {

constexpr off_t HEADER_SIZE = 32;
constexpr off_t FRAME_HEADER_SIZE = 24;
constexpr off_t LAST_FRAME_OFFSET = 16;  // in the shared memory
constexpr uint32_t MAGIC = 0x377f0682;   // the last bit: its checksums read words as big-endian
constexpr int MOST_TORN = 1;

template <size_t COUNT>
bool ReadWords(const ScopedFd& file, off_t offset, std::array<uint32_t, COUNT>& words) {
  const auto size = static_cast<ssize_t>(sizeof words);
  return file.fd >= 0 && pread(file.fd, words.data(), sizeof words, offset) == size;
}

bool IsSoundHeader(const std::array<uint32_t, 8>& header) {
  const uint32_t magic = be32toh(header[0]);
  if ((magic & ~1U) != MAGIC) {
    return false;
  }

  uint32_t first = 0;
  uint32_t second = 0;
  for (size_t at = 0; at < 6; at += 2) {
    const bool big = (magic & 1U) != 0;
    first += (big ? be32toh(header[at]) : le32toh(header[at])) + second;
    second += (big ? be32toh(header[at + 1]) : le32toh(header[at + 1])) + first;
  }
  return first == be32toh(header[6]) && second == be32toh(header[7]);
}

// Through SQLite: opening and closing the file beside it would let go of SQLite's own locks on it.
bool ReadLastFrame(sqlite3* db, uint32_t& last) {
  constexpr int REGION_SIZE = 32768;
  sqlite3_file* file = nullptr;
  volatile void* region = nullptr;
  if (sqlite3_file_control(db, "main", SQLITE_FCNTL_FILE_POINTER, &file) != SQLITE_OK ||
      file == nullptr || file->pMethods == nullptr || file->pMethods->iVersion < 2 ||
      file->pMethods->xShmMap(file, 0, REGION_SIZE, 0, &region) != SQLITE_OK || region == nullptr) {
    return false;
  }
  last = *reinterpret_cast<volatile uint32_t*>(static_cast<volatile char*>(region) +
                                               LAST_FRAME_OFFSET);
  return true;
}

}  // namespace

bool HasLostCommits(sqlite3* db) {
  constexpr int FLAGS = O_RDONLY | O_CLOEXEC | O_NONBLOCK | O_NOFOLLOW;
  const std::string path = sqlite3_db_filename(db, "main");
  const ScopedFd log(open((path + "-wal").c_str(), FLAGS));
  struct stat status {};
  std::array<uint32_t, 8> header{};
  if (log.fd < 0 || fstat(log.fd, &status) != 0 || !ReadWords(log, 0, header)) {
    return false;
  }
  if (!IsSoundHeader(header)) {
    return status.st_size > HEADER_SIZE + FRAME_HEADER_SIZE;
  }

  uint32_t last = 0;
  if (!ReadLastFrame(db, last)) {
    return false;
  }

  const off_t frame_size = FRAME_HEADER_SIZE + static_cast<off_t>(be32toh(header[2]));
  int lost = 0;
  std::array<uint32_t, 6> frame{};
  for (off_t at = HEADER_SIZE + static_cast<off_t>(last) * frame_size;
       lost <= MOST_TORN && ReadWords(log, at, frame); at += frame_size) {
    const bool current = frame[2] == header[4] && frame[3] == header[5];
    lost += current && frame[1] != 0 ? 1 : 0;
  }
  return lost > MOST_TORN;
}

}  // namespace fileindexd
