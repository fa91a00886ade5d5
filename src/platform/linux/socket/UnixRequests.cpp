// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/socket/UnixRequests.h"

#include <cassert>
#include <utility>

#include "platform/linux/threads/BatchScope.h"
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

}  // namespace

UnixRequests::UnixRequests(std::shared_ptr<const UnixRequestContext> context,
                           std::shared_ptr<const Slab> slab)
    : context_(std::move(context)), slab_(std::move(slab)) {}

UnixRequests::~UnixRequests() {
  for (; delivered_ < requests_.size(); ++delivered_) {
    context_->window->finished(bytesOf(requests_[delivered_]));
  }
}

void UnixRequests::add(const RpcFrameScanner::Frame& frame, std::string_view bytes,
                       std::optional<std::size_t> method) {
  requests_.push_back(
      {{bytes, frame.argumentCount, frame.arguments}, frame.identifier, frame.isNotification, method});
  const std::size_t size = bytesOf(requests_.back());
  bytes_ += size;
  context_->window->begin(size);
}

void UnixRequests::addFirst(const RpcFrameScanner::Frame& frame, std::string bytes,
                            std::optional<std::size_t> method) {
  assert(empty());
  first_ = std::move(bytes);
  add(frame, first_, method);
}

bool UnixRequests::deliver() {
  RequestHandler& handler = *context_->handler;
  ShapeTable* const shapes = handler.shapes();
  while (delivered_ < requests_.size()) {
    lookAhead();
    (void)deliverNext(*context_->decoder, shapes, Wanted::kAll);
    if (handler.isTurnOver()) break;
  }
  return delivered_ == requests_.size();
}

void UnixRequests::deliverAtOnce() {
  RpcFrameDecoder decoder;  // the shared one may be in use, and so may the handler's shapes
  while (delivered_ < requests_.size()) (void)deliverNext(decoder, nullptr, Wanted::kAll);
}

bool UnixRequests::deliverQuick() {
  const RequestWindow::Batch finished(*context_->window);
  const ReplyOutbox::Gathering replies(*context_->outbox);
  RequestHandler& handler = *context_->handler;
  ShapeTable* const shapes = handler.shapes();
  while (delivered_ < requests_.size()) {
    lookAhead();
    if (!deliverNext(*context_->decoder, shapes, Wanted::kQuick)) return false;
    if (handler.isTurnOver()) break;
  }
  return delivered_ == requests_.size();
}

void UnixRequests::lookAhead() const {
  const std::size_t ahead = delivered_ + RequestHandler::kExpectedAhead;
  if (ahead >= requests_.size()) return;
  const Request& request = requests_[ahead];
  if (!request.method || !context_->methods.methods[*request.method].carriesMessage) return;
  if (const auto session = RpcFrameDecoder::sessionOf(request.frame))
    context_->handler->expectMessage(*session);
}

bool UnixRequests::deliverNext(RpcFrameDecoder& decoder, ShapeTable* shapes, Wanted wanted) {
  const Request& request = requests_[delivered_];
  RequestHandler& handler = *context_->handler;
  if (shapes != nullptr && request.method && context_->methods.methods[*request.method].carriesMessage) {
    if (IncomingMessage* message = decoder.decodeMessage(request.frame, *shapes)) {
      const bool isTaken = wanted == Wanted::kAll || handler.isQuick(*request.method, message);
      if (isTaken) {
        handler.beginFrame(request.frame.bytes);
        handler.handleMessage(*request.method, *message, replyTo(request), takeNext());
      }
      decoder.releaseMessage();
      if (isTaken) BatchScope::pieceHasRun();
      return isTaken;
    }
    decoder.releaseMessage();
  }
  // Before it is decoded, which may take long.
  if (wanted == Wanted::kQuick && request.method && !handler.isQuick(*request.method, nullptr)) return false;
  RpcFrame& frame = decoder.decode(request.frame.bytes);
  if (const auto problem = problemWith(request, frame)) {
    const InFlightToken token = takeNext();
    replyTo(request)(problem);
  } else {
    if (shapes != nullptr) handler.beginFrame(request.frame.bytes);
    handler.handleRequest(*request.method, std::move(frame.arguments), replyTo(request), takeNext());
  }
  BatchScope::pieceHasRun();
  return true;
}

InFlightToken UnixRequests::takeNext() { return {context_->window, bytesOf(requests_[delivered_++])}; }

Reply UnixRequests::replyTo(const Request& request) const {
  return request.isNotification ? Reply() : Reply(context_->outbox, request.identifier);
}

std::optional<ReplyError> UnixRequests::problemWith(const Request& request, const RpcFrame& frame) const {
  if (!request.method) {
    return messagingError(kUnknownMethod,
                          "unknown method " + std::string(shortened(frame.method, kMaxMethodNameBytes)));
  }
  const Method& known = context_->methods.methods[*request.method];
  if (auto problem = problemWithCaller(known, context_->account->isTrusted())) return problem;
  if (frame.refused) return messagingError(kInvalidArguments, problemText(known, *frame.refused));
  std::optional<std::string> problem = tonewerk::problemWith(known, frame.arguments);
  return problem ? std::optional(messagingError(kInvalidArguments, std::move(*problem))) : std::nullopt;
}

std::size_t UnixRequests::bytesOf(const Request& request) const {
  return request.frame.bytes.size() +
         (request.method ? context_->methods.methods[*request.method].replyBytes : std::size_t{0});
}

}  // namespace tonewerk
