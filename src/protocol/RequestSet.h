// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

enum class ParameterType { kInt64, kUInt32, kUInt16, kMap, kInt64ListOrNone };

struct Parameter {
  std::string_view name;
  ParameterType type;
};

// kAny is for objects that answer with whatever they like, kNever for requests that are not answered.
enum class ResultType { kNone, kBoolean, kUInt16, kMap, kInt64List, kAny, kNever };

// What a request is answered with. Not every transport needs to know, and none checks it.
struct Result {
  ResultType type = ResultType::kNone;
  std::string_view name;
};

// One request that an exported object understands.
struct Method {
  std::string_view name;
  std::vector<Parameter> parameters;
  Result result = {};
  // What an answer may come to. It counts against the connection's bound from the request on, since an answer
  // is only measured when it is too late to refuse it.
  std::size_t replyBytes = 0;
  // Only for the user the daemon runs as, and root: what shows more of other clients than their identifiers.
  // Front ends that do not know their peers' users leave such methods out.
  bool forOwner = false;
};

// The request set of an exported object. A request names its method by the place in `methods`.
struct RequestSet {
  std::vector<Method> methods;

  std::optional<std::size_t> find(std::string_view name) const;
};

// What a request brought for one parameter; none when it brought nothing where that is allowed.
using Argument = std::optional<Value>;
using Arguments = std::vector<Argument>;

// What is wrong with `arguments` for `method` in words that name the argument, or none. An object gets only
// requests with which nothing is wrong.
std::optional<std::string> problemWith(const Method& method, const Arguments& arguments);

// An error answer.
struct ReplyError {
  std::string domain;
  std::int64_t code = 0;
  std::string message;  // empty when domain and code say it all

  friend bool operator==(const ReplyError&, const ReplyError&) = default;
};

// The errors of the messaging layer itself.
inline constexpr std::string_view kMessagingErrorDomain = "com.orvane.tonewerk.messaging";
inline constexpr std::int64_t kUnknownMethod = 1;
inline constexpr std::int64_t kInvalidArguments = 2;
inline constexpr std::int64_t kOverLimit = 3;
inline constexpr std::int64_t kNotPermitted = 4;

ReplyError messagingError(std::int64_t code, std::string message);

// A user that nobody is: that of a peer of whom the kernel says nothing.
inline constexpr std::uint32_t kNoUser = 0xFFFF'FFFF;

// Why a peer of that user may not call `method` in a daemon that runs as `owner`, or none.
std::optional<ReplyError> problemWithCaller(const Method& method, std::uint32_t user, std::uint32_t owner);

// Takes answers. Any thread.
class ReplySink {
 public:
  virtual ~ReplySink() = default;
  // `result` none is nil. With an error there is no result.
  virtual void reply(std::uint32_t requestIdentifier, const std::optional<ReplyError>& error,
                     const std::optional<Value>& result) = 0;
};

// The way back to whoever sent a request. Copyable; may be called never, once or several times, on any
// thread, also when the peer is gone. An empty one swallows its answer: a notification's.
class Reply {
 public:
  Reply() = default;
  Reply(std::shared_ptr<ReplySink> sink, std::uint32_t requestIdentifier)
      : sink_(std::move(sink)), requestIdentifier_(requestIdentifier) {}

  void operator()(const std::optional<ReplyError>& error,
                  const std::optional<Value>& result = std::nullopt) const {
    if (sink_ != nullptr) sink_->reply(requestIdentifier_, error, result);
  }

 private:
  std::shared_ptr<ReplySink> sink_;
  std::uint32_t requestIdentifier_ = 0;
};

// Counts the requests of one connection that are not finished. Any thread.
class InFlightCounter {
 public:
  virtual ~InFlightCounter() = default;
  virtual void finished(std::size_t bytes) = 0;
};

// Says, by its destruction, that a request's body has run. Whoever carries the body to a queue carries this
// with it.
class InFlightToken {
 public:
  InFlightToken() = default;
  InFlightToken(std::shared_ptr<InFlightCounter> gauge, std::size_t bytes)
      : gauge_(std::move(gauge)), bytes_(bytes) {}
  InFlightToken(InFlightToken&&) noexcept = default;
  InFlightToken& operator=(InFlightToken&& other) noexcept {
    finish();
    gauge_ = std::move(other.gauge_);
    bytes_ = other.bytes_;
    return *this;
  }
  ~InFlightToken() { finish(); }

 private:
  void finish() {
    if (gauge_ != nullptr) gauge_->finished(bytes_);
    gauge_ = nullptr;
  }

  std::shared_ptr<InFlightCounter> gauge_;
  std::size_t bytes_ = 0;
};

// What a connection's requests are made to.
class RequestHandler {
 public:
  virtual ~RequestHandler() = default;

  // On the messaging thread, in the order of arrival; must not block. `arguments` suit the method.
  virtual void handleRequest(std::size_t method, Arguments arguments, Reply reply, InFlightToken token) = 0;
};

}  // namespace tonewerk
