// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// Something that `twctl doctor` can find. The page on troubles has a row for each.
struct FindingKind {
  std::string_view name;    // for programs and for the page; does not change
  std::string_view cause;   // what is wrong
  std::string_view why;     // why it matters
  std::string_view remedy;  // what to type or to set, in general
};

// All of them, in the order in which they are looked for.
const std::vector<FindingKind>& findingKinds();

// Something that was found.
struct Finding {
  const FindingKind* kind;
  std::string what;    // what is wrong, with names, paths and values
  std::string remedy;  // the remedy here
};

// Collects what the checks find, and what they could not see.
class Findings {
 public:
  // `name` must be that of a kind. Without `remedy` the kind's own holds.
  void add(std::string_view name, std::string what, std::string remedy = {});
  // Says what the caller may not look at. The same is said once.
  void couldNotSee(std::string what);

  const std::vector<Finding>& all() const { return all_; }
  const std::vector<std::string>& unseen() const { return unseen_; }

 private:
  std::vector<Finding> all_;
  std::vector<std::string> unseen_;
};

}  // namespace tonewerk
