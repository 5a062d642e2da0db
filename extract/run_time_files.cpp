// SPDX-License-Identifier: GPL-2.0-or-later
#include "extract/run_time_files.h"

#include <dlfcn.h>
#include <sys/auxv.h>
#include <unistd.h>

#include <cstdio>

#include "extract/converters.h"

namespace fileindexd {

namespace {

// The file that an address of this process was loaded from.
std::string FileOf(const void* address) {
  Dl_info info = {};
  return dladdr(address, &info) != 0 && info.dli_fname != nullptr ? info.dli_fname : "";
}

std::string FolderOf(const std::string& path) {
  return path.substr(0, path.rfind('/'));
}

const void* LoaderAddress() {
  return reinterpret_cast<const void*>(getauxval(AT_BASE));  // NOLINT: an address by the kernel
}

}  // namespace

RunTimeFiles FindRunTimeFiles(const Converter* converter) {
  RunTimeFiles files;
  // The C library's tables of charsets lie beside it, or in /usr where it lies in /.
  const std::string library = FileOf(reinterpret_cast<const void*>(&fopen));
  const std::string libraries = FolderOf(library);
  for (const std::string& above : {std::string(), std::string("/usr")}) {
    files.readable.push_back(above + libraries + "/gconv");
  }
  if (converter == nullptr) {
    files.readable.push_back("/usr/share/poppler");  // its character maps
    return files;
  }

  files.readable.push_back(libraries);
  files.readable.push_back("/usr" + libraries);
  for (const char* path : {"/etc/ld.so.cache", "/etc/catdocrc", "/usr/share/catdoc",
                           "/usr/share/unrtf", "/usr/lib/locale"}) {
    files.readable.emplace_back(path);
  }
  files.executable = {FindProgramFile(converter->name), FileOf(LoaderAddress())};
  return files;
}

std::string FindProgramFile(const char* name) {
  for (const char* folder : {"/usr/bin/", "/bin/", "/usr/local/bin/"}) {
    std::string path = std::string(folder) + name;
    if (access(path.c_str(), X_OK) == 0) {
      return path;
    }
  }
  return {};
}

}  // namespace fileindexd
