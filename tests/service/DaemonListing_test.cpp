// SPDX-License-Identifier: Apache-2.0
#include "service/DaemonListing.h"

#include <chrono>
#include <gtest/gtest.h>

#include "platform/DaemonStatus.h"

namespace tonewerk {
namespace {

TEST(DaemonListingTest, SaysWhatTheDaemonIs) {
  DaemonStatus status;
  status.version = "1.0";
  status.processIdentifier = 42;
  status.user = 990;
  status.startedAt = 5.5;
  status.startedAtSteady = std::chrono::steady_clock::now() - std::chrono::hours(1);
  status.stateDirectory = "/state";
  const ValueMap listing = daemonListing(status, true);
  EXPECT_EQ(listing.text("version"), "1.0");
  EXPECT_EQ(listing.integer("processIdentifier"), 42);
  EXPECT_EQ(listing.integer("user"), 990);
  EXPECT_EQ(listing.number("startedAt"), 5.5);
  EXPECT_GE(listing.number("seconds"), 3600.0);
  EXPECT_TRUE(listing.boolean("internalBuild"));
  EXPECT_EQ(listing.text("state"), "/state");
}

TEST(DaemonListingTest, ListsEndpointsAndTroublesAsTheyAreNow) {
  DaemonStatus status;
  EXPECT_TRUE(endpointListing(status).empty());
  EXPECT_TRUE(troubleListing(status).empty());
  status.endpoints = [] {
    return std::vector<EndpointStatus>{
        {"http://a.example", 1, 2, std::chrono::seconds(3), "HTTP status 503"}};
  };
  status.troubles = [] {
    return std::vector<LoggedTrouble>{{5.0, "twrs", "own", 2, std::nullopt},
                                      {4.0, "twrr", "theirs", 1, 1000}};
  };
  EXPECT_EQ(Value(endpointListing(status)).text(),
            R"([{"name":"http://a.example","waiting":1,"dropped":2,"hangs":3,"problem":"HTTP status 503"}])");
  EXPECT_EQ(Value(troubleListing(status)).text(),
            R"([{"time":5.0,"category":"twrs","text":"own","times":2},)"
            R"({"time":4.0,"category":"twrr","text":"theirs","times":1,"user":1000}])");
}

}  // namespace
}  // namespace tonewerk
