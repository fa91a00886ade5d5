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

// Where a service is found on a bus.
struct DbusNames {
  std::string name;
  std::string path;
  std::string interface;
};

// The service's time on one bus, from the connection to its loss; on the bus's thread.
//
//   serve()   connects, exports the interface, asks for the name, then takes calls and sends answers
//   bus  ->   a call             -> its sender's DbusConnection, made at its first
//        ->   a name vanishes    -> its DbusConnection ends
//        <-   answers of any thread, by the connections' outboxes
//
// While the bus does not take what was sent, nothing more is read from it. Nothing here waits for an answer.
class DbusService {
 public:
  // Clients at once. Each takes a match rule of the bus, of which a system bus grants 512.
  static constexpr std::size_t kMaxClients = 256;

  enum class End {
    kStopped,  // somebody set `isStopping`
    kNoBus,    // the bus was never reached
    kRefused,  // it does not give us the name
    kLost,     // it is gone
  };

  // `names` and `context` outlive the service. `address` as openBus() takes it.
  DbusService(const DbusNames& names, const std::string& address, const DbusConnectionContext& context);
  DbusService(const DbusService&) = delete;
  DbusService& operator=(const DbusService&) = delete;
  // Ends every connection.
  ~DbusService();

  // Until the bus is lost, or `isStopping` is set and the waker woken.
  [[nodiscard]] End serve(const std::atomic<bool>& isStopping);
  // Why serve() came back, for the log.
  const std::string& problem() const { return problem_; }

 private:
  // Callbacks of the library get a pointer to the client they are for.
  struct Client {
    DbusService& service;
    const std::uint64_t identifier;
    DbusConnection connection;
    std::string name;
    BusSlot vanishing;  // the match rule
    BusSlot identity;   // the question
  };

  // What the library calls.
  struct Handlers;

  [[nodiscard]] bool start();
  [[nodiscard]] End lose(int result);
  bool isFull() const;
  // Waits for the bus, the waker or the time. True when the bus is ready.
  [[nodiscard]] bool wait(bool onlyToSend) const;
  void takeWakes();
  void sendAnswers();

  [[nodiscard]] std::optional<ReplyError> request(sd_bus_message* call, const DbusInterface::Entry& entry);
  // Null when there are too many, or the bus does not answer.
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
  // After the bus: they hold what is the bus's.
  std::unordered_map<std::string, std::unique_ptr<Client>> clients_;
  std::unordered_map<std::uint64_t, Client*> byIdentifier_;
  std::deque<std::uint64_t> answering_;  // clients that may have answers to send
};

}  // namespace tonewerk
