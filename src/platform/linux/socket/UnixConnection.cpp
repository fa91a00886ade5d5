// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/socket/UnixConnection.h"

#include <algorithm>
#include <cerrno>
#include <span>
#include <sys/socket.h>
#include <system_error>
#include <utility>

#include "platform/Log.h"
#include "platform/linux/messaging/AllocatorReclaimer.h"
#include "values/Bytes.h"

namespace tonewerk {
namespace {

// A frame that did not arrive in one read is completed in slices, so that few bytes of later frames are
// copied.
constexpr std::size_t kSliceBytes = 4096;

}  // namespace

UnixPeer UnixPeer::of(const FileDescriptor& socket) {
  ucred peer{};
  socklen_t size = sizeof(peer);
  if (::getsockopt(socket.get(), SOL_SOCKET, SO_PEERCRED, &peer, &size) != 0) return {};
  return {peer.pid, peer.uid};
}

UnixConnection::UnixConnection(const UnixConnectionContext& context, UserIntake& intake,
                               std::uint64_t identifier, FileDescriptor socket, const UnixPeer& peer)
    : context_(context),
      intake_(intake),
      identifier_(identifier),
      socket_(std::move(socket)),
      peer_(peer),
      readCharge_(intake.account, Resource::kReadBytes, 0),
      replyCharge_(intake.account, Resource::kUnfinishedBytes, 0),
      window_(std::make_shared<RequestWindow>(context.waker, identifier)),
      outbox_(
          std::make_shared<ReplyOutbox>(socket_.get(), context.waker, identifier, context.beforeReplies)) {}

UnixConnection::~UnixConnection() {
  outbox_->close();
  if (context_.memory != nullptr) context_.memory->clientEnded();
}

std::string UnixConnection::description() const {
  return "connection " + std::to_string(identifier_) + " of process " + std::to_string(peer_.process) +
         ", user " + std::to_string(peer_.user);
}

void UnixConnection::setRequestHandler(const RequestSet& interface, std::shared_ptr<RequestHandler> object) {
  lastMethod_.reset();
  requestContext_ = std::make_shared<UnixRequestContext>(
      UnixRequestContext{interface, std::move(object), context_.decoder, outbox_, window_, intake_.account});
}

void UnixConnection::resume() {
  if (requestContext_ == nullptr) return;
  isResumed_ = true;
  updateInterest();
}

void UnixConnection::handleEvents(std::uint32_t events) {
  if (hasEnded_) return;
  if ((events & EPOLLOUT) != 0) replies_ = outbox_->flush();
  if (!isPaused_) receive();
  handleWake();
}

void UnixConnection::handleWake() {
  if (hasEnded_) return;
  replies_ = outbox_->flush();
  chargeReplies();
  if (isPaused_ && hasUsersRoom() && hasRoom()) process(std::exchange(unprocessed_, {}));
  updateInterest();
}

void UnixConnection::receive() {
  if (!hasUsersRoom()) {
    isPaused_ = true;
    return;
  }
  const std::span<char> room = intake_.slabs.room();
  const ssize_t count = ::recv(socket_.get(), room.data(), room.size(), MSG_DONTWAIT);
  if (count > 0) {
    const auto bytes = static_cast<std::size_t>(count);
    if (context_.memory != nullptr) context_.memory->clientSent(bytes);
    return process(intake_.slabs.commit(bytes));
  }
  if (count == 0) return end();
  if (errno == EINTR) return;
  if (errno == EAGAIN) {
    if (replies_ == ReplyOutbox::State::kRefused) end();
    return;
  }
  if (errno != ECONNRESET) {
    errorLog(context_.log, "cannot read from %@: %@", *this, std::generic_category().message(errno));
  }
  end();
}

void UnixConnection::process(SlabBytes received) {
  isPaused_ = false;
  auto requests = std::make_unique<UnixRequests>(requestContext_, received.slab);
  while (hasRoom()) {
    const bool isBegun = !begun_.empty();
    const std::string_view bytes = received.bytes;
    const RpcFrameScanner::Result result = scan(received.bytes);
    if (result != RpcFrameScanner::Result::kFrame) {
      chargeRead();
      passOn(std::move(requests));
      if (result == RpcFrameScanner::Result::kBroken) endAsBroken(scanner_.problem());
      return;
    }
    const RpcFrameScanner::Frame& frame = scanner_.frame();
    const std::optional<std::size_t> method = methodOf(frame.method);
    const bool isUrgent = method && requestContext_->handler->isUrgent(*method);
    if (isUrgent) {
      passOn(std::exchange(requests, std::make_unique<UnixRequests>(requestContext_, received.slab)));
    }
    if (isBegun) {
      requests->addFirst(frame, std::exchange(begun_, {}), method);
      chargeRead();  // another connection's frame may go on
    } else {
      requests->add(frame, bytes.substr(0, frame.bytes), method);
    }
    if (isUrgent) {
      requests->deliverAtOnce();
      requests = std::make_unique<UnixRequests>(requestContext_, received.slab);
    }
  }
  isPaused_ = true;
  unprocessed_ = std::move(received);
  chargeRead();
  passOn(std::move(requests));
}

bool UnixConnection::hasUsersRoom() {
  const Account& user = *intake_.account;
  if (!user.hasRoom(Resource::kUnfinishedBytes)) {
    wakeWhenRoom(Resource::kUnfinishedBytes);
    return false;
  }
  if (!unprocessed_.bytes.empty() || user.hasRoom(Resource::kReadBytes)) return true;
  if (!begun_.empty() && intake_.mayContinueFrame(identifier_)) return true;
  wakeWhenRoom(Resource::kReadBytes);
  return false;
}

void UnixConnection::wakeWhenRoom(Resource resource) {
  // Once more after a while: room that others make, or a larger total, wakes nobody.
  context_.waiting.push_back(identifier_);
  const auto& awaits = resource == Resource::kReadBytes ? awaitsReadRoom_ : awaitsRequestRoom_;
  if (awaits->exchange(true)) return;
  intake_.account->whenRoom(resource, [waker = context_.waker, awaits, number = identifier_] {
    *awaits = false;
    waker->wake(number);
  });
}

void UnixConnection::chargeReplies() {
  const std::size_t unsent = outbox_->unsentBytes();
  if (unsent != replyCharge_.amount()) replyCharge_.setTo(unsent);
}

// Bytes that wait hold their slab.
void UnixConnection::chargeRead() {
  if (begun_.empty() && unprocessed_.bytes.empty() && readCharge_.amount() == 0) return;
  const std::size_t frame = begun_.empty() ? 0 : begun_.capacity();
  readCharge_.setTo(frame + (unprocessed_.bytes.empty() ? 0 : sizeof(Slab)));
  if (!begun_.empty()) return;
  for (const std::uint64_t waiting : intake_.endFrame(identifier_)) context_.waker->wake(waiting);
}

// Most requests are of the method of the one before.
std::optional<std::size_t> UnixConnection::methodOf(std::string_view name) {
  const RequestSet& known = requestContext_->methods;
  if (lastMethod_) {
    const std::string_view last = known.methods[*lastMethod_].name;
    if (last.size() == name.size() && sameBytes(last.data(), name.data(), name.size())) return lastMethod_;
  }
  const std::optional<std::size_t> method = known.find(name);
  if (method) lastMethod_ = method;
  return method;
}

RpcFrameScanner::Result UnixConnection::scan(std::string_view& bytes) {
  if (begun_.empty()) {
    const RpcFrameScanner::Result result = scanner_.scan(bytes);
    if (result == RpcFrameScanner::Result::kNeedsMore) begun_ = bytes;
    bytes.remove_prefix(result == RpcFrameScanner::Result::kFrame ? scanner_.frame().bytes : bytes.size());
    return result;
  }
  auto result = RpcFrameScanner::Result::kNeedsMore;
  while (result == RpcFrameScanner::Result::kNeedsMore && !bytes.empty()) {
    const std::size_t before = begun_.size();
    begun_.append(bytes.substr(0, kSliceBytes));
    result = scanner_.scan(begun_);
    if (result == RpcFrameScanner::Result::kFrame) begun_.resize(scanner_.frame().bytes);
    bytes.remove_prefix(begun_.size() - before);
  }
  return result;
}

void UnixConnection::passOn(std::unique_ptr<UnixRequests> requests) {
  if (!requests->empty()) requestContext_->handler->handleReceived(std::move(requests));
}

void UnixConnection::endAsBroken(std::string_view problem) {
  errorLog(context_.log, "%@ sent %@ and is ended", *this, problem);
  end();
}

void UnixConnection::updateInterest() {
  if (hasEnded_ || !isResumed_) return;
  std::uint32_t wanted = 0;
  if (!isPaused_) wanted |= EPOLLIN;
  // A peer that stopped reading may never send again, and then no event would come. Its socket is always
  // writable, so EPOLLOUT makes sure that what it has sent is read.
  const bool isRefused = replies_ == ReplyOutbox::State::kRefused;
  if (replies_ == ReplyOutbox::State::kFull || (isRefused && !isPaused_)) wanted |= EPOLLOUT;
  if (wanted == interest_) return;
  // Without any wanted event the socket is removed, because epoll reports a hang-up even when it is not
  // wanted.
  if (wanted == 0) {
    context_.epoll.remove(socket_.get());
  } else {
    const bool isWatched = interest_ == 0 ? context_.epoll.add(socket_.get(), identifier_, wanted)
                                          : context_.epoll.change(socket_.get(), identifier_, wanted);
    // add() fails when the kernel has no memory or the user watches too many descriptors. The connection's
    // next event or answer tries again; if neither comes, its client is not served.
    if (!isWatched) {
      errorLog(context_.log, "cannot wait for %@: %@", *this, std::generic_category().message(errno));
      return;
    }
  }
  interest_ = wanted;
}

void UnixConnection::end() {
  if (hasEnded_) return;
  hasEnded_ = true;
  begun_ = {};
  unprocessed_ = {};
  chargeRead();
  replyCharge_.setTo(0);
  outbox_->close();
  if (interest_ != 0) context_.epoll.remove(socket_.get());
  infoLog(context_.log, "%@ has ended", *this);
  if (interrupted_) interrupted_();
  if (invalidated_) invalidated_();
  interrupted_ = nullptr;
  invalidated_ = nullptr;
  requestContext_ = nullptr;
  socket_.reset();
}

}  // namespace tonewerk
