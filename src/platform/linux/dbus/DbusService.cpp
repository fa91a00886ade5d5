// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/dbus/DbusService.h"

#include <array>
#include <cerrno>
#include <poll.h>
#include <string_view>
#include <sys/eventfd.h>
#include <system_error>
#include <systemd/sd-bus.h>
#include <utility>

#include "platform/Heartbeat.h"
#include "platform/Log.h"
#include "platform/linux/dbus/DbusAnswer.h"

namespace tonewerk {
namespace {

constexpr const char* kBusName = "org.freedesktop.DBus";
constexpr const char* kBusPath = "/org/freedesktop/DBus";

// The bus's answers to a request for a name.
constexpr std::uint32_t kIsOwner = 1;
constexpr std::uint32_t kIsInQueue = 2;

bool isError(sd_bus_message* message) { return sd_bus_message_is_method_error(message, nullptr) > 0; }

std::string errorTextOf(sd_bus_message* message) {
  const sd_bus_error* error = sd_bus_message_get_error(message);
  if (error == nullptr) return "an unknown error";
  return error->message == nullptr ? error->name : error->message;
}

// An error in a handler becomes the call's answer.
int refuse(sd_bus_error* error, const ReplyError& problem) {
  const DbusError named = dbusErrorOf(problem);
  return sd_bus_error_set(error, named.name.c_str(), named.message.c_str());
}

bool readNumber(sd_bus_message* message, std::uint32_t& number) {
  return sd_bus_message_read(message, "v", "u", &number) > 0;
}

DbusPeer peerOf(sd_bus_message* credentials) {
  DbusPeer peer;
  if (sd_bus_message_enter_container(credentials, SD_BUS_TYPE_ARRAY, "{sv}") <= 0) return peer;
  while (sd_bus_message_enter_container(credentials, SD_BUS_TYPE_DICT_ENTRY, "sv") > 0) {
    const char* key = nullptr;
    std::uint32_t number = 0;
    if (sd_bus_message_read_basic(credentials, SD_BUS_TYPE_STRING, &key) <= 0) break;
    if (std::string_view(key) == "ProcessID") {
      if (readNumber(credentials, number)) peer.processIdentifier = static_cast<std::int32_t>(number);
    } else if (std::string_view(key) == "UnixUserID") {
      if (readNumber(credentials, number)) peer.userIdentifier = number;
    } else if (sd_bus_message_skip(credentials, "v") < 0) {
      break;
    }
    if (sd_bus_message_exit_container(credentials) < 0) break;
  }
  return peer;
}

}  // namespace

struct DbusService::Handlers {
  static int call(sd_bus_message* call, void* data, sd_bus_error* error) {
    auto& service = *static_cast<DbusService*>(data);
    if (sd_bus_message_is_method_call(call, nullptr, nullptr) <= 0) return 0;
    const char* interface = sd_bus_message_get_interface(call);
    if (interface != nullptr && interface != service.names_.interface) return 0;
    const char* member = sd_bus_message_get_member(call);
    const DbusInterface::Entry* entry = service.context_.interface.find(member);
    if (entry == nullptr) return 0;  // the library answers with an error
    const std::optional<ReplyError> problem = service.request(call, *entry);
    return problem ? refuse(error, *problem) : 1;
  }

  static int nameAnswered(sd_bus_message* answer, void* data, sd_bus_error*) {
    auto& service = *static_cast<DbusService*>(data);
    // If the bus is lost before it answers, the library makes this answer itself.
    service.isReached_ = sd_bus_message_is_method_error(answer, SD_BUS_ERROR_NO_REPLY) == 0;
    std::uint32_t result = 0;
    if (isError(answer) || sd_bus_message_read(answer, "u", &result) <= 0) {
      service.isRefused_ = true;
      service.problem_ = errorTextOf(answer);
    } else if (result == kIsInQueue) {
      errorLog(service.context_.log, "%@ is taken by another on D-Bus; waiting for it", service.names_.name);
    } else if (result != kIsOwner) {
      service.isRefused_ = true;
      service.problem_ = "it is not given to this process";
    }
    return 0;
  }

  static int nameAcquired(sd_bus_message* signal, void* data, sd_bus_error*) {
    auto& service = *static_cast<DbusService*>(data);
    const char* name = nullptr;
    if (sd_bus_message_read_basic(signal, SD_BUS_TYPE_STRING, &name) <= 0 || name != service.names_.name)
      return 0;
    defaultLog(service.context_.log, "serving %@ on D-Bus", service.names_.name);
    return 0;
  }

  static int identityAnswered(sd_bus_message* answer, void* data, sd_bus_error*) {
    auto& client = *static_cast<Client*>(data);
    if (sd_bus_message_is_method_error(answer, SD_BUS_ERROR_NAME_HAS_NO_OWNER) > 0) {
      return vanished(answer, data, nullptr);  // before the match rule was active
    }
    client.connection.identify(isError(answer) ? DbusPeer() : peerOf(answer));
    // It may have no answer that is still to be sent.
    if (client.connection.hasNoPlace()) client.service.answering_.push_back(client.identifier);
    return 0;
  }

  static int matchAnswered(sd_bus_message* answer, void* data, sd_bus_error*) {
    if (!isError(answer)) return 0;
    auto& client = *static_cast<Client*>(data);
    errorLog(client.service.context_.log, "cannot follow %@ on D-Bus: %@", client.name, errorTextOf(answer));
    client.service.remove(client);
    return 0;
  }

  // Requests from before the client vanished are still carried out, as on the socket.
  static int vanished(sd_bus_message*, void* data, sd_bus_error*) {
    auto& client = *static_cast<Client*>(data);
    client.connection.identify({});
    client.service.remove(client);
    return 0;
  }
};

DbusService::DbusService(const DbusNames& names, const std::string& address,
                         const DbusConnectionContext& context)
    : names_(names), context_(context), bus_(openBus(address, problem_)) {}

DbusService::~DbusService() {
  byIdentifier_.clear();
  for (const auto& [name, client] : clients_) client->connection.end();
  clients_.clear();
}

DbusService::End DbusService::serve(const std::atomic<bool>& isStopping) {
  if (bus_ == nullptr) return End::kNoBus;
  if (!start()) return End::kNoBus;
  while (!isStopping) {
    Heartbeat::beatHere();
    takeWakes();
    sendAnswers();
    const bool mustSend = isFull();
    if (!mustSend) {
      const int result = sd_bus_process(bus_.get(), nullptr);
      if (result < 0) return endLost(result);
      if (isRefused_) return isReached_ ? End::kRefused : End::kNoBus;
      if (result > 0) continue;
    }
    if (!wait(mustSend) || !mustSend) continue;
    if (const int result = sd_bus_process(bus_.get(), nullptr); result < 0) return endLost(result);
  }
  return End::kStopped;
}

DbusService::End DbusService::endLost(int result) {
  problem_ = std::generic_category().message(-result);
  return isReached_ ? End::kLost : End::kNoBus;
}

bool DbusService::start() {
  sd_bus* bus = bus_.get();
  const auto isFine = [this](int result) {
    if (result < 0) problem_ = std::generic_category().message(-result);
    return result >= 0;
  };
  // The object's handler is called first and takes the calls. The table is for introspection only.
  return isFine(sd_bus_add_object(bus, nullptr, names_.path.c_str(), Handlers::call, this)) &&
         isFine(sd_bus_add_object_vtable(bus, nullptr, names_.path.c_str(), names_.interface.c_str(),
                                         context_.interface.vtable(), this)) &&
         isFine(sd_bus_match_signal_async(bus, nullptr, kBusName, kBusPath, kBusName, "NameAcquired",
                                          Handlers::nameAcquired, nullptr, this)) &&
         isFine(sd_bus_request_name_async(bus, nullptr, names_.name.c_str(), SD_BUS_NAME_QUEUE,
                                          Handlers::nameAnswered, this));
}

// Nothing more is sent while the bus has not taken what was sent, so the library's queue cannot grow. Answers
// wait in their clients' outboxes, and count against the clients' bounds.
bool DbusService::isFull() const {
  std::uint64_t unsent = 0;
  return sd_bus_is_ready(bus_.get()) > 0 && sd_bus_get_n_queued_write(bus_.get(), &unsent) >= 0 && unsent > 0;
}

bool DbusService::wait(bool onlyToSend) const {
  const int events = onlyToSend ? POLLOUT : sd_bus_get_events(bus_.get());
  if (events < 0) return true;  // sd_bus_process() then returns the error
  std::array<pollfd, 2> waited = {pollfd{context_.waker->fileDescriptor(), POLLIN, 0},
                                  pollfd{sd_bus_get_fd(bus_.get()), static_cast<short>(events), 0}};
  const auto timeout = timeToNextBusWork(bus_.get());
  const Heartbeat::Rest rest;
  const int ready = ::poll(waited.data(), waited.size(), static_cast<int>(timeout.count()));
  return ready > 0 && waited[1].revents != 0;
}

void DbusService::takeWakes() {
  eventfd_t count = 0;
  static_cast<void>(::eventfd_read(context_.waker->fileDescriptor(), &count));
  for (const std::uint64_t identifier : context_.waker->take()) answering_.push_back(identifier);
}

void DbusService::sendAnswers() {
  while (!answering_.empty() && !isFull()) {
    const auto found = byIdentifier_.find(answering_.front());
    if (found != byIdentifier_.end() && found->second->connection.sendNext(bus_.get())) continue;
    answering_.pop_front();
    if (found != byIdentifier_.end() && found->second->connection.hasNoPlace()) remove(*found->second);
  }
}

std::optional<ReplyError> DbusService::request(sd_bus_message* call, const DbusInterface::Entry& entry) {
  const char* sender = sd_bus_message_get_sender(call);
  Client* client = sender == nullptr ? nullptr : clientNamed(sender);
  if (client == nullptr) return messagingError(kOverLimit, "the service has too many clients");
  return client->connection.handleCall(call, entry);
}

DbusService::Client* DbusService::clientNamed(const std::string& name) {
  const auto found = clients_.find(name);
  if (found != clients_.end()) return found->second.get();
  if (clients_.size() >= kMaxClients) return nullptr;
  const std::uint64_t identifier = nextIdentifier_++;
  std::unique_ptr<Client> client(
      new Client{*this, identifier, DbusConnection(context_, identifier, name), name, nullptr, nullptr});
  if (!watch(*client)) return nullptr;
  byIdentifier_.emplace(identifier, client.get());
  return clients_.emplace(name, std::move(client)).first->second.get();
}

// The match rule is sent before the query, so the service notices when a client vanishes after the query was
// answered.
bool DbusService::watch(Client& client) {
  const std::string rule =
      "type='signal',sender='org.freedesktop.DBus',path='/org/freedesktop/DBus',"
      "interface='org.freedesktop.DBus',member='NameOwnerChanged',arg0='" +
      client.name + "',arg2=''";
  sd_bus_slot* slot = nullptr;
  if (sd_bus_add_match_async(bus_.get(), &slot, rule.c_str(), Handlers::vanished, Handlers::matchAnswered,
                             &client) < 0)
    return false;
  client.vanishing.reset(slot);
  if (sd_bus_call_method_async(bus_.get(), &slot, kBusName, kBusPath, kBusName, "GetConnectionCredentials",
                               Handlers::identityAnswered, &client, "s", client.name.c_str()) < 0) {
    return false;
  }
  client.identity.reset(slot);
  return true;
}

void DbusService::remove(Client& client) {
  byIdentifier_.erase(client.identifier);
  const auto found = clients_.find(client.name);
  const std::unique_ptr<Client> held = std::move(found->second);
  clients_.erase(found);
  held->connection.end();
}

}  // namespace tonewerk
