// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstdint>
#include <deque>
#include <memory>
#include <string>
#include <unordered_map>

#include "platform/linux/dbus/DbusConnection.h"

namespace tonewerk {

// The names under which a service is found on a bus.
struct DbusNames {
  std::string name;
  std::string path;
  std::string interface;
};

// Serves clients on one bus connection until it is lost, on the bus's thread.
//
//   serve()   connects, exports the interface, asks for the name, then takes calls and sends answers
//   bus  ->   a call             -> its sender's DbusConnection, which the first call makes
//        ->   a name vanishes    -> its DbusConnection ends
//        <-   answers of any thread, through the connections' outboxes
//
// While the bus does not take what was sent, nothing more is read from it. No function waits for an answer of
// the bus.
class DbusService {
 public:
  // The most names at once, those included whose users are not known yet or that are about to be refused.
  // Each needs a match rule of the bus, and a system bus allows 512 of them. Resource::kBusConnections says
  // how many clients users may have.
  static constexpr std::size_t kMaxClients = 480;

  enum class End {
    kStopped,  // `isStopping` was set
    kNoBus,    // the bus was never reached
    kRefused,  // the bus does not give this process the name
    kLost,     // the bus is gone
  };

  // `names` and `context` outlive the service. `address` is as in openBus().
  DbusService(const DbusNames& names, const std::string& address, const DbusConnectionContext& context);
  DbusService(const DbusService&) = delete;
  DbusService& operator=(const DbusService&) = delete;
  // Ends every connection.
  ~DbusService();

  // Returns when the bus is lost, or when `isStopping` is set and the waker is signalled.
  [[nodiscard]] End serve(const std::atomic<bool>& isStopping);
  // Why serve() returned, for the log.
  const std::string& problem() const { return problem_; }

 private:
  // The library passes a pointer to the client to its callbacks.
  struct Client {
    DbusService& service;
    const std::uint64_t identifier;
    DbusConnection connection;
    std::string name;
    BusSlot vanishing;  // the match rule
    BusSlot identity;   // the query for its credentials
  };

  // The library's callbacks.
  struct Handlers;

  [[nodiscard]] bool start();
  [[nodiscard]] End endLost(int result);
  bool isFull() const;
  // Waits for the bus, the waker or the library's next time-out. True when the bus is ready.
  [[nodiscard]] bool wait(bool onlyToSend) const;
  void takeWakes();
  void sendAnswers();

  [[nodiscard]] std::optional<ReplyError> request(sd_bus_message* call, const DbusInterface::Entry& entry);
  // Finds or makes the client. Null when there are too many clients or the library cannot watch it.
  [[nodiscard]] Client* clientNamed(const std::string& name);
  [[nodiscard]] bool watch(Client& client);
  void remove(Client& client);

  const DbusNames& names_;
  const DbusConnectionContext& context_;
  std::string problem_;
  bool isReached_ = false;  // the bus has answered
  bool isRefused_ = false;
  std::uint64_t nextIdentifier_ = 1;

  Bus bus_;
  // Declared after the bus, because they hold objects of the bus.
  std::unordered_map<std::string, std::unique_ptr<Client>> clients_;
  std::unordered_map<std::uint64_t, Client*> byIdentifier_;
  std::deque<std::uint64_t> answering_;  // clients that may have answers to send
};

}  // namespace tonewerk
