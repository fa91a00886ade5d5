// SPDX-License-Identifier: Apache-2.0
#include "service/AccountListing.h"

#include <gmock/gmock.h>

#include "platform/accounts/Accounts.h"
#include "support/TestAccounts.h"

namespace tonewerk {
namespace {

class AccountListingTest : public testing::Test {
 protected:
  ValueMap listFor(std::uint32_t user) { return accountListing(accounts, *accounts->of(user)); }

  TestAccounts accounts{990};
};

TEST_F(AccountListingTest, AUserSeesItsOwnAccount) {
  accounts->of(1001)->charge(Resource::kKeptBytes, 5);
  accounts->of(1002)->charge(Resource::kKeptBytes, 6);
  const ValueMap listing = listFor(1002);
  EXPECT_EQ(listing.integer("total"), 1);
  const ValueMap expected{
      {"user", 1002},
      {"trusted", false},
      {"linesHeldBack", 0},
      {"resources", ValueArray{ValueMap{{"name", "keptBytes"},
                                        {"held", 6},
                                        {"share", (512 * static_cast<std::int64_t>(kMiB) - 5) / 2},
                                        {"refused", 0}}}}};
  EXPECT_EQ(listing.find("accounts")->text(), Value(ValueArray{expected}).text());
}

TEST_F(AccountListingTest, ATrustedUserSeesAllAndWhatTheyWereRefused) {
  (void)accounts->of(1001);
  accounts->of(1002)->countRefusal(Resource::kConnections);
  const ValueMap listing = listFor(0);
  EXPECT_EQ(listing.integer("total"), 4);  // root, the owner and these two
  const ValueArray& listed = *listing.find("accounts")->asArray();
  ASSERT_EQ(listed.size(), 4U);
  EXPECT_EQ(listed[0].asMap()->integer("user"), 0);
  EXPECT_TRUE(listed[1].asMap()->boolean("trusted"));
  EXPECT_TRUE(listed[2].asMap()->find("resources")->asArray()->empty());
  const ValueArray& refused = *listed[3].asMap()->find("resources")->asArray();
  ASSERT_EQ(refused.size(), 1U);
  EXPECT_EQ(refused[0].asMap()->integer("refused"), 1);
}

TEST_F(AccountListingTest, ALongListIsCut) {
  for (std::uint32_t user = 2000; user < 2600; ++user) (void)accounts->of(user);
  const ValueMap listing = listFor(0);
  EXPECT_EQ(listing.integer("total"), 602);
  EXPECT_EQ(listing.find("accounts")->asArray()->size(), kMaxListedAccounts);
}

}  // namespace
}  // namespace tonewerk
