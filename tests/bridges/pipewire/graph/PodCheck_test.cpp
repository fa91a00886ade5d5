// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/PodCheck.h"

#include <array>
#include <cstdint>
#include <gtest/gtest.h>
#include <spa/pod/builder.h>
#include <vector>

namespace tonewerk {
namespace {

// Builds one pod in a buffer of its own.
class PodCheckTest : public testing::Test {
 protected:
  PodCheckTest() { spa_pod_builder_init(&builder_, bytes_.data(), kRoom); }

  const spa_pod& pod() const { return *reinterpret_cast<const spa_pod*>(bytes_.data()); }

  static constexpr std::uint32_t kRoom = 4096;
  alignas(8) std::array<std::uint8_t, kRoom> bytes_{};
  spa_pod_builder builder_{};
};

TEST_F(PodCheckTest, AcceptsObjectsWithArraysAndChoicesInAStruct) {
  spa_pod_frame outer{};
  spa_pod_frame object{};
  spa_pod_frame choice{};
  const std::array<float, 3> volumes{};
  spa_pod_builder_push_struct(&builder_, &outer);
  spa_pod_builder_push_object(&builder_, &object, SPA_TYPE_OBJECT_Props, 0);
  spa_pod_builder_prop(&builder_, 1, 0);
  spa_pod_builder_array(&builder_, sizeof(float), SPA_TYPE_Float, volumes.size(), volumes.data());
  spa_pod_builder_prop(&builder_, 2, 0);
  spa_pod_builder_push_choice(&builder_, &choice, SPA_CHOICE_None, 0);
  spa_pod_builder_int(&builder_, 5);
  spa_pod_builder_pop(&builder_, &choice);
  spa_pod_builder_prop(&builder_, 3, 0);
  spa_pod_builder_string(&builder_, "text");
  spa_pod_builder_pop(&builder_, &object);
  spa_pod_builder_pop(&builder_, &outer);
  EXPECT_TRUE(isWellFormed(pod()));
}

TEST_F(PodCheckTest, AcceptsEmptyArraysStructsAndObjects) {
  spa_pod_frame outer{};
  spa_pod_frame inner{};
  spa_pod_builder_push_struct(&builder_, &outer);
  spa_pod_builder_array(&builder_, sizeof(float), SPA_TYPE_Float, 0, nullptr);
  spa_pod_builder_push_struct(&builder_, &inner);
  spa_pod_builder_pop(&builder_, &inner);
  spa_pod_builder_push_object(&builder_, &inner, SPA_TYPE_OBJECT_Props, 0);
  spa_pod_builder_pop(&builder_, &inner);
  spa_pod_builder_pop(&builder_, &outer);
  EXPECT_TRUE(isWellFormed(pod()));
}

TEST_F(PodCheckTest, RefusesElementsThatAreLargerThanTheirType) {
  const std::array<std::uint8_t, 3000> values{};
  spa_pod_builder_array(&builder_, 1000, SPA_TYPE_Float, 3, values.data());
  EXPECT_FALSE(isWellFormed(pod()));
}

TEST_F(PodCheckTest, RefusesAChoiceWithoutAValue) {
  const spa_pod_choice choice{{sizeof(spa_pod_choice_body), SPA_TYPE_Choice},
                              {SPA_CHOICE_None, 0, {sizeof(std::int32_t), SPA_TYPE_Int}}};
  spa_pod_builder_primitive(&builder_, &choice.pod);
  EXPECT_FALSE(isWellFormed(pod()));
}

TEST_F(PodCheckTest, RefusesBodiesThatAreShorterThanTheirTypes) {
  for (const std::uint32_t type :
       {SPA_TYPE_Int, SPA_TYPE_Long, SPA_TYPE_Array, SPA_TYPE_Choice, SPA_TYPE_Object}) {
    const spa_pod empty{0, type};
    EXPECT_FALSE(isWellFormed(empty)) << type;
  }
}

TEST_F(PodCheckTest, RefusesPodsThatNestTooDeep) {
  std::vector<spa_pod_frame> open(40);
  for (spa_pod_frame& frame : open) spa_pod_builder_push_struct(&builder_, &frame);
  for (auto frame = open.rbegin(); frame != open.rend(); ++frame) spa_pod_builder_pop(&builder_, &*frame);
  EXPECT_FALSE(isWellFormed(pod()));
}

}  // namespace
}  // namespace tonewerk
