// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <tuple>
#include <vector>

namespace tonewerk {

// One event: a program has passed a signpost.
struct SignpostEvent {
  bool isBegin = false;
  std::string_view name;
  std::uint64_t identifier = 0;
  std::int64_t process = 0;
  std::int64_t thread = 0;
  std::int64_t nanoseconds = 0;  // since 1970, by the tracer's clock
};

// Makes intervals from begins and ends with the same name, identifier, process and thread. An end belongs to
// the newest begin that has no end yet. Events without a partner are left out.
class SignpostPairs {
 public:
  static constexpr std::size_t kMaxOpen = 1'000'000;

  struct Interval {
    std::size_t name;           // index into names()
    std::uint64_t nanoseconds;  // how long it lasted
    std::int64_t end;           // since 1970
  };

  // Events must be added in the order of time. False if kMaxOpen begins have no end yet; the event is not
  // added then.
  [[nodiscard]] bool add(const SignpostEvent& event);

  // All names, in the order in which they first occurred.
  const std::vector<std::string>& names() const { return names_; }
  // The intervals, in the order of their ends.
  const std::vector<Interval>& intervals() const { return intervals_; }

 private:
  using Key = std::tuple<std::size_t, std::uint64_t, std::int64_t, std::int64_t>;

  std::size_t indexOf(std::string_view name);
  void close(std::vector<std::int64_t>& begins, const SignpostEvent& event, std::size_t name);

  std::map<std::string, std::size_t, std::less<>> indices_;
  std::vector<std::string> names_;
  std::map<Key, std::vector<std::int64_t>> open_;
  std::size_t openCount_ = 0;
  std::vector<Interval> intervals_;
};

}  // namespace tonewerk
