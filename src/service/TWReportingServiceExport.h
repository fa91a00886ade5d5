// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstddef>
#include <memory>
#include <optional>
#include <string_view>

#include "platform/RequestHandler.h"
#include "platform/accounts/TurnQueue.h"
#include "service/TWReportingServiceProtocol.h"

namespace tonewerk {

class WatchRequests;

// A request without its method. A handler moves the members out.
struct IncomingRequest {
  Arguments arguments;
  Reply reply;
  InFlightToken token;

  ServiceRequest request() { return {std::move(reply), std::move(token)}; }
};

// Takes each request of one connection to its handler, which turns the request's values into a call of the
// request set or of `watch`.
//
// A connection becomes a client or an onlooker with its first request that decides it, and stays so. An
// onlooker's requests that change something are refused, and so is a client's request to be an onlooker.
class TWReportingServiceExport final : public RequestHandler,
                                       public std::enable_shared_from_this<TWReportingServiceExport> {
 public:
  // The connection's work is done in turns of `account`, that of its user. Maps among the arguments get their
  // shapes from `shapes`; they are trees without it.
  TWReportingServiceExport(std::shared_ptr<TWReportingServiceProtocol> object,
                           std::unique_ptr<WatchRequests> watch, std::shared_ptr<Account> account,
                           std::shared_ptr<ShapeTable> shapes = nullptr);
  ~TWReportingServiceExport() override;

  void beginFrame(std::string_view frame) override { frame_ = frame; }
  // `method`: the index in requests::all(). Runs on the work queue or, for transports that decode themselves
  // and for urgent requests, on the messaging thread.
  void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken token) override;
  void handleMessage(std::size_t method, IncomingMessage& message, Reply reply, InFlightToken token) override;
  // Delivers the requests as the work queue's own work, so that no value is made on one thread and freed on
  // another: quick ones at once on this thread when the queue has nothing to do, because waking its thread
  // costs more than a message; all others on its thread, in the user's turns.
  void handleReceived(std::unique_ptr<ReceivedRequests> requests) override;
  // True for requests that only read, and for messages to one session whose type makes no worker wait.
  bool isQuick(std::size_t method, const IncomingMessage* message) const override;
  void expectMessage(ReporterID session) override { object_->expectMessage(session); }
  ShapeTable* shapes() override { return shapes_.get(); }
  bool isTurnOver() const override { return turns_.isTurnOver(); }
  // True for a trusted user's request to end the process, which does not wait for the work queue. But when
  // the connection has asked to be an onlooker and may be one by now, the answer to that comes first.
  bool isUrgent(std::size_t method) override;

 private:
  enum class Role { kOpen, kClient, kOnlooker };

  // Returns an error when memory is short and the method would hold more of it.
  [[nodiscard]] std::optional<ReplyError> refuseWithoutMemory(const Method& method);
  // Gives the connection the role that the method needs. Returns an error when it already has the other role.
  [[nodiscard]] std::optional<ReplyError> takeRole(const Method& method);

  // Whether requests of the method are kept in the journal, and so run on the work queue.
  static bool isKept(const Method& method);
  void keepAndRun(std::size_t method, std::string_view frame, IncomingRequest& incoming);

  std::atomic<Role> role_ = Role::kOpen;
  std::string_view frame_;  // of the request that comes next; empty when it has none; used on the work queue
  bool hasAskedToObserve_ = false;  // used on the messaging thread
  const std::shared_ptr<TWReportingServiceProtocol> object_;
  const std::unique_ptr<WatchRequests> watch_;
  const std::shared_ptr<Account> account_;
  const std::shared_ptr<LineAllowance> lines_;  // what the connection's requests may log
  const std::shared_ptr<ShapeTable> shapes_;
  TurnQueue& turns_;
};

}  // namespace tonewerk
