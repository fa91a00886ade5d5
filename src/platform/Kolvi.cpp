// SPDX-License-Identifier: Apache-2.0
#include "platform/Kolvi.h"

#include <string_view>
#include <utility>

namespace tonewerk {
namespace {

constexpr std::string_view kName = "name";
constexpr std::string_view kType = "type";
constexpr std::string_view kIntervalType = "interval";
constexpr std::string_view kSignpost = "signpost";
constexpr std::string_view kChildren = "children";

const ValueArray* childrenOf(const ValueMap& dictionary) {
  const Value* children = dictionary.find(kChildren);
  return children == nullptr ? nullptr : children->asArray();
}

// Returns null when `element` is not a probe.
const ValueMap* probeDictionary(const Value& element) {
  const ValueMap* dictionary = element.asMap();
  return dictionary != nullptr && dictionary->find(kName) != nullptr ? dictionary : nullptr;
}

bool isInterval(const ValueMap& dictionary) { return dictionary.text(kType) == kIntervalType; }

std::string signpostOf(const ValueMap& dictionary) {
  return std::string(dictionary.text(dictionary.find(kSignpost) == nullptr ? kName : kSignpost));
}

void collectSignposts(const ValueArray& dictionaries, std::set<std::string>& signposts) {
  for (const Value& element : dictionaries) {
    const ValueMap* dictionary = probeDictionary(element);
    if (dictionary == nullptr) continue;
    if (isInterval(*dictionary)) signposts.insert(signpostOf(*dictionary));
    if (const ValueArray* children = childrenOf(*dictionary)) collectSignposts(*children, signposts);
  }
}

}  // namespace

std::optional<ValueArray> probeDictionariesOf(const Value& root) {
  if (const ValueArray* list = root.asArray()) return *list;
  if (root.asMap() != nullptr) return ValueArray{root};
  return std::nullopt;
}

std::set<std::string> signpostsOf(const ValueArray& dictionaries) {
  std::set<std::string> signposts;
  collectSignposts(dictionaries, signposts);
  return signposts;
}

std::vector<KolviProbe> makeKolviProbes(
    const ValueArray& dictionaries,
    const std::function<std::vector<KolviEvent>(const std::string& signpost)>& eventsOf) {
  std::vector<KolviProbe> probes;
  for (const Value& element : dictionaries) {
    const ValueMap* dictionary = probeDictionary(element);
    if (dictionary == nullptr) continue;
    KolviProbe probe;
    probe.name = dictionary->text(kName);
    if (const ValueArray* children = childrenOf(*dictionary)) {
      probe.children = makeKolviProbes(*children, eventsOf);
    }
    probe.isIntervalProbe = isInterval(*dictionary);
    if (probe.isIntervalProbe) probe.events = eventsOf(signpostOf(*dictionary));
    probes.push_back(std::move(probe));
  }
  return probes;
}

}  // namespace tonewerk
