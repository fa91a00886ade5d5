// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/PodCheck.h"

#include <cstddef>
#include <cstdint>
#include <spa/pod/iter.h>

namespace tonewerk {

namespace {

// The pods that the bridge reads have at most four levels.
constexpr int kMaxDepth = 16;

// The size of a value of that type; 0 when it depends on the value.
std::size_t sizeOf(std::uint32_t type) {
  switch (type) {
    case SPA_TYPE_Bool:
    case SPA_TYPE_Id:
    case SPA_TYPE_Int:
    case SPA_TYPE_Float:
      return sizeof(std::int32_t);
    case SPA_TYPE_Long:
    case SPA_TYPE_Double:
    case SPA_TYPE_Rectangle:
    case SPA_TYPE_Fraction:
      return sizeof(std::int64_t);
    default:
      return 0;
  }
}

// Whether values of `child`'s type and size follow a head in a body of `size` bytes.
bool holdsValues(const spa_pod& child, std::size_t head, std::size_t size) {
  const std::size_t expected = sizeOf(child.type);
  return expected == 0 ? child.size <= size - head : child.size == expected;
}

bool isArray(const spa_pod& pod) {
  if (pod.size < sizeof(spa_pod_array_body)) return false;
  const auto& body = *static_cast<const spa_pod_array_body*>(SPA_POD_BODY_CONST(&pod));
  return holdsValues(body.child, sizeof(body), pod.size);
}

// A choice has at least one value, which readers take without looking at its type.
bool isChoice(const spa_pod& pod) {
  if (pod.size < sizeof(spa_pod_choice_body)) return false;
  const auto& body = *static_cast<const spa_pod_choice_body*>(SPA_POD_BODY_CONST(&pod));
  return holdsValues(body.child, sizeof(body), pod.size) && body.child.size <= pod.size - sizeof(body);
}

bool isWithin(const spa_pod& pod, int depth);

bool isStruct(const spa_pod& pod, int depth) {
  const void* body = SPA_POD_BODY_CONST(&pod);
  for (auto* part = static_cast<const spa_pod*>(body); spa_pod_is_inside(body, pod.size, part);
       part = static_cast<const spa_pod*>(spa_pod_next(part))) {
    if (!isWithin(*part, depth)) return false;
  }
  return true;
}

bool isObject(const spa_pod& pod, int depth) {
  if (pod.size < sizeof(spa_pod_object_body)) return false;
  const auto& body = *static_cast<const spa_pod_object_body*>(SPA_POD_BODY_CONST(&pod));
  for (const spa_pod_prop* part = spa_pod_prop_first(&body); spa_pod_prop_is_inside(&body, pod.size, part);
       part = spa_pod_prop_next(part)) {
    if (!isWithin(part->value, depth)) return false;
  }
  return true;
}

bool isWithin(const spa_pod& pod, int depth) {
  if (depth == kMaxDepth) return false;
  switch (pod.type) {
    case SPA_TYPE_Array:
      return isArray(pod);
    case SPA_TYPE_Choice:
      return isChoice(pod);
    case SPA_TYPE_Struct:
      return isStruct(pod, depth + 1);
    case SPA_TYPE_Object:
      return isObject(pod, depth + 1);
    default:
      return pod.size >= sizeOf(pod.type);
  }
}

}  // namespace

bool isWellFormed(const spa_pod& pod) { return isWithin(pod, 0); }

}  // namespace tonewerk
