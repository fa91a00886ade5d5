// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/ReplyOutbox.h"

#include <utility>

#include "platform/linux/RpcWriter.h"

namespace tonewerk {

void ReplyOutbox::reply(std::uint32_t requestIdentifier, const std::optional<ReplyError>& error,
                        const std::optional<Value>& result) {
  {
    const std::lock_guard lock(mutex_);
    if (isClosed_) return;
    const bool wasEmpty = bytes_.empty();
    RpcWriter(bytes_).response(requestIdentifier, error, result);
    if (!wasEmpty) return;  // the I/O thread has been told and has not come yet
  }
  waker_->wake(connection_);
}

void ReplyOutbox::takeInto(std::string& out) {
  const std::lock_guard lock(mutex_);
  if (out.empty()) {
    out.swap(bytes_);
  } else {
    out += std::exchange(bytes_, {});
  }
}

void ReplyOutbox::close() {
  const std::lock_guard lock(mutex_);
  isClosed_ = true;
  bytes_ = {};
}

}  // namespace tonewerk
