// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <concepts>
#include <memory>
#include <type_traits>
#include <utility>

namespace tonewerk {

template <typename Signature>
class FunctionRef;

// Refers to a callable that outlives it: for a parameter that is called during the call. Allocates nothing.
template <typename Result, typename... Arguments>
class FunctionRef<Result(Arguments...)> {
 public:
  template <typename Callable>
  requires(!std::same_as<std::remove_cvref_t<Callable>, FunctionRef> &&
           std::is_invocable_r_v<Result, const std::remove_reference_t<Callable>&, Arguments...>)
      FunctionRef(const Callable& callable)
      : callable_(std::addressof(callable)), call_([](const void* held, Arguments... arguments) -> Result {
          return (*static_cast<const Callable*>(held))(std::forward<Arguments>(arguments)...);
        }) {}

  Result operator()(Arguments... arguments) const {
    return call_(callable_, std::forward<Arguments>(arguments)...);
  }

 private:
  const void* callable_;
  Result (*call_)(const void* callable, Arguments... arguments);
};

}  // namespace tonewerk
