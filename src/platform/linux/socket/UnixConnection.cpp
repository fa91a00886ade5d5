// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/socket/UnixConnection.h"

#include <algorithm>
#include <cerrno>
#include <sys/socket.h>
#include <system_error>
#include <utility>

#include "platform/Log.h"
#include "platform/linux/messaging/AllocatorReclaimer.h"
#include "values/ShortenedText.h"

namespace tonewerk {
namespace {

// How much of an unknown method's name is repeated in the answer.
constexpr std::size_t kMaxMethodNameBytes = 64;

std::string problemText(const Method& method, const RefusedValue& refused) {
  std::string text = std::string(method.name) + ": argument " + std::to_string(refused.argument + 1);
  if (refused.argument < method.parameters.size()) {
    text += " (" + std::string(method.parameters[refused.argument].name) + ")";
  }
  return text + " " + refused.what;
}

// The bytes that a request holds until it has finished: its frame's size or the size of its values, whichever
// is larger.
std::size_t bytesHeldBy(const RpcFrame& frame) {
  std::size_t bytes = frame.arguments.capacity() * sizeof(Argument);
  for (const Argument& argument : frame.arguments) {
    if (argument) bytes += argument->bytes();
  }
  return std::max(bytes, frame.wireBytes);
}

}  // namespace

UnixConnection::UnixConnection(const UnixConnectionContext& context, std::uint64_t identifier,
                               FileDescriptor socket)
    : context_(context),
      identifier_(identifier),
      socket_(std::move(socket)),
      reader_(context.texts),
      window_(std::make_shared<RequestWindow>(context.waker, identifier)),
      outbox_(std::make_shared<ReplyOutbox>(socket_.get(), context.waker, identifier)) {
  ucred peer{};
  socklen_t size = sizeof(peer);
  if (::getsockopt(socket_.get(), SOL_SOCKET, SO_PEERCRED, &peer, &size) == 0) {
    processIdentifier_ = peer.pid;
    userIdentifier_ = peer.uid;
  }
}

UnixConnection::~UnixConnection() {
  outbox_->close();
  if (context_.memory != nullptr) context_.memory->clientEnded();
}

std::string UnixConnection::description() const {
  return "connection " + std::to_string(identifier_) + " of process " + std::to_string(processIdentifier_) +
         ", user " + std::to_string(userIdentifier_);
}

void UnixConnection::setRequestHandler(const RequestSet& interface, std::shared_ptr<RequestHandler> object) {
  interface_ = &interface;
  object_ = std::move(object);
}

void UnixConnection::resume() {
  if (object_ == nullptr) return;
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
  if (isPaused_ && hasRoom()) process(std::exchange(unprocessed_, {}));
  updateInterest();
}

void UnixConnection::receive() {
  const ssize_t count =
      ::recv(socket_.get(), context_.readBuffer.data(), context_.readBuffer.size(), MSG_DONTWAIT);
  if (count > 0) {
    const auto bytes = static_cast<std::size_t>(count);
    if (context_.memory != nullptr) context_.memory->clientSent(bytes);
    return process({context_.readBuffer.data(), bytes});
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

void UnixConnection::process(std::string_view bytes) {
  isPaused_ = false;
  while (hasRoom()) {
    switch (reader_.next(bytes)) {
      case RpcFrameReader::Result::kFrame:
        dispatch(reader_.frame());
        break;
      case RpcFrameReader::Result::kNeedsMore:
        return;
      case RpcFrameReader::Result::kBroken:
        return endAsBroken(reader_.problem());
    }
    if (hasEnded_) return;
  }
  isPaused_ = true;
  unprocessed_ = bytes;
}

void UnixConnection::dispatch(RpcFrame& frame) {
  if (frame.kind == RpcFrame::Kind::kResponse) return endAsBroken("a response");
  const std::optional<std::size_t> method = interface_->find(frame.method);
  Reply reply = frame.kind == RpcFrame::Kind::kRequest ? Reply(outbox_, frame.identifier) : Reply();
  if (const auto problem = problemWithFrame(frame, method)) return reply(problem);
  InFlightToken token = window_->start(bytesHeldBy(frame) + interface_->methods[*method].replyBytes);
  object_->handleRequest(*method, std::move(frame.arguments), std::move(reply), std::move(token));
}

std::optional<ReplyError> UnixConnection::problemWithFrame(const RpcFrame& frame,
                                                           std::optional<std::size_t> method) const {
  if (!method)
    return messagingError(kUnknownMethod,
                          "unknown method " + std::string(shortened(frame.method, kMaxMethodNameBytes)));
  const Method& known = interface_->methods[*method];
  if (auto problem = problemWithCaller(known, userIdentifier_, context_.owner)) return problem;
  if (frame.refused) return messagingError(kInvalidArguments, problemText(known, *frame.refused));
  std::optional<std::string> problem = problemWith(known, frame.arguments);
  return problem ? std::optional(messagingError(kInvalidArguments, std::move(*problem))) : std::nullopt;
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
  outbox_->close();
  if (interest_ != 0) context_.epoll.remove(socket_.get());
  infoLog(context_.log, "%@ has ended", *this);
  if (interrupted_) interrupted_();
  if (invalidated_) invalidated_();
  interrupted_ = nullptr;
  invalidated_ = nullptr;
  object_ = nullptr;
  socket_.reset();
}

}  // namespace tonewerk
