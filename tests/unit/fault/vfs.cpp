// SPDX-License-Identifier: GPL-2.0-or-later
// DESIGN: each file of ours is followed in memory by the real one; each call asks the plan, and is
// handed on. Mapped reads are not offered, so that all reading is seen.
#include "unit/fault/vfs.h"

#include <sqlite3.h>

#include <algorithm>
#include <cstring>

#include "unit/fault/plan.h"

namespace fileindexd::fault {

namespace {

struct File {
  sqlite3_file base;
  Target target;
};

sqlite3_vfs* real_layer = nullptr;
sqlite3_vfs layer;

sqlite3_file* Real(sqlite3_file* file) {
  return reinterpret_cast<sqlite3_file*>(reinterpret_cast<File*>(file) + 1);
}

int StrikeAt(Call call, sqlite3_file* file) {
  return Strike(call, reinterpret_cast<File*>(file)->target);
}

int Close(sqlite3_file* file) {
  return Real(file)->pMethods->xClose(Real(file));
}

int Read(sqlite3_file* file, void* buffer, int amount, sqlite3_int64 at) {
  int code = StrikeAt(Call::READ, file);
  if (code == SQLITE_OK) {
    code = Real(file)->pMethods->xRead(Real(file), buffer, amount, at);
  }
  if (code == SQLITE_OK && StrikeAt(Call::SHORT_READ, file) != SQLITE_OK) {
    const int half = amount / 2;
    memset(static_cast<char*>(buffer) + half, 0, static_cast<size_t>(amount - half));
    code = SQLITE_IOERR_SHORT_READ;
  }
  return code;
}

int Write(sqlite3_file* file, const void* buffer, int amount, sqlite3_int64 at) {
  int code = StrikeAt(Call::HALF_WRITE, file);
  if (code != SQLITE_OK) {
    (void)Real(file)->pMethods->xWrite(Real(file), buffer, amount / 2, at);
    return code;
  }
  code = StrikeAt(Call::WRITE, file);
  return code != SQLITE_OK ? code : Real(file)->pMethods->xWrite(Real(file), buffer, amount, at);
}

int Truncate(sqlite3_file* file, sqlite3_int64 size) {
  const int code = StrikeAt(Call::TRUNCATE, file);
  return code != SQLITE_OK ? code : Real(file)->pMethods->xTruncate(Real(file), size);
}

int Sync(sqlite3_file* file, int flags) {
  const int code = StrikeAt(Call::SYNC, file);
  return code != SQLITE_OK ? code : Real(file)->pMethods->xSync(Real(file), flags);
}

int FileSize(sqlite3_file* file, sqlite3_int64* size) {
  const int code = StrikeAt(Call::SIZE, file);
  return code != SQLITE_OK ? code : Real(file)->pMethods->xFileSize(Real(file), size);
}

int Lock(sqlite3_file* file, int level) {
  const int code = StrikeAt(Call::LOCK, file);
  return code != SQLITE_OK ? code : Real(file)->pMethods->xLock(Real(file), level);
}

int Unlock(sqlite3_file* file, int level) {
  return Real(file)->pMethods->xUnlock(Real(file), level);
}

int CheckReservedLock(sqlite3_file* file, int* held) {
  const int code = StrikeAt(Call::LOCK, file);
  return code != SQLITE_OK ? code : Real(file)->pMethods->xCheckReservedLock(Real(file), held);
}

int FileControl(sqlite3_file* file, int operation, void* argument) {
  return Real(file)->pMethods->xFileControl(Real(file), operation, argument);
}

int SectorSize(sqlite3_file* file) {
  return Real(file)->pMethods->xSectorSize(Real(file));
}

int DeviceCharacteristics(sqlite3_file* file) {
  return Real(file)->pMethods->xDeviceCharacteristics(Real(file));
}

int ShmMap(sqlite3_file* file, int page, int size, int extend, void volatile** mapped) {
  const int code = StrikeAt(Call::SHARED_MEMORY, file);
  if (code != SQLITE_OK) {
    *mapped = nullptr;
    return code;
  }
  return Real(file)->pMethods->xShmMap(Real(file), page, size, extend, mapped);
}

int ShmLock(sqlite3_file* file, int offset, int count, int flags) {
  // A lock that is given back cannot fail.
  const bool taken = (flags & SQLITE_SHM_LOCK) != 0;
  const int code = taken ? StrikeAt(Call::SHARED_LOCK, file) : SQLITE_OK;
  return code != SQLITE_OK ? code
                           : Real(file)->pMethods->xShmLock(Real(file), offset, count, flags);
}

void ShmBarrier(sqlite3_file* file) {
  Real(file)->pMethods->xShmBarrier(Real(file));
}

int ShmUnmap(sqlite3_file* file, int remove) {
  return Real(file)->pMethods->xShmUnmap(Real(file), remove);
}

constexpr sqlite3_io_methods METHODS = {
    2,
    Close,
    Read,
    Write,
    Truncate,
    Sync,
    FileSize,
    Lock,
    Unlock,
    CheckReservedLock,
    FileControl,
    SectorSize,
    DeviceCharacteristics,
    ShmMap,
    ShmLock,
    ShmBarrier,
    ShmUnmap,
    nullptr,
    nullptr,
};

int Open(sqlite3_vfs* /*self*/, sqlite3_filename name, sqlite3_file* file, int flags,
         int* flags_out) {
  file->pMethods = nullptr;
  const Target target = TargetOf(name != nullptr ? name : "");
  reinterpret_cast<File*>(file)->target = target;
  int code = Strike(Call::OPEN, target);
  if (code == SQLITE_OK) {
    code = real_layer->xOpen(real_layer, name, Real(file), flags, flags_out);
  }
  if (code == SQLITE_OK) {
    file->pMethods = &METHODS;
  }
  return code;
}

int Delete(sqlite3_vfs* /*self*/, const char* name, int sync) {
  const int code = Strike(Call::REMOVE, TargetOf(name));
  return code != SQLITE_OK ? code : real_layer->xDelete(real_layer, name, sync);
}

int Access(sqlite3_vfs* /*self*/, const char* name, int flags, int* result) {
  const int code = Strike(Call::ACCESS, TargetOf(name));
  return code != SQLITE_OK ? code : real_layer->xAccess(real_layer, name, flags, result);
}

}  // namespace

void InstallVfs() {
  real_layer = sqlite3_vfs_find(nullptr);
  layer = *real_layer;
  layer.pNext = nullptr;
  layer.zName = "failing";
  layer.szOsFile = static_cast<int>(sizeof(File)) + real_layer->szOsFile;
  layer.xOpen = Open;
  layer.xDelete = Delete;
  layer.xAccess = Access;
  sqlite3_vfs_register(&layer, 1);
}

}  // namespace fileindexd::fault
