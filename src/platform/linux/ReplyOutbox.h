// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>

#include "platform/ExportedInterface.h"
#include "platform/linux/IoWaker.h"

namespace tonewerk {

// Where a connection's replies wait for the I/O thread. Outlives its connection for as long as somebody can
// still reply; replies then go nowhere.
class ReplyOutbox final : public ReplySink {
 public:
  ReplyOutbox(std::shared_ptr<IoWaker> waker, std::uint64_t connection)
      : waker_(std::move(waker)), connection_(connection) {}

  // Any thread.
  void reply(std::uint32_t requestIdentifier, const std::optional<ReplyError>& error,
             const std::optional<Value>& result) override;

  // The I/O thread: appends what waits to `out`.
  void takeInto(std::string& out);
  // The I/O thread: nobody will read any more.
  void close();

 private:
  const std::shared_ptr<IoWaker> waker_;
  const std::uint64_t connection_;
  std::mutex mutex_;
  // Under mutex_.
  std::string bytes_;
  bool isClosed_ = false;
};

}  // namespace tonewerk
