// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/store/StoreFile.h"

#include <chrono>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>

#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/store/SqliteDatabase.h"
#include "platform/linux/store/StoreSchema.h"
#include "support/TemporaryDirectory.h"

namespace tonewerk {
namespace {

constexpr std::chrono::seconds kLongEnough{30};

class StoreFileTest : public testing::Test {
 protected:
  std::string path() const { return directory_.path("reports.db"); }
  void make(std::int64_t version) {
    SqliteDatabase database;
    ASSERT_TRUE(database.open(path(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
    ASSERT_TRUE(
        database.run("PRAGMA journal_mode = WAL; CREATE TABLE IF NOT EXISTS t (a); PRAGMA user_version = " +
                     std::to_string(version)));
  }
  // Whether this process has a lock on the file, as another process would find.
  bool isLocked(const FileDescriptor& file) {
    struct flock lock {};
    lock.l_type = F_WRLCK;
    EXPECT_EQ(::fcntl(file.get(), F_OFD_GETLK, &lock), 0);
    return lock.l_type != F_UNLCK;
  }

  const TemporaryDirectory directory_;
};

TEST_F(StoreFileTest, IsTheUsualOneUnlessANewerVersionMadeThat) {
  EXPECT_EQ(storeFileIn(directory_.path()).path, path());
  make(kStoreSchemaVersion);
  EXPECT_EQ(storeFileIn(directory_.path()).path, path());
  make(kStoreSchemaVersion + 1);
  const StoreFile beside = storeFileIn(directory_.path());
  EXPECT_EQ(beside.path, directory_.path(std::string(kStoreFileNameBesideNewer)));
  EXPECT_EQ(beside.newerSchema, kStoreSchemaVersion + 1);
}

TEST_F(StoreFileTest, TheVersionMayBeInTheLog) {
  make(kStoreSchemaVersion);
  SqliteDatabase writer;
  ASSERT_TRUE(writer.open(path(), SqliteDatabase::Mode::kReadWrite, kLongEnough));
  ASSERT_TRUE(writer.run("PRAGMA user_version = " + std::to_string(kStoreSchemaVersion + 1)));
  ASSERT_GT(std::filesystem::file_size(path() + "-wal"), 0U);
  EXPECT_EQ(storeFileIn(directory_.path()).newerSchema, kStoreSchemaVersion + 1);
}

TEST_F(StoreFileTest, LookingForItMakesNoSideFiles) {
  make(kStoreSchemaVersion);
  (void)storeFileIn(directory_.path());
  EXPECT_FALSE(std::filesystem::exists(path() + "-wal"));
  EXPECT_FALSE(std::filesystem::exists(path() + "-shm"));
}

TEST_F(StoreFileTest, WhatIsNoDatabaseHasNoVersion) {
  std::ofstream(path()) << std::string(600, 'x');
  EXPECT_EQ(storeFileIn(directory_.path()).path, path());
}

// A reader without its lock would not keep the daemon that ends from removing the log, and would then read
// what the next daemon writes as if that were of one transaction.
TEST_F(StoreFileTest, LookingForItLeavesOtherConnectionsTheirLocks) {
  make(kStoreSchemaVersion);
  SqliteDatabase reader;
  ASSERT_TRUE(reader.open(path(), SqliteDatabase::Mode::kReadOnly, kLongEnough));
  ASSERT_EQ(reader.number("SELECT count(*) FROM t"), 0);
  ASSERT_EQ(std::filesystem::file_size(path() + "-wal"), 0U);
  const FileDescriptor file(::open(path().c_str(), O_RDWR | O_CLOEXEC));
  ASSERT_TRUE(isLocked(file));
  EXPECT_EQ(storeFileIn(directory_.path()).path, path());
  EXPECT_TRUE(isLocked(file));
}

}  // namespace
}  // namespace tonewerk
