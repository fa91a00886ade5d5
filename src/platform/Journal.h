// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "protocol/RequestSet.h"
#include "values/FunctionRef.h"

namespace tonewerk {

// Keeps what clients asked for on the device, so that their sessions outlive a crash of the daemon: each
// request that changes sessions is a record. Records are numbered; a number is never used twice.
//
//   append ... append -> in memory -> write() -> with the kernel -> sync() -> on the disk
//
// What is with the kernel outlives the process; what is on the disk outlives the machine.
//
// append(), write(), drop() and clear() are used by one thread at a time; sync() and bytes() by any thread.
// read() and continueAfter() come before the first append().
class Journal {
 public:
  // The values are stored.
  enum class Kind : std::uint8_t {
    kConnected = 1,            // the bytes are the process's identifier and name (JournalProcess.h)
    kRequest = 2,              // the bytes are the whole frame of the request, as a socket's client sends it
    kDisconnected = 3,         // no bytes
    kSingleMessagesEnded = 4,  // no bytes; the session of a user's single messages has stopped
  };

  // From whom a record comes, and when.
  struct Origin {
    double at = 0.0;           // seconds since 1970, by the wall clock
    std::uint64_t client = 0;  // the connection's number, which no other connection in the journal has
    std::uint32_t user = 0;
  };

  // The bytes are valid during the call that passes the record.
  struct Record {
    std::uint64_t sequence = 0;  // from 1
    Kind kind = Kind::kRequest;
    Origin origin;
    std::string_view bytes;
  };

  // What read() has found.
  struct Reading {
    std::uint64_t records = 0;  // read well
    // Places where bytes did not make a record, though records follow; the bytes there were left out.
    std::uint64_t damagedPlaces = 0;
    std::uint64_t damagedBytes = 0;
    // Bytes after the last record, of a write that the end of the process cut off. They are no damage.
    std::uint64_t tornBytes = 0;
  };

  virtual ~Journal() = default;

  // Adds a record and returns its number. It is in memory until write().
  virtual std::uint64_t append(Kind kind, const Origin& origin, std::string_view bytes) = 0;
  // Adds a request that did not come as a frame.
  virtual std::uint64_t append(const Origin& origin, std::string_view method, const Arguments& arguments) = 0;

  // Hands everything that was appended to the kernel. False when that fails; then what was appended is kept,
  // within a bound, for the next call.
  [[nodiscard]] virtual bool write() = 0;
  // Brings what is with the kernel to the disk. May take long. False when that fails.
  [[nodiscard]] virtual bool sync() = 0;

  // Calls visit(record) for each record from the oldest one on, until it returns false. Takes memory for some
  // records only. Damage costs the records that it covers.
  virtual Reading read(FunctionRef<bool(const Record&)> visit) = 0;

  // The records before this number are not needed to recover sessions any more. They may be read again by the
  // next process all the same, as far as they share a file with others.
  virtual void drop(std::uint64_t before) = 0;
  // Drops all records. The next process reads none of them.
  virtual void clear() = 0;
  // A number from which on the newest records take at most so many bytes: drop() makes room with it. Above
  // last() when not even the newest records do.
  virtual std::uint64_t firstWithin(std::uint64_t bytes) const = 0;

  // The number of the newest record; 0 when there was none.
  virtual std::uint64_t last() const = 0;
  // The next number is above `sequence`.
  virtual void continueAfter(std::uint64_t sequence) = 0;

  // The bytes of the records that are not dropped.
  virtual std::uint64_t bytes() const = 0;
};

}  // namespace tonewerk
