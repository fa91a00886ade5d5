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

// The parameters of one request, in order. A request has no more than kMaxParameters.
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

// kAny is for handlers that answer with whatever they like, kNever for requests that are not answered.
enum class ResultType { kNone, kBoolean, kUInt16, kMap, kInt64List, kAny, kNever };

// What a request is answered with. Not every transport needs to know, and none checks it.
struct Result {
  ResultType type = ResultType::kNone;
  std::string_view name;
};

// One request that a handler understands.
struct Method {
  std::string_view name;
  ParameterList parameters = {};
  Result result = {};
  // What an answer may come to. It counts against the connection's bound from the request on, since an answer
  // is only measured when it is too late to refuse it.
  std::size_t replyBytes = 0;
  // Only for the user the daemon runs as, and root: what shows more of other clients than their identifiers.
  // Front ends that do not know their peers' users leave such methods out.
  bool forOwner = false;
  // Whether it changes sessions or the daemon, rather than asks about them. A connection that only observes
  // may not make such a request.
  bool changesState = false;
};

// The requests that a handler understands. A request names its method by the place in `methods`.
struct RequestSet {
  std::vector<Method> methods;

  [[nodiscard]] std::optional<std::size_t> find(std::string_view name) const;
};

// What a request brought for one parameter; none when it brought nothing where that is allowed.
using Argument = std::optional<Value>;
using Arguments = std::vector<Argument>;

// What is wrong with `arguments` for `method` in words that name the argument, or none. A handler gets only
// requests with which nothing is wrong.
[[nodiscard]] std::optional<std::string> problemWith(const Method& method, const Arguments& arguments);

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
[[nodiscard]] std::optional<ReplyError> problemWithCaller(const Method& method, std::uint32_t user,
                                                          std::uint32_t owner);

}  // namespace tonewerk
