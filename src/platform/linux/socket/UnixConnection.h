// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Log.h"
#include "platform/Messaging.h"
#include "platform/linux/descriptors/Epoll.h"
#include "platform/linux/descriptors/FileDescriptor.h"
#include "platform/linux/messagepack/RpcFrameScanner.h"
#include "platform/linux/messaging/RequestWindow.h"
#include "platform/linux/messaging/Slab.h"
#include "platform/linux/socket/ReplyOutbox.h"
#include "platform/linux/socket/UnixRequests.h"
#include "platform/linux/socket/UserIntake.h"
#include "platform/linux/threads/IoWaker.h"

namespace tonewerk {

class AllocatorReclaimer;

// What the connections of one listener's thread share.
struct UnixConnectionContext {
  Epoll& epoll;
  std::shared_ptr<IoWaker> waker;
  std::shared_ptr<RpcFrameDecoder> decoder;
  const LogCategory& log;
  // Learns how many bytes a client has sent, and when it is gone. May be null.
  AllocatorReclaimer* memory;
  // Connections that are to be woken after a while, because their users had no room.
  std::vector<std::uint64_t>& waiting;
  // See ReplyOutbox.
  const std::function<void()>& beforeReplies;
};

// The process at the other end of a socket, as the kernel reports it.
struct UnixPeer {
  static UnixPeer of(const FileDescriptor& socket);

  std::int32_t process = 0;
  std::uint32_t user = kNoUser;
};

// Serves one client's socket, on the listener's thread.
//
//   socket -> slab -> RpcFrameScanner -> UnixRequests -> request handler    one object for each read
//   socket <- ReplyOutbox <- replies of any thread
//
// Frames are found here; their values are built where the request handler has them delivered. A connection
// without room for requests, or whose user has none, is paused: bytes that were read and not used wait in
// unprocessed_, and the socket is not read.
class UnixConnection final : public MessagingConnection {
 public:
  // `context` and `intake`, that of the peer's user, outlive the connection. `identifier` is its number in
  // the epoll and the waker.
  UnixConnection(const UnixConnectionContext& context, UserIntake& intake, std::uint64_t identifier,
                 FileDescriptor socket, const UnixPeer& peer);
  ~UnixConnection() override;

  std::int32_t processIdentifier() const override { return peer_.process; }
  std::uint32_t userIdentifier() const override { return peer_.user; }
  const std::shared_ptr<Account>& account() const override { return intake_.account; }
  std::string description() const override;
  void setRequestHandler(const RequestSet& interface, std::shared_ptr<RequestHandler> object) override;
  void setInterruptionHandler(std::function<void()> handler) override { interrupted_ = std::move(handler); }
  void setInvalidationHandler(std::function<void()> handler) override { invalidated_ = std::move(handler); }
  void resume() override;

  // The epoll has reported `events` for the socket.
  void handleEvents(std::uint32_t events);
  // Replies wait to be sent, or there is room for requests again.
  void handleWake();
  // Ends the connection. Its handlers have returned when this returns. Later calls do nothing.
  void end();
  bool hasEnded() const { return hasEnded_; }

 private:
  void receive();
  // Finds requests in the bytes until the bytes or the room for requests are used up, and passes them on.
  void process(SlabBytes received);
  // Finds the next frame's end. Removes the bytes that it has used from the front of `bytes`. A frame that
  // began in an earlier read is then in begun_.
  [[nodiscard]] RpcFrameScanner::Result scan(std::string_view& bytes);
  // Its index among the methods; none for an unknown one.
  [[nodiscard]] std::optional<std::size_t> methodOf(std::string_view name);
  void passOn(std::unique_ptr<UnixRequests> requests);
  void endAsBroken(std::string_view problem);
  void updateInterest();
  bool hasRoom() { return window_->hasRoom(outbox_->unsentBytes()); }
  // Whether the user has room for what is read next. If not, the connection is woken when there is some.
  [[nodiscard]] bool hasUsersRoom();
  void wakeWhenRoom(Resource resource);
  // Charges the user for the frame that has begun and for bytes that wait.
  void chargeRead();
  void chargeReplies();

  const UnixConnectionContext& context_;
  UserIntake& intake_;
  const std::uint64_t identifier_;
  FileDescriptor socket_;
  const UnixPeer peer_;

  std::shared_ptr<const UnixRequestContext> requestContext_;  // null after the end
  std::function<void()> interrupted_;
  std::function<void()> invalidated_;
  bool isResumed_ = false;
  bool hasEnded_ = false;

  RpcFrameScanner scanner_;
  std::optional<std::size_t> lastMethod_;
  std::string begun_;  // the bytes so far of a frame that did not arrive in one read
  Charge readCharge_;  // for begun_ and unprocessed_
  // Set while the connection is to be woken when its user has room.
  const std::shared_ptr<std::atomic<bool>> awaitsReadRoom_ = std::make_shared<std::atomic<bool>>(false);
  const std::shared_ptr<std::atomic<bool>> awaitsRequestRoom_ = std::make_shared<std::atomic<bool>>(false);
  Charge replyCharge_;  // for answers that the peer does not read
  std::shared_ptr<RequestWindow> window_;
  bool isPaused_ = false;
  SlabBytes unprocessed_;

  std::shared_ptr<ReplyOutbox> outbox_;
  // The outbox's state when it was last read. When the peer refuses replies, everything that it has sent is
  // read, and then the connection ends.
  ReplyOutbox::State replies_ = ReplyOutbox::State::kOpen;
  std::uint32_t interest_ = 0;  // the events that the epoll waits for; 0 while it does not watch the socket
};

}  // namespace tonewerk
