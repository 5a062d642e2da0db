// SPDX-License-Identifier: GPL-2.0-or-later
// Stands in for fileindex-extract: greets, takes jobs, and does what each job's name says.
//
//   text WORDS     answers with these words
//   field TITLE    with a title and no text
//   fail REASON    says that it cannot be read
//   unread REASON  says that the disk does not give it
//   convert NAME   asks for a converter
//   pid            answers with its process number
//   count          how many jobs it has had
//   state          answers with what it was started with
//   crash, loop, exit, memory, close, grow, nonsense, twice, half, last
//                  misbehaves
//   spin           stops until it is let go on, uses more than 300 ms of processor time, stops
//                  again
//   stop           stops itself
//   starve         stops itself, as long as the file is empty; adds a byte to it
//   more           answers, and when that was taken says another word
//   killed         is killed from outside, as long as the file is empty; adds a byte to it
//   refuse         ends before it begins, if it had a job before
//   never          ends before it begins
//   mute           never begins
//
// What a converter has made holds such an order itself. As a converter it does what the document
// says:
//
//   say ORDER      makes that
//   part ORDER     makes that, and fails
//   doors          says what was in its way
//   program        says what was in its way
//   slow           waits for ever
//   spin           uses more than 300 ms of processor time, and stops
//   kill           is killed from outside
//   killed, starve
//                  is killed, or stops itself, once: adds a letter to the document
//   killed?, starve?
//                  makes an order to answer with words
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <ctime>
#include <map>
#include <string>

#include "extract/answer.h"
#include "extract/child.h"
#include "extract/helper_codes.h"
#include "extract/passed_files.h"
#include "extract/sanitized.h"

namespace fileindexd {

namespace {

using std::string_literals::operator""s;

void Say(const std::string& bytes) {
  size_t said = 0;
  while (said < bytes.size()) {
    const ssize_t sent = write(HELPER_SOCKET, bytes.data() + said, bytes.size() - said);
    if (sent <= 0) {
      _exit(0);
    }
    said += static_cast<size_t>(sent);
  }
}

Answer Ready() {
  Answer answer;
  answer.sort = Answer::Sort::READY;
  answer.left_out = "nothing much";
  return answer;
}

Answer Words(const std::string& text) {
  Answer answer;
  answer.content.kind = Kind::DOCUMENT;
  answer.content.text = text;
  return answer;
}

// Signals that are not as a new process has them, descriptors, folder, variables, session.
std::string State() {
  std::string state;
  for (int number = 1; number < 32; ++number) {
    struct sigaction action = {};
    // A sanitizer wants to tell of its own.
    if (IS_SANITIZED && (number == SIGSEGV || number == SIGBUS || number == SIGFPE)) {
      continue;
    }
    if (sigaction(number, nullptr, &action) == 0 && action.sa_handler != SIG_DFL) {
      state += "signal" + std::to_string(number) + " ";
    }
  }
  sigset_t blocked;
  sigprocmask(SIG_BLOCK, nullptr, &blocked);
  state += sigismember(&blocked, SIGTERM) == 1 ? "blocked " : "";
  for (int file = 0; file < 64; ++file) {
    state += fcntl(file, F_GETFD) >= 0 && file != STDERR_FILENO ? std::to_string(file) + " " : "";
  }
  char folder[PATH_MAX] = {};
  state += getcwd(folder, sizeof(folder)) != nullptr ? folder : "?";
  state += getenv("EXTRACT_TEST_SECRET") != nullptr ? " secret" : "";
  state += getsid(0) == getpid() ? " own-session" : "";
  return state;
}

[[noreturn]] void WaitForEver() {
  while (true) {
    pause();
  }
}

void UseTime() {
  const clock_t end = clock() + 4 * (CLOCKS_PER_SEC / 10);
  while (clock() < end) {
  }
}

std::string ContentOf(int file) {
  char bytes[256];
  const ssize_t length = pread(file, bytes, sizeof(bytes), 0);
  return {bytes, static_cast<size_t>(std::max<ssize_t>(length, 0))};
}

void Misbehave(const std::string& verb, int file) {
  if (verb == "crash") {
    signal(SIGSEGV, SIG_DFL);
    raise(SIGSEGV);
  } else if (verb == "loop") {
    WaitForEver();
  } else if (verb == "spin") {
    (void)raise(SIGSTOP);
    UseTime();
    (void)raise(SIGSTOP);
  } else if (verb == "exit") {
    _exit(7);
  } else if (verb == "memory") {
    _exit(EXIT_MEMORY);
  } else if (verb == "close") {
    close(HELPER_SOCKET);
    WaitForEver();
  } else if (verb == "grow") {
    const std::string chunk(64 * 1024, 'x');
    Say("\xFF\xFF\xFF\x0F"s);
    while (true) {
      Say(chunk);
    }
  } else if (verb == "nonsense") {
    Say("\x03\0\0\0abc"s);
    pause();
  } else if (verb == "twice") {
    Say(EncodeAnswer(Words("a")) + EncodeAnswer(Words("b")));
    pause();
  } else if (verb == "half") {
    Say(EncodeAnswer(Words("half of it")).substr(0, 20));
    pause();
  } else if (verb == "last") {
    Say(EncodeAnswer(Words("said and gone")));
    _exit(0);
  } else if (verb == "stop") {
    (void)raise(SIGSTOP);
  } else if (verb == "starve") {
    struct stat info = {};
    if (fstat(file, &info) == 0 && info.st_size == 0) {
      (void)!write(file, "x", 1);
      (void)raise(SIGSTOP);
    }
  } else if (verb == "killed") {
    struct stat info = {};
    // Every helper is given the same file: what is in it tells that this was tried before.
    if (fstat(file, &info) == 0 && info.st_size == 0) {
      (void)!write(file, "x", 1);
      raise(SIGKILL);
    }
  }
}

void Do(const std::string& verb, const std::string& rest, int file, int count) {
  Misbehave(verb, file);
  Answer answer = Words(rest.empty() ? verb : rest);
  if (verb == "fail") {
    answer.has_failed = true;
    answer.reason = rest;
  } else if (verb == "unread") {
    answer.sort = Answer::Sort::UNREAD;
    answer.reason = rest;
  } else if (verb == "field") {
    answer.content.texts = {{ContentField::TITLE, rest}};
    answer.content.text.clear();
  } else if (verb == "convert") {
    answer.content.texts = {{ContentField::TITLE, "kept"}};
    answer.content.text.clear();
    answer.converter = rest;
  } else if (verb == "pid" || verb == "more") {
    answer.content.text = std::to_string(getpid());
  } else if (verb == "count") {
    answer.content.text = std::to_string(count);
  } else if (verb == "state") {
    answer.content.text = State();
  }
  Say(EncodeAnswer(answer));
  if (verb == "more") {
    (void)raise(SIGSTOP);  // until the test lets it go on
    Say("x");
  }
}

int Serve() {
  Say(EncodeAnswer(Ready()));
  for (int count = 1;; ++count) {
    char frame[8192];
    ScopedFd passed;
    const ssize_t length = ReceiveWithFiles(HELPER_SOCKET, frame, {&passed, 1});
    const auto job = length > 0 ? DecodeJob({frame, static_cast<size_t>(length)}) : std::nullopt;
    const int file = passed.fd;
    if (!job || file < 0) {
      return 0;
    }
    const std::string order = job->name == "converted.txt" ? ContentOf(file) : job->name;
    if (order == "never" || (order == "refuse" && count > 1)) {
      _exit(5);  // ends over it without having begun
    }
    if (order == "mute") {
      WaitForEver();
    }
    Answer begun;
    begun.sort = Answer::Sort::BEGUN;
    Say(EncodeAnswer(begun));
    const size_t blank = order.find(' ');
    Do(order.substr(0, blank), blank == std::string::npos ? "" : order.substr(blank + 1), file,
       count);
  }
}

int Convert() {
  const std::string order = ContentOf(STDIN_FILENO);
  const std::string verb = order.substr(0, order.find(' '));
  if (verb == "doors") {
    return EXIT_DOORS;
  }
  if (verb == "program") {
    return EXIT_PROGRAM;
  }
  if (verb == "spin") {
    UseTime();
    (void)raise(SIGSTOP);
  }
  if (verb == "killed" || verb == "starve") {
    (void)!pwrite(STDIN_FILENO, "?", 1, static_cast<off_t>(order.size()));
  }
  if (verb == "kill" || verb == "killed") {
    raise(SIGKILL);
  }
  if (verb == "slow") {
    WaitForEver();
  }
  if (verb == "starve") {
    (void)raise(SIGSTOP);
  }

  const bool is_late = verb == "killed?" || verb == "starve?";
  const bool is_order = verb == "say" || verb == "part";
  const std::string made = is_late ? "text late" : is_order ? order.substr(verb.size() + 1) : "";
  (void)!write(STDOUT_FILENO, made.data(), made.size());
  return is_late || verb == "say" ? 0 : 9;
}

}  // namespace

}  // namespace fileindexd

int main(int argc, char** argv) {
  if (argc > 2 && std::string(argv[1]) == fileindexd::CONVERT_MODE) {
    return fileindexd::Convert();
  }
  return fileindexd::Serve();
}
