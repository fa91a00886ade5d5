// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <concepts>
#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <type_traits>

#include "protocol/AudioEvent.h"
#include "session/TWReportingSessionWorkerConsumerProtocol.h"
#include "session/TWReportingSessionWorkerProducerProtocol.h"
#include "session/TWReportingSessionWorkerProtocol.h"

namespace tonewerk {

// A set of message types. The numbers from 63 on, which mean no type or an unknown one, are in it together
// or not at all.
class MessageTypes {
 public:
  static constexpr MessageTypes none() { return MessageTypes(0); }
  static constexpr MessageTypes all() { return MessageTypes(~std::uint64_t{0}); }
  static constexpr MessageTypes only(AudioEventType type) { return MessageTypes(bitOf(type)); }

  friend constexpr MessageTypes operator|(MessageTypes a, MessageTypes b) {
    return MessageTypes(a.bits_ | b.bits_);
  }

  constexpr bool contains(AudioEventType type) const { return (bits_ & bitOf(type)) != 0; }

 private:
  explicit constexpr MessageTypes(std::uint64_t bits) : bits_(bits) {}
  static constexpr std::uint64_t bitOf(AudioEventType type) {
    return std::uint64_t{1} << (type < 63 ? type : 63);
  }

  std::uint64_t bits_;
};

// Describes a worker class for the registry. Each class has one object of this type, whose address
// identifies it.
struct TWReportingSessionWorkerClass {
  using Worker = std::shared_ptr<TWReportingSessionWorkerProtocol>;

  std::string_view name;
  bool isProducer;
  bool isConsumer;
  bool startOnInit;
  bool handleSingleMessageSession;
  // Makes a worker; returns null when the worker does not apply to the session. A null pointer for a class
  // whose workers cannot be made.
  // It must neither start the session nor look at its workers, of which it may be one of several being made.
  Worker (*initWithSession)(const std::shared_ptr<TWReportingSession>& session);
  // The types of messages with which a consumer of this class does something.
  MessageTypes handledTypes = MessageTypes::all();
  // The types of messages for which a consumer of this class may wait, for a time or a tool.
  MessageTypes slowTypes = MessageTypes::none();
  // Whether its workers report on the device as it is while the session runs, or to others outside of it.
  // Sessions that are played from the journal have none of them.
  bool isForLiveSessions = false;

  std::string description() const { return std::string(name); }
};

namespace worker_class_detail {

template <typename T>
constexpr bool startsOnInit() {
  if constexpr (requires { T::startOnInit(); }) return T::startOnInit();
  return false;
}

template <typename T>
constexpr bool handlesSingleMessageSession() {
  if constexpr (requires { T::handleSingleMessageSession(); }) return T::handleSingleMessageSession();
  return false;
}

template <typename T>
constexpr MessageTypes handledTypes() {
  if constexpr (requires { T::kHandledTypes; }) return T::kHandledTypes;
  return MessageTypes::all();
}

template <typename T>
constexpr MessageTypes slowTypes() {
  if constexpr (requires { T::kSlowTypes; }) return T::kSlowTypes;
  return MessageTypes::none();
}

template <typename T>
constexpr bool isForLiveSessions() {
  if constexpr (requires { T::kIsForLiveSessions; }) return T::kIsForLiveSessions;
  return false;
}

using Session = std::shared_ptr<TWReportingSession>;

template <typename T>
TWReportingSessionWorkerClass::Worker make(const Session& session) {
  if constexpr (requires { T::initWithSession(session); }) {
    return T::initWithSession(session);
  } else {
    return std::make_shared<T>(session);
  }
}

template <typename T>
constexpr auto maker() -> TWReportingSessionWorkerClass::Worker (*)(const Session&) {
  if constexpr (requires(const Session& session) { T::initWithSession(session); } ||
                std::constructible_from<T, const Session&>) {
    return &make<T>;
  } else {
    return nullptr;
  }
}

}  // namespace worker_class_detail

// Returns the description of class T. The base classes of T say whether it is a producer or a consumer; its
// static functions say the rest. Workers are made by its static initWithSession(session), which may return
// null, or else by its constructor.
template <typename T>
constexpr TWReportingSessionWorkerClass workerClassOf(std::string_view name) {
  return {name,
          std::is_base_of_v<TWReportingSessionWorkerProducerProtocol, T>,
          std::is_base_of_v<TWReportingSessionWorkerConsumerProtocol, T>,
          worker_class_detail::startsOnInit<T>(),
          worker_class_detail::handlesSingleMessageSession<T>(),
          worker_class_detail::maker<T>(),
          worker_class_detail::handledTypes<T>(),
          worker_class_detail::slowTypes<T>(),
          worker_class_detail::isForLiveSessions<T>()};
}

}  // namespace tonewerk
