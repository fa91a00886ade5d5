// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <concepts>
#include <memory>
#include <type_traits>
#include <utility>

namespace tonewerk {

template <typename Signature>
class UniqueFunction;

// Holds a callable that can be moved but not copied, so that the callable may own what it works on (a
// payload, a reply, a token whose destruction has an effect). It is empty when made without a callable or
// moved from; calling an empty one is an error.
template <typename Result, typename... Arguments>
class UniqueFunction<Result(Arguments...)> {
 public:
  UniqueFunction() = default;
  UniqueFunction(std::nullptr_t) {}
  template <typename Callable>
  requires(!std::same_as<std::remove_cvref_t<Callable>, UniqueFunction> &&
           std::is_invocable_r_v<Result, std::remove_cvref_t<Callable>&, Arguments...>)
      UniqueFunction(Callable&& callable)
      : held_(std::make_unique<Holder<std::remove_cvref_t<Callable>>>(std::forward<Callable>(callable))) {}

  explicit operator bool() const { return held_ != nullptr; }
  Result operator()(Arguments... arguments) const {
    return held_->call(std::forward<Arguments>(arguments)...);
  }

 private:
  struct Base {
    virtual ~Base() = default;
    virtual Result call(Arguments... arguments) = 0;
  };
  template <typename Callable>
  struct Holder final : Base {
    explicit Holder(Callable&& c) : callable(std::move(c)) {}
    explicit Holder(const Callable& c) : callable(c) {}
    Result call(Arguments... arguments) override { return callable(std::forward<Arguments>(arguments)...); }
    Callable callable;
  };

  std::unique_ptr<Base> held_;
};

// A piece of work that a queue or a thread runs.
using Task = UniqueFunction<void()>;

}  // namespace tonewerk
