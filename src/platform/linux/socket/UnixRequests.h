// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/RequestHandler.h"
#include "platform/accounts/Account.h"
#include "platform/linux/messagepack/RpcFrameDecoder.h"
#include "platform/linux/messagepack/RpcFrameScanner.h"
#include "platform/linux/messaging/RequestWindow.h"
#include "platform/linux/messaging/Slab.h"
#include "platform/linux/socket/ReplyOutbox.h"

namespace tonewerk {

// What the requests of one connection share. They may outlive the connection.
struct UnixRequestContext {
  const RequestSet& methods;
  std::shared_ptr<RequestHandler> handler;
  std::shared_ptr<RpcFrameDecoder> decoder;
  std::shared_ptr<ReplyOutbox> outbox;
  std::shared_ptr<RequestWindow> window;
  std::shared_ptr<Account> account;  // of the peer's user
};

// The requests of one read from a client's socket: their bytes, and where each one is. The messaging thread
// adds them; then they are delivered, there or on another thread.
class UnixRequests final : public ReceivedRequests {
 public:
  // `bytes` are those of one read. The requests that are added lie in them or in a text of their own.
  UnixRequests(std::shared_ptr<const UnixRequestContext> context, std::shared_ptr<const Slab> slab);
  UnixRequests(const UnixRequests&) = delete;
  UnixRequests& operator=(const UnixRequests&) = delete;
  // Requests that were not delivered count as finished.
  ~UnixRequests() override;

  bool empty() const { return requests_.empty(); }
  // Adds a request. `bytes` are the whole frame, in the slab; `method` is its index in the request set, none
  // for an unknown one.
  void add(const RpcFrameScanner::Frame& frame, std::string_view bytes, std::optional<std::size_t> method);
  // Adds the first request, whose bytes came with several reads.
  void addFirst(const RpcFrameScanner::Frame& frame, std::string bytes, std::optional<std::size_t> method);

  std::size_t bytes() const override { return bytes_; }
  [[nodiscard]] bool deliver() override;
  [[nodiscard]] bool deliverQuick() override;
  // Delivers on the messaging thread, while another thread may deliver other requests of the same listener.
  void deliverAtOnce();

 private:
  struct Request {
    RpcFrameDecoder::Frame frame;
    std::uint32_t identifier;
    bool isNotification;
    std::optional<std::size_t> method;
  };

  enum class Wanted { kAll, kQuick };

  // Tells the handler of a message that comes soon.
  void lookAhead() const;
  // False when the next request is not one of the wanted ones. It is then not delivered.
  [[nodiscard]] bool deliverNext(RpcFrameDecoder& decoder, ShapeTable* shapes, Wanted wanted);
  // Counts the next request as delivered. What is returned counts it as finished.
  InFlightToken takeNext();
  Reply replyTo(const Request& request) const;
  [[nodiscard]] std::optional<ReplyError> problemWith(const Request& request, const RpcFrame& frame) const;
  // The bytes that the request counts for in the window.
  std::size_t bytesOf(const Request& request) const;

  const std::shared_ptr<const UnixRequestContext> context_;
  const std::shared_ptr<const Slab> slab_;
  std::string first_;
  std::vector<Request> requests_;
  std::size_t delivered_ = 0;
  std::size_t bytes_ = 0;  // of requests_, as they count in the window
};

}  // namespace tonewerk
