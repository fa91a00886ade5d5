// SPDX-License-Identifier: Apache-2.0
//
// Compares the schema of the preferences with the adapters that read them.
#include "platform/PreferenceSchema.h"

#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "platform/linux/diagnostics/DiagnosticsStore.h"
#include "platform/linux/diagnostics/LinuxCapsa.h"
#include "platform/linux/otlp/LinkReportBackends.h"
#include "platform/linux/otlp/LinuxLinkReport.h"
#include "platform/linux/store/AnalyticsConsumers.h"
#include "platform/linux/store/ReportStore.h"
#include "platform/linux/store/StoreMetricon.h"
#include "platform/linux/store/StoreTrimmer.h"

namespace tonewerk {
namespace {

TEST(AdaptersPreferencesTest, AreInTheSchema) {
  EXPECT_NE(findPreference(StoreMetricon::kPreferenceDomain, StoreMetricon::kConsumersKey), nullptr);
  EXPECT_NE(findPreference(LinuxLinkReport::kPreferenceDomain, LinuxLinkReport::kBackendsKey), nullptr);
  EXPECT_NE(findPreference(LinuxLinkReport::kPreferenceDomain, LinuxLinkReport::kDeviceIdentifierKey),
            nullptr);
  EXPECT_NE(findPreference(LinuxLinkReport::kPreferenceDomain, LinuxLinkReport::kEventNameAttributeKey),
            nullptr);
  EXPECT_NE(findPreference(DiagnosticsStore::kPreferenceDomain, DiagnosticsStore::kMaxMegabytesKey), nullptr);
  EXPECT_NE(findPreference(DiagnosticsStore::kPreferenceDomain, DiagnosticsStore::kMaxItemsKey), nullptr);
  const Preference* accepted = findPreference(LinuxCapsa::kPreferenceDomain, LinuxCapsa::kAcceptedKey);
  ASSERT_NE(accepted, nullptr);
  EXPECT_EQ(accepted->keeper, PreferenceKeeper::kDaemon);
}

TEST(AdaptersPreferencesTest, TheStoresBoundsAreTheSchemasDefaults) {
  const Preference* bytes = findPreference(ReportStore::kPreferenceDomain, ReportStore::kMaxMegabytesKey);
  const Preference* age = findPreference(ReportStore::kPreferenceDomain, ReportStore::kMaxDaysKey);
  ASSERT_TRUE(bytes != nullptr && age != nullptr);
  EXPECT_EQ(bytes->fallback->integer() << 20, StoreBounds().bytes);
  EXPECT_EQ(age->fallback->number() * 86'400, StoreBounds().seconds);
}

// Reading without the preference gives the same as reading its default.
TEST(AdaptersPreferencesTest, TheDefaultListsAreTheSchemas) {
  const Value backends = *findPreference("com.orvane.linkreport", "backends")->fallback;
  EXPECT_EQ(LinkReportBackends::from(backends).names(), LinkReportBackends::from(std::nullopt).names());
  const Value consumers = *findPreference("com.orvane.metricon", "consumers")->fallback;
  std::vector<std::string> problems;
  const AnalyticsConsumers configured(consumers, problems);
  const AnalyticsConsumers unconfigured(std::nullopt, problems);
  EXPECT_TRUE(problems.empty());
  for (const char* name : {"com.orvane.a", "com.orvan", "org.example.a"}) {
    EXPECT_EQ(configured.wants(name), unconfigured.wants(name)) << name;
  }
}

}  // namespace
}  // namespace tonewerk
