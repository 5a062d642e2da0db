// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/document_stream.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

#include "base/scoped_fd.h"
#include "extract/read_at.h"

namespace fileindexd {

namespace {

FILE* StreamOf(int file) {
  ScopedFd copy(fcntl(file, F_DUPFD_CLOEXEC, 0));
  FILE* stream = copy.fd >= 0 ? fdopen(copy.fd, "rb") : nullptr;
  if (stream != nullptr) {
    (void)copy.Release();
    rewind(stream);
  }
  return stream;
}

}  // namespace

DocumentStream::DocumentStream(const Document& read_document)
    : stream(StreamOf(read_document.file)), document(read_document) {
  if (stream == nullptr) {
    NoteFault(document, errno);
  }
}

DocumentStream::~DocumentStream() {
  if (stream == nullptr) {
    return;
  }
  if (HasFailed()) {
    NoteFault(document, EIO);  // the stream does not keep which one it was
  }
  (void)fclose(stream);  // nothing was written
}

}  // namespace fileindexd
