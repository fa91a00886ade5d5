// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "values/Value.h"

namespace tonewerk {

enum class ParameterType { kInt64, kUInt32, kUInt16, kMap, kInt64ListOrNone };

struct Parameter {
  std::string_view name;
  ParameterType type = ParameterType::kInt64;
};

// Lists the parameters of one request in order, at most kMaxParameters.
class ParameterList {
 public:
  static constexpr std::size_t kMaxParameters = 4;

  constexpr ParameterList() = default;
  constexpr ParameterList(std::initializer_list<Parameter> parameters) {
    for (const Parameter& parameter : parameters) parameters_.at(size_++) = parameter;
  }

  constexpr std::size_t size() const { return size_; }
  constexpr bool empty() const { return size_ == 0; }
  constexpr const Parameter& operator[](std::size_t at) const { return parameters_[at]; }
  constexpr const Parameter* begin() const { return parameters_.data(); }
  constexpr const Parameter* end() const { return parameters_.data() + size_; }

 private:
  std::array<Parameter, kMaxParameters> parameters_{};
  std::size_t size_ = 0;
};

// kAny: the handler may answer with any value. kNever: the request is never answered.
enum class ResultType { kNone, kBoolean, kUInt16, kMap, kInt64List, kAny, kNever };

// Describes the answer to a request. Some transports need no description; none checks an answer against it.
struct Result {
  ResultType type = ResultType::kNone;
  std::string_view name;
};

// Describes one request that a handler understands.
struct Method {
  std::string_view name;
  ParameterList parameters = {};
  Result result = {};
  // The most bytes that an answer may have. They count against the connection's limit as soon as the request
  // arrives, because a finished answer can no longer be refused.
  std::size_t replyBytes = 0;
  // Only trusted users may call it: it reaches what belongs to other users. Trusted are root, the user that
  // the daemon runs as, and those whom the device maker names.
  bool forTrusted = false;
  // Whether the method changes sessions or the daemon instead of only reading. A connection that only
  // observes may not call it.
  bool changesState = false;
  // Whether the parameters are those of IncomingMessage, in its order. Transports may then take a shorter
  // way, because messages come far more often than all other requests.
  bool carriesMessage = false;
  // Front ends other than the socket leave it out.
  bool isForSocketOnly = false;
};

// Lists the requests that a handler understands. A request names its method by the index in `methods`.
struct RequestSet {
  std::vector<Method> methods;

  [[nodiscard]] std::optional<std::size_t> find(std::string_view name) const;
};

// The argument for one parameter; none for nil, where the parameter allows it.
using Argument = std::optional<Value>;
using Arguments = std::vector<Argument>;

// Returns what is wrong with `arguments` for `method`, in words that name the argument; none when nothing is
// wrong. Only requests without a problem reach a handler.
[[nodiscard]] std::optional<std::string> problemWith(const Method& method, const Arguments& arguments);

// An answer that reports an error.
struct ReplyError {
  std::string domain;
  std::int64_t code = 0;
  std::string message;  // empty when domain and code are enough

  friend bool operator==(const ReplyError&, const ReplyError&) = default;
};

// The errors of the messaging layer itself.
inline constexpr std::string_view kMessagingErrorDomain = "com.orvane.tonewerk.messaging";
inline constexpr std::int64_t kUnknownMethod = 1;
inline constexpr std::int64_t kInvalidArguments = 2;
inline constexpr std::int64_t kOverLimit = 3;
inline constexpr std::int64_t kNotPermitted = 4;

ReplyError messagingError(std::int64_t code, std::string message);

// No user has this identifier. It stands for the user of a peer about which the kernel says nothing.
inline constexpr std::uint32_t kNoUser = 0xFFFF'FFFF;

// Returns why a peer may not call `method`; none when it may.
[[nodiscard]] std::optional<ReplyError> problemWithCaller(const Method& method, bool isTrusted);

}  // namespace tonewerk
