// SPDX-License-Identifier: GPL-2.0-or-later
#include "index/alike_files.h"

#include <algorithm>
#include <tuple>
#include <utility>

#include "index/entry_table.h"
#include "index/schema.h"
#include "index/suspicion.h"
#include "state/sqlite.h"

namespace fileindexd {

namespace {

// A file, as the contents know it.
struct Sampled {
  int64_t size = 0;
  int64_t sample = 0;
  int64_t inode = 0;  // signed: they come in that order
  int64_t birth_time = 0;
  int64_t mtime = 0;

  std::pair<int64_t, int64_t> Look() const { return {size, sample}; }
};

// One share's files, the largest first.
class SampleStream {
 public:
  explicit SampleStream(OpenShare& opened) : share(opened) {}

  bool Open() {
    sqlite3* db = share.reader.database.db;
    Statement meta;
    code = meta.Prepare(db, "SELECT filesystem FROM contents.meta WHERE id = 1");
    code = code == SQLITE_OK ? meta.Step() : code;
    if (code != SQLITE_ROW) {
      code = code == SQLITE_DONE ? SQLITE_CORRUPT : code;
      return false;
    }
    filesystem = meta.Bytes(0);
    // Of another state the sample is known as well: it may wait to be read anew, or that failed.
    // Without an extractor its bytes may be others by now. An empty file is like any other one, and
    // nobody wants to hear of it.
    code = rows.Prepare(db,
                        "SELECT size, sample, inode, birth_time, mtime FROM contents.files"
                        " WHERE extractor <> 0 AND sample <> 0 AND size > 0"
                        " ORDER BY size DESC, sample, inode, birth_time");
    code = code == SQLITE_OK
               ? path_of.Prepare(db, "SELECT path FROM entries WHERE " FILEINDEX_THAT_FILE
                                     " AND content_wanted = 1"
                                     " ORDER BY path LIMIT 1")
               : code;
    return code == SQLITE_OK;
  }

  // False at the end, and after a failure.
  bool Next() {
    if (HasFailed()) {
      return false;
    }
    code = rows.Step();
    if (code == SQLITE_ROW) {
      file = {rows.Int(0), rows.Int(1), rows.Int(2), rows.Int(3), rows.Int(4)};
    }
    return code == SQLITE_ROW;
  }

  // The first path of one of its files; empty where nothing is there any more, and after a failure.
  std::string PathOf(const Sampled& sampled) {
    if (HasFailed()) {
      return {};
    }
    BindIdentity(path_of, {static_cast<uint64_t>(sampled.inode), sampled.birth_time, sampled.size,
                           sampled.mtime});
    std::string path;
    bool found = false;
    const int looked = path_of.ReadOne(found, [&] { path = path_of.Bytes(0); });
    code = looked == SQLITE_OK ? code : looked;
    return path;
  }

  bool HasFailed() const { return StepError(code) != SQLITE_OK; }

  OpenShare& share;
  std::string filesystem;
  Sampled file;
  int code = SQLITE_OK;  // the first failure stays

 private:
  Statement rows;
  Statement path_of;
};

bool ComesFirst(const SampleStream& a, const SampleStream& b) {
  const auto key = [](const SampleStream& stream) {
    const Sampled& file = stream.file;
    return std::tie(file.sample, file.inode, file.birth_time, stream.filesystem);
  };
  return a.file.size != b.file.size ? a.file.size > b.file.size : key(a) < key(b);
}

// The set that is being walked through, and the best so far. A file's path is looked up once there
// is another one like it: of most there is none.
class SetCollector {
 public:
  explicit SetCollector(Duplicates& into) : duplicates(into) {}

  // The file in front of the stream.
  void Take(SampleStream& stream) {
    if (stream.file.Look() != look) {
      Finish();
      look = stream.file.Look();
      set.size = stream.file.size;
      first = &stream;
      first_file = stream.file;
      return;
    }
    if (first != nullptr) {
      Add(*std::exchange(first, nullptr), first_file);
    }
    Add(stream, stream.file);
  }

  void Finish() {
    if (set.files >= 2) {
      ++duplicates.set_count;
      duplicates.files += set.files;
      duplicates.spare = AddedBytes(duplicates.spare, set.Spare());
      // They come in the order of their inode numbers, which tells people nothing.
      std::sort(set.places.begin(), set.places.end(), [](const auto& a, const auto& b) {
        return std::tie(a.path, a.share) < std::tie(b.path, b.share);
      });
      Keep(std::move(set));
    }
    set = {};
    last = {};
    first = nullptr;
  }

  // Once, at the end.
  void Sort() { std::sort_heap(duplicates.sets.begin(), duplicates.sets.end(), IsBetter); }

 private:
  using Identity = std::tuple<std::string, int64_t, int64_t>;

  // Two shares of one file system may hold names of the same file: they stand side by side.
  void Add(SampleStream& stream, const Sampled& file) {
    Identity identity(stream.filesystem, file.inode, file.birth_time);
    std::string path = stream.PathOf(file);
    if (path.empty() || identity == last) {
      return;
    }
    last = std::move(identity);
    ++set.files;
    if (set.places.size() < MOST_PLACES) {
      set.places.push_back({stream.share.share.name, std::move(path)});
    }
  }

  static bool IsBetter(const AlikeFiles& a, const AlikeFiles& b) {
    if (a.Spare() != b.Spare()) {
      return a.Spare() > b.Spare();
    }
    return a.files != b.files ? a.files > b.files : a.places.front().path < b.places.front().path;
  }

  // The least of those that are kept stands in front.
  void Keep(AlikeFiles&& found) {
    std::vector<AlikeFiles>& sets = duplicates.sets;
    if (sets.size() >= MOST_SETS) {
      if (!IsBetter(found, sets.front())) {
        return;
      }
      std::pop_heap(sets.begin(), sets.end(), IsBetter);
      sets.pop_back();
    }
    sets.push_back(std::move(found));
    std::push_heap(sets.begin(), sets.end(), IsBetter);
  }

  Duplicates& duplicates;
  AlikeFiles set;
  std::pair<int64_t, int64_t> look{-1, 0};
  Identity last;
  SampleStream* first = nullptr;  // where the set's first file came from; null: it was added
  Sampled first_file;
};

}  // namespace

void FindAlikeFiles(std::deque<OpenShare>& shares, Duplicates& duplicates,
                    std::vector<std::string>& failures) {
  std::deque<SampleStream> streams;
  std::vector<SampleStream*> open;
  for (OpenShare& share : shares) {
    if (share.has_contents) {
      SampleStream& stream = streams.emplace_back(share);
      if (stream.Open() && stream.Next()) {
        open.push_back(&stream);
      }
    }
  }

  const auto comes_later = [](const SampleStream* a, const SampleStream* b) {
    return ComesFirst(*b, *a);
  };
  std::make_heap(open.begin(), open.end(), comes_later);
  SetCollector collector(duplicates);
  while (!open.empty()) {
    std::pop_heap(open.begin(), open.end(), comes_later);
    SampleStream& stream = *open.back();
    collector.Take(stream);
    if (stream.Next()) {
      std::push_heap(open.begin(), open.end(), comes_later);
    } else {
      open.pop_back();
    }
  }
  collector.Finish();
  collector.Sort();

  // Only now: a path may be asked for when its stream has come to its end.
  for (const SampleStream& stream : streams) {
    if (stream.HasFailed()) {
      TellContentsWriter(stream.share.share.name, FromSqlite(stream.code));
      failures.push_back("share " + stream.share.share.name +
                         ": contents: " + IndexErrorText(FromSqlite(stream.code)));
    }
  }
}

}  // namespace fileindexd
