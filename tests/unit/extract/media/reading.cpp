// SPDX-License-Identifier: GPL-2.0-or-later
#include "tests/unit/extract/media/reading.h"

#include <gtest/gtest.h>
#include <sys/mman.h>
#include <unistd.h>

#include "base/scoped_fd.h"

namespace fileindexd {

std::string Found::Text(ContentField field) const {
  for (const TextField& text : content.texts) {
    if (text.field == field) {
      return text.text;
    }
  }
  return {};
}

int64_t Found::Number(ContentField field) const {
  for (const NumberField& number : content.numbers) {
    if (number.field == field) {
      return number.number;
    }
  }
  return 0;
}

Found Read(FormatReader reader, const Sample& sample) {
  const ScopedFd file(memfd_create("sample", MFD_CLOEXEC));
  EXPECT_EQ(pwrite(file.fd, sample.bytes.data(), sample.bytes.size(), 0),
            static_cast<ssize_t>(sample.bytes.size()));
  Document document;
  document.file = file.fd;
  document.name = sample.name;
  document.size = static_cast<int64_t>(sample.bytes.size());

  ContentSink sink(1 << 20);
  Found found;
  try {
    found.is_read = reader(document, sink, found.why);
  } catch (const std::exception& error) {
    found.why = error.what();
  }
  found.content = sink.content;
  return found;
}

}  // namespace fileindexd
