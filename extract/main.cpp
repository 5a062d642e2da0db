// SPDX-License-Identifier: GPL-2.0-or-later
// fileindex-extract: the closed helper. Started by the content service alone.
#include <malloc.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <clocale>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <exception>
#include <new>
#include <optional>
#include <string>
#include <string_view>
#include <system_error>

#include "base/landlock.h"
#include "base/scoped_fd.h"
#include "extract/answer.h"
#include "extract/charset.h"
#include "extract/child.h"
#include "extract/choice.h"
#include "extract/converters.h"
#include "extract/doors.h"
#include "extract/error_text.h"
#include "extract/format.h"
#include "extract/helper_codes.h"
#include "extract/passed_files.h"
#include "extract/run_time_files.h"
#include "extract/sample.h"

namespace fileindexd {

namespace {

constexpr const char* PROGRAM = "fileindex-extract";
// In use after a file: a helper that holds more is replaced.
constexpr size_t KEPT_MEMORY = size_t{256} << 20;

int Complain(const std::string& error, int code) {
  (void)fprintf(stderr, "%s: %s\n", PROGRAM, error.c_str());
  return code;
}

bool SendAll(std::string_view bytes) {
  while (!bytes.empty()) {
    const ssize_t sent = write(HELPER_SOCKET, bytes.data(), bytes.size());
    if (sent < 0) {
      return false;
    }
    bytes.remove_prefix(static_cast<size_t>(sent));
  }
  return true;
}

// None when the service has closed its end, or what it says is no job.
std::optional<JobOrder> ReceiveJob(ScopedFd& file) {
  std::string frame(MAX_JOB_NAME + 64, '\0');
  const ssize_t length = ReceiveWithFiles(HELPER_SOCKET, frame, {&file, 1});
  if (length <= 0 || file.fd < 0) {
    return std::nullopt;
  }
  frame.resize(static_cast<size_t>(length));
  return DecodeJob(frame);
}

// Memory that runs out ends the helper: what is left of it is not to be trusted with the next file.
// So does what an exception may have left behind, but after the answer. True if all is well.
bool ReadFile(const Document& document, size_t text_cap, Answer& answer) {
  ContentSink sink(text_cap);
  try {
    answer.has_failed = !ReadDocument(document, sink, answer.reason);
  } catch (const std::bad_alloc&) {
    _exit(EXIT_MEMORY);
  } catch (const std::exception& error) {
    answer.has_failed = true;
    answer.reason = error.what();
    sink.has_thrown = true;
  }
  answer.content = std::move(sink.content);
  answer.converter = std::move(sink.converter);
  return !sink.has_thrown;
}

// What libraries still hold after a file is lost to the next ones.
bool HoldsLittle() {
  const auto info = mallinfo2();
  return info.uordblks + info.hblkhd <= KEPT_MEMORY;
}

std::string UnreadFrame(int error) {
  Answer unread;
  unread.sort = Answer::Sort::UNREAD;
  unread.reason = "cannot be read: " + ErrorText(error);
  return EncodeAnswer(unread);
}

// False when this was its last file.
bool Answered(const JobOrder& job, int file) {
  struct stat info = {};
  Answer answer;
  if (fstat(file, &info) != 0 || !S_ISREG(info.st_mode)) {
    answer.has_failed = true;
    answer.reason = "not a regular file";
    return SendAll(EncodeAnswer(answer));
  }

  int fault = 0;
  const Document document{file, job.name, info.st_size, 0, &fault};
  uint64_t sample = 0;
  const bool is_well = !SampleFile(document, sample) || ReadFile(document, job.text_cap, answer);
  answer.content.sample = sample;
  // Of what the disk did not give, no reader can tell the truth, even where it is content.
  const bool is_sent = SendAll(fault != 0 ? UnreadFrame(fault) : EncodeAnswer(answer));
  return is_sent && is_well && HoldsLittle();
}

// A page of a mapped file that cannot be had, as when reading fails.
void TellUnreadPages() {
  static const std::string frame = UnreadFrame(EIO);
  struct sigaction action = {};
  action.sa_flags = SA_SIGINFO;
  action.sa_sigaction = [](int number, siginfo_t* info, void*) {
    if (info->si_code != BUS_ADRERR) {  // a fault of the program's own
      (void)signal(number, SIG_DFL);
      return;
    }
    (void)SendAll(frame);
    _exit(0);
  };
  (void)sigaction(SIGBUS, &action, nullptr);  // cannot fail with these
}

int Serve(int parent) {
  // libmagic's database and the locale are opened while they can be.
  std::string error;
  (void)setlocale(LC_ALL, "C.UTF-8");  // NOLINT(concurrency-mt-unsafe): one thread
  if (!LoadMagic(error)) {
    return Complain(error, EXIT_DOORS);
  }
  if (LandlockVersion() < 1) {  // then perhaps no file can be opened later
    KeepCommonCharsets();
  }
  Doors doors;
  doors.parent = parent;
  if (!CloseDoors(doors, error)) {
    return Complain(error, EXIT_DOORS);
  }

  TellUnreadPages();
  Answer greeting;
  greeting.sort = Answer::Sort::READY;
  if (!doors.can_open_files) {
    LeaveOutFileUsers();
    greeting.left_out =
        "PDF, Word documents from before 1997, RTF, rare charsets (the kernel has neither Landlock "
        "nor namespaces)";
  }
  if (!SendAll(EncodeAnswer(greeting))) {
    return 0;
  }
  Answer begun;
  begun.sort = Answer::Sort::BEGUN;
  while (true) {
    ScopedFd file;
    const std::optional<JobOrder> job = ReceiveJob(file);
    if (!job || !RefreshProcessorTime() || !SendAll(EncodeAnswer(begun)) ||
        !Answered(*job, file.fd)) {
      return 0;
    }
  }
}

int Convert(const Converter& converter, int parent) {
  Doors doors;
  doors.parent = parent;
  doors.converter = &converter;
  std::string error;
  if (FindProgramFile(converter.name).empty()) {
    return EXIT_PROGRAM;
  }
  if (!CloseDoors(doors, error)) {
    return Complain(error, EXIT_DOORS);
  }
  BecomeConverter(converter, error);
  return Complain(error, EXIT_PROGRAM);
}

// The number in `text`; 0: none.
int ProcessNumber(std::string_view text) {
  int number = 0;
  const auto read = std::from_chars(text.data(), text.data() + text.size(), number);
  return read.ec == std::errc() && read.ptr == text.data() + text.size() ? number : 0;
}

bool HasServiceSocket() {
  int domain = 0;
  socklen_t size = sizeof(domain);
  return getsockopt(HELPER_SOCKET, SOL_SOCKET, SO_DOMAIN, &domain, &size) == 0 && domain == AF_UNIX;
}

int Main(int argc, char** argv) {
  const std::string_view mode = argc > 1 ? argv[1] : "";
  const int parent = ProcessNumber(argc > 2 ? argv[argc - 1] : "");
  if (mode == SERVE_MODE && argc == 3 && parent > 0 && HasServiceSocket()) {
    return Serve(parent);
  }
  const Converter* converter = mode == CONVERT_MODE && argc == 4 ? FindConverter(argv[2]) : nullptr;
  if (converter != nullptr && parent > 0) {
    return Convert(*converter, parent);
  }
  return Complain("is started by the content service, not by hand", EXIT_USAGE);
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  // Not exit(): what libraries do at the end is of no use, and more than the doors let through.
  int code = 1;
  try {
    code = fileindexd::Main(argc, argv);
  } catch (const std::exception& error) {
    code = fileindexd::Complain(error.what(), code);
  }
  (void)fflush(stderr);
  _exit(code);
}
