// SPDX-License-Identifier: GPL-2.0-or-later
#include "notify/share_feed.h"

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <utility>

#include "base/event_codes.h"
#include "index/reader.h"
#include "notify/sent_lines.h"
#include "state/queue_appender.h"
#include "state/queue_writer.h"

namespace fileindexd {

namespace {

constexpr std::chrono::milliseconds LOCKED_DELAY(10);
constexpr std::chrono::seconds RETRY_DELAY(1);
constexpr size_t PATHS_KEPT = 100'000;   // gathered; and as many lines in the backlog
constexpr size_t BYTES_KEPT = 32 << 20;  // of their paths
constexpr size_t FOLDED_EVERY = 1000;    // lines that came: a crowd is no less

bool IsTooMuch(size_t number, size_t bytes) {
  return number > PATHS_KEPT || bytes > BYTES_KEPT;
}

QueueLine LookedAtAgain(const Settings& settings, const QueueLine& line) {
  const std::vector<QueueLine> returned = LinesOfReturned(settings, {line.path});
  return returned.empty() ? line : returned.front();
}

}  // namespace

struct ShareFeed::Impl {
  explicit Impl(std::string name)
      : share(std::move(name)),
        gatherer(share),
        appender(share, [this](std::string_view line) { Meet(line); }) {
    Clear();
  }

  void Clear();
  std::string RootIn(const Settings& settings) const;
  uint64_t CountBelow(const std::string& directory, uint64_t limit) const;
  size_t Backlog() const { return backlog->Size() + (root_reindex.has_value() ? 1 : 0); }
  void Queue(const Settings& settings, const std::vector<QueueLine>& lines);
  void QueueRootReindex(const std::string& root);
  void FoldCrowds(const Settings& settings);
  void Meet(std::string_view text);
  void ForgetTaken();
  std::vector<QueueLine> TakeLines(const Settings& settings, size_t most);
  void Write(const Settings& settings, Clock::time_point now, bool at_once, FeedCounts& counts);
  void CheckBounds();

  const std::string share;
  Gatherer gatherer;
  std::unique_ptr<QueueFolding> backlog;
  QueueAppender appender;
  uint64_t file_number = 0;  // of the appender, that `sent` is about
  SentLines sent;            // or written by others, an earlier service among them
  const QueueLineReader line_reader;
  // The root, where its reindex waits before the backlog. Not that of the settings: they may know
  // no such share any more.
  std::optional<std::string> root_reindex;
  bool root_in_file = false;           // the file that was written last holds a reindex of the root
  const Settings* in_force = nullptr;  // while FoldCrowds runs
  std::unique_ptr<EntryReader> reader;  // the same; null: the index cannot be read
  size_t came = 0;                      // lines, since crowds were folded last
  uint64_t folded = 0;                  // lines that met others in the backlog
  bool full = false;                    // the queue was, at the last try
  Clock::time_point retry;              // not before, unless it is full
  bool lost = false;
  std::string error;
};

void ShareFeed::Impl::Clear() {
  gatherer.Clear();
  // Over all paths: nothing is coarsened into "/", and what is too much below it is dropped.
  backlog = std::make_unique<QueueFolding>(
      "/",
      [this](const std::string& directory, uint64_t limit) { return CountBelow(directory, limit); },
      2 * PATHS_KEPT);
  root_reindex.reset();
  came = 0;
  full = false;
  retry = {};
  error.clear();
}

// Empty when they know no such share.
std::string ShareFeed::Impl::RootIn(const Settings& settings) const {
  const Share* fed = settings.ShareByName(share);
  return fed != nullptr ? fed->path : std::string();
}

// The limit, which keeps the lines as they are, where it cannot be told.
uint64_t ShareFeed::Impl::CountBelow(const std::string& directory, uint64_t limit) const {
  uint64_t below = 0;
  // A directory that only holds indexed folders is not to be reindexed itself.
  const bool told = reader != nullptr && in_force->FolderOfPath(directory) != nullptr &&
                    reader->CountBelow(directory, limit, below);
  return told ? below : limit;
}

void ShareFeed::Impl::Queue(const Settings& settings, const std::vector<QueueLine>& lines) {
  const std::string root = RootIn(settings);
  for (const QueueLine& line : lines) {
    if (line.event == CUSTOM_EVENT_REINDEX && line.path == root) {
      QueueRootReindex(root);
    } else if (line.event == QLIB_NOTIFY_RENAME) {
      backlog->AddRename(line.path, line.path_old);
    } else if (!root_reindex.has_value() || !IsLook(line.event)) {
      backlog->Add(line.event, line.path, line.data);
    }
  }
  came += lines.size();
}

void ShareFeed::Impl::QueueRootReindex(const std::string& root) {
  root_reindex = root;
  backlog->DropLooks(root);
}

void ShareFeed::Impl::FoldCrowds(const Settings& settings) {
  if (backlog->Size() > FOLDED_EVERY && came >= FOLDED_EVERY) {
    came = 0;
    in_force = &settings;
    reader = std::make_unique<EntryReader>();
    if (reader->Open(share) != IndexError::NONE) {
      reader.reset();
    }
    const std::string root = RootIn(settings);
    if (backlog->FoldCrowded(root)) {
      QueueRootReindex(root);
    }
    reader.reset();
    in_force = nullptr;
  }
}

void ShareFeed::Impl::ForgetTaken() {
  if (appender.FileNumber() != file_number) {
    file_number = appender.FileNumber();
    sent.Forget();
  }
}

void ShareFeed::Impl::Meet(std::string_view text) {
  ForgetTaken();
  LineInFile line;
  if (line_reader.Read(text, line)) {
    sent.Note(line);
  }
}

// As many lines from the backlog as fit, each with those that have to stand behind it.
std::vector<QueueLine> ShareFeed::Impl::TakeLines(const Settings& settings, size_t most) {
  ForgetTaken();
  if (root_reindex.has_value()) {
    if (most < QUEUE_LINE_LIMIT) {
      return {};  // the file holds lines, of whomever
    }
    return {{CUSTOM_EVENT_REINDEX, *root_reindex, {}, {}}};
  }
  std::vector<QueueLine> waiting = backlog->Take(most);
  std::vector<QueueLine> taken;
  std::vector<QueueLine> behind;
  size_t fitting = 0;
  for (; fitting < waiting.size(); ++fitting) {
    QueueLine& line = waiting[fitting];
    if (line.event == QLIB_NOTIFY_DELETE) {
      // It may have waited for long.
      line = LookedAtAgain(settings, line);
    }
    std::vector<QueueLine> lines = sent.InPlaceOf(line);
    std::vector<QueueLine> returned;
    for (const QueueLine& asked : lines) {
      std::ranges::move(sent.LinesBehind(settings, asked), std::back_inserter(returned));
    }
    if (taken.size() + lines.size() + behind.size() + returned.size() > most) {
      break;
    }
    std::ranges::move(lines, std::back_inserter(taken));
    std::ranges::move(returned, std::back_inserter(behind));
  }

  Queue(settings, {waiting.begin() + static_cast<std::ptrdiff_t>(fitting), waiting.end()});
  std::ranges::move(behind, std::back_inserter(taken));
  return taken;
}

void ShareFeed::Impl::Write(const Settings& settings, Clock::time_point now, bool at_once,
                            FeedCounts& counts) {
  if (Backlog() == 0 || (!full && now < retry && !at_once)) {
    return;
  }
  if ((root_reindex.has_value() || root_in_file) && appender.IsWaiting()) {
    full = true;
    retry = now + RETRY_DELAY;
    return;
  }

  std::vector<QueueLine> taken;
  const auto give = [&](size_t most) {
    taken = TakeLines(settings, most);
    std::vector<std::string> texts;
    texts.reserve(taken.size());
    for (const QueueLine& line : taken) {
      const bool is_rename = line.event == QLIB_NOTIFY_RENAME;
      texts.push_back(EventLine(line.event, sent.PathInFile(line),
                                is_rename ? std::optional(line.path_old) : std::nullopt,
                                line.data));
    }
    return texts;
  };
  std::string reason;
  const Appended result = appender.Append(give, reason);
  if (result == Appended::DONE) {
    root_in_file = root_reindex.has_value();
    root_reindex.reset();
    counts.lines += taken.size();
    for (const QueueLine& line : taken) {
      sent.Note({line.event, sent.PathInFile(line), line.path_old});
    }
    error.clear();
  } else if (result == Appended::FAILED) {
    if (!root_reindex.has_value()) {
      Queue(settings, taken);
    }
    error = reason;
  }
  full = result == Appended::FULL || (result == Appended::DONE && Backlog() > 0);
  retry = now;
  if (result == Appended::LOCKED) {
    retry += LOCKED_DELAY;
  } else if (Backlog() > 0) {
    retry += RETRY_DELAY;
  }
}

void ShareFeed::Impl::CheckBounds() {
  if (IsTooMuch(gatherer.Size(), gatherer.Bytes()) ||
      IsTooMuch(backlog->Size(), backlog->Bytes())) {
    Clear();
    lost = true;
  }
}

ShareFeed::ShareFeed(std::string name_of_share)
    : impl(std::make_unique<Impl>(std::move(name_of_share))) {}
ShareFeed::~ShareFeed() = default;

bool ShareFeed::Add(const Settings& settings, const Change& change, Clock::time_point now) {
  const uint64_t before = counts.changes;
  impl->gatherer.Add(settings, change, now);
  counts.changes = impl->gatherer.changes;
  counts.folded = impl->gatherer.folded + impl->folded;
  impl->CheckBounds();
  return counts.changes > before;
}

std::vector<ChangedFile> ShareFeed::TakeChanged() {
  return std::exchange(impl->gatherer.changed, {});
}

void ShareFeed::AddLines(const Settings& settings, const std::vector<QueueLine>& lines) {
  impl->Queue(settings, lines);
  impl->FoldCrowds(settings);
  impl->CheckBounds();
}

void ShareFeed::Work(const Settings& settings, Clock::time_point now, bool everything,
                     Clock::time_point deadline) {
  std::vector<QueueLine> lines;
  impl->gatherer.TakeDue(settings, now, everything, lines, deadline);
  const size_t expected = impl->Backlog() + lines.size();
  impl->Queue(settings, lines);
  impl->FoldCrowds(settings);
  // A rename may leave two lines.
  impl->folded += expected - std::min(expected, impl->Backlog());
  counts.folded = impl->gatherer.folded + impl->folded;
  impl->CheckBounds();
  impl->Write(settings, now, everything, counts);
}

std::optional<ShareFeed::Clock::time_point> ShareFeed::NextDue() const {
  const auto gathered = impl->gatherer.NextDue();
  if (impl->Backlog() == 0) {
    return gathered;
  }
  return gathered.has_value() ? std::min(*gathered, impl->retry) : impl->retry;
}

size_t ShareFeed::Gathered() const {
  return impl->gatherer.Size();
}

size_t ShareFeed::Backlog() const {
  return impl->Backlog();
}

bool ShareFeed::TakeLoss() {
  return std::exchange(impl->lost, false);
}

void ShareFeed::Clear() {
  impl->Clear();
}

const std::string& ShareFeed::Error() const {
  return impl->error;
}

}  // namespace fileindexd
