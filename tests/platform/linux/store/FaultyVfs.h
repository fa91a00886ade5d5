// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <sqlite3.h>
#include <string>

namespace tonewerk {

// SQLite's way to files, with faults: the n-th operation that changes files fails. It is the default for all
// connections that are opened while it exists. One at a time; one thread.
//
// A sync that succeeds does nothing, because no test takes the power away.
class FaultyVfs {
 public:
  enum class Fault {
    kIoError,     // as from a broken disk
    kDiskFull,    // nothing is written
    kShortWrite,  // the disk becomes full in the middle of a write
  };

  FaultyVfs() : real_(*sqlite3_vfs_find(nullptr)), vfs_(real_) {
    current_ = this;
    vfs_.zName = "faulty";
    vfs_.pNext = nullptr;
    vfs_.szOsFile = static_cast<int>(sizeof(File)) + real_.szOsFile;
    vfs_.xOpen = open;
    vfs_.xDelete = remove;
    sqlite3_vfs_register(&vfs_, 1);
  }
  FaultyVfs(const FaultyVfs&) = delete;
  FaultyVfs& operator=(const FaultyVfs&) = delete;
  ~FaultyVfs() {
    sqlite3_vfs_unregister(&vfs_);
    current_ = nullptr;
  }

  // The `number`-th operation from now on fails, counted from 1, and with `forGood` all after it, too.
  void failAt(int number, Fault fault, bool forGood) {
    operations_ = 0;
    failing_ = number;
    fault_ = fault;
    forGood_ = forGood;
  }
  // From now on nothing fails.
  void heal() { failing_ = 0; }
  // Since failAt().
  int operations() const { return operations_; }

 private:
  // SQLite keeps its own part of a file at the beginning. The real file follows in memory.
  struct File : sqlite3_file {
    sqlite3_file* real() { return reinterpret_cast<sqlite3_file*>(this + 1); }
  };

  static sqlite3_file* realOf(sqlite3_file* file) { return static_cast<File*>(file)->real(); }
  static const sqlite3_io_methods& methodsOf(sqlite3_file* file) { return *realOf(file)->pMethods; }

  // Counts an operation. Whether it is to fail.
  static bool fails() {
    ++current_->operations_;
    if (current_->failing_ == 0) return false;
    return current_->forGood_ ? current_->operations_ >= current_->failing_
                              : current_->operations_ == current_->failing_;
  }
  static int failureOr(int ioError) { return current_->fault_ == Fault::kIoError ? ioError : SQLITE_FULL; }

  static int open(sqlite3_vfs* /*vfs*/, const char* name, sqlite3_file* file, int flags, int* outFlags) {
    file->pMethods = nullptr;
    if (fails()) return failureOr(SQLITE_CANTOPEN);
    const int result = current_->real_.xOpen(&current_->real_, name, realOf(file), flags, outFlags);
    if (realOf(file)->pMethods != nullptr) file->pMethods = &kMethods;
    return result;
  }
  static int remove(sqlite3_vfs* /*vfs*/, const char* name, int /*syncsDirectory*/) {
    if (fails()) return SQLITE_IOERR_DELETE;
    return current_->real_.xDelete(&current_->real_, name, 0);
  }
  static int close(sqlite3_file* file) { return methodsOf(file).xClose(realOf(file)); }
  static int read(sqlite3_file* file, void* bytes, int size, sqlite3_int64 at) {
    return methodsOf(file).xRead(realOf(file), bytes, size, at);
  }
  static int write(sqlite3_file* file, const void* bytes, int size, sqlite3_int64 at) {
    const bool failed = fails();
    if (failed && current_->fault_ != Fault::kShortWrite) return failureOr(SQLITE_IOERR_WRITE);
    const int result = methodsOf(file).xWrite(realOf(file), bytes, failed ? size / 2 : size, at);
    return failed ? SQLITE_FULL : result;
  }
  static int truncate(sqlite3_file* file, sqlite3_int64 size) {
    if (fails()) return failureOr(SQLITE_IOERR_TRUNCATE);
    return methodsOf(file).xTruncate(realOf(file), size);
  }
  static int sync(sqlite3_file* /*file*/, int /*flags*/) {
    return fails() ? failureOr(SQLITE_IOERR_FSYNC) : SQLITE_OK;
  }
  static int fileSize(sqlite3_file* file, sqlite3_int64* size) {
    return methodsOf(file).xFileSize(realOf(file), size);
  }
  static int lock(sqlite3_file* file, int level) { return methodsOf(file).xLock(realOf(file), level); }
  static int unlock(sqlite3_file* file, int level) { return methodsOf(file).xUnlock(realOf(file), level); }
  static int checkReservedLock(sqlite3_file* file, int* isReserved) {
    return methodsOf(file).xCheckReservedLock(realOf(file), isReserved);
  }
  static int fileControl(sqlite3_file* file, int operation, void* argument) {
    return methodsOf(file).xFileControl(realOf(file), operation, argument);
  }
  static int sectorSize(sqlite3_file* file) { return methodsOf(file).xSectorSize(realOf(file)); }
  static int deviceCharacteristics(sqlite3_file* file) {
    return methodsOf(file).xDeviceCharacteristics(realOf(file));
  }
  static int shmMap(sqlite3_file* file, int region, int size, int extends, void volatile** memory) {
    if (extends != 0 && fails()) return failureOr(SQLITE_IOERR_SHMSIZE);
    return methodsOf(file).xShmMap(realOf(file), region, size, extends, memory);
  }
  static int shmLock(sqlite3_file* file, int offset, int count, int flags) {
    return methodsOf(file).xShmLock(realOf(file), offset, count, flags);
  }
  static void shmBarrier(sqlite3_file* file) { methodsOf(file).xShmBarrier(realOf(file)); }
  static int shmUnmap(sqlite3_file* file, int deletes) {
    return methodsOf(file).xShmUnmap(realOf(file), deletes);
  }
  static int fetch(sqlite3_file* file, sqlite3_int64 at, int size, void** memory) {
    return methodsOf(file).xFetch(realOf(file), at, size, memory);
  }
  static int unfetch(sqlite3_file* file, sqlite3_int64 at, void* memory) {
    return methodsOf(file).xUnfetch(realOf(file), at, memory);
  }

  static constexpr sqlite3_io_methods kMethods{3,
                                               close,
                                               read,
                                               write,
                                               truncate,
                                               sync,
                                               fileSize,
                                               lock,
                                               unlock,
                                               checkReservedLock,
                                               fileControl,
                                               sectorSize,
                                               deviceCharacteristics,
                                               shmMap,
                                               shmLock,
                                               shmBarrier,
                                               shmUnmap,
                                               fetch,
                                               unfetch};

  static inline FaultyVfs* current_ = nullptr;
  sqlite3_vfs& real_;
  sqlite3_vfs vfs_;
  int operations_ = 0;
  int failing_ = 0;
  Fault fault_ = Fault::kIoError;
  bool forGood_ = false;
};

}  // namespace tonewerk
