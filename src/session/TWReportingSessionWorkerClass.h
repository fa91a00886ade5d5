// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <concepts>
#include <memory>
#include <string>
#include <string_view>
#include <type_traits>

#include "session/TWReportingSessionWorkerConsumerProtocol.h"
#include "session/TWReportingSessionWorkerProducerProtocol.h"
#include "session/TWReportingSessionWorkerProtocol.h"

namespace tonewerk {

// A worker class as the registry knows it. There is one object a class, and it stands for the class.
struct TWReportingSessionWorkerClass {
  using Worker = std::shared_ptr<TWReportingSessionWorkerProtocol>;

  std::string_view name;
  bool isProducer;
  bool isConsumer;
  bool startOnInit;
  bool handleSingleMessageSession;
  // Null for a class whose instances cannot be made; gives null for a session to which the worker does not
  // apply.
  Worker (*initWithSession)(const std::shared_ptr<TWReportingSession>& session);

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

// The description of class T: its roles from what it derives from, its answers from its static functions, and
// how it is made from its static initWithSession(session), which may give null, or else its constructor.
template <typename T>
constexpr TWReportingSessionWorkerClass workerClassOf(std::string_view name) {
  return {name,
          std::is_base_of_v<TWReportingSessionWorkerProducerProtocol, T>,
          std::is_base_of_v<TWReportingSessionWorkerConsumerProtocol, T>,
          worker_class_detail::startsOnInit<T>(),
          worker_class_detail::handlesSingleMessageSession<T>(),
          worker_class_detail::maker<T>()};
}

}  // namespace tonewerk
