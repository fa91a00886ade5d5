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

// A signpost that a program passed.
struct SignpostEvent {
  bool isBegin = false;
  std::string_view name;
  std::uint64_t identifier = 0;
  std::int64_t process = 0;
  std::int64_t thread = 0;
  std::int64_t nanoseconds = 0;  // since some fixed point
};

// Makes intervals of begins and ends of one name, identifier, process and thread: an end belongs to the
// newest begin that is open. What has no partner is left out.
class SignpostPairs {
 public:
  static constexpr std::size_t kMaxOpen = 1'000'000;

  struct Interval {
    std::size_t name;  // index into names()
    std::uint64_t nanoseconds;
  };

  // In the order of time. False when more than kMaxOpen are open: then this is full, and takes no more.
  [[nodiscard]] bool add(const SignpostEvent& event);

  // All the names seen, in the order of their first sight.
  const std::vector<std::string>& names() const { return names_; }
  // In the order of their ends.
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
