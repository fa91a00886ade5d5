// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/CurlLibrary.h"

#include <cerrno>
#include <dlfcn.h>
#include <gmock/gmock.h>
#include <string>
#include <sys/syscall.h>

#include "platform/linux/otlp/LinkReportBackends.h"
#include "support/InterceptedCalls.h"

namespace tonewerk {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

TEST(CurlLibraryTest, StaysWhereItIsOnceItIsLoaded) {
  std::string problem;
  const CurlLibrary* const library = CurlLibrary::get(problem);
  ASSERT_NE(library, nullptr) << problem;
  EXPECT_EQ(CurlLibrary::get(problem), library);
  EXPECT_EQ(problem, "");
}

TEST(CurlLibraryTest, AFileThatIsMissingIsTheProblem) {
  std::string problem;
  EXPECT_FALSE(CurlLibrary::load("libmissing.so.0", problem).has_value());
  EXPECT_THAT(problem, HasSubstr("libmissing.so.0"));
}

TEST(CurlLibraryTest, AFunctionThatIsMissingIsTheProblem) {
  std::string problem;
  EXPECT_FALSE(CurlLibrary::load("libz.so.1", problem).has_value());
  EXPECT_EQ(problem, "libz.so.1 has no curl_global_init");
}

TEST(CurlLibraryTest, AnAddressIsCheckedAsSoonAsTheLibraryCanBeLoaded) {
  if (::dlopen("libcurl.so.4", RTLD_NOW | RTLD_NOLOAD) != nullptr)
    GTEST_SKIP() << "libcurl is loaded already";
  const Value preference(ValueArray({"http://collector:4318"}));
  const auto failForLibrary = [](const seccomp_data& call) {
    const std::string path = reinterpret_cast<const char*>(call.args[1]);
    return path.find("libcurl") == std::string::npos ? 0 : EMFILE;
  };
  LinkReportBackends before;
  const bool isTried =
      runIntercepted(SYS_openat, failForLibrary, [&] { before = LinkReportBackends::from(preference); });
  if (!isTried) GTEST_SKIP() << "system calls cannot be intercepted here";
  EXPECT_THAT(before.endpoints, IsEmpty());
  EXPECT_THAT(before.problems,
              ElementsAre(HasSubstr("\"http://collector:4318\" cannot be checked: libcurl.so.4: ")));
  const LinkReportBackends after = LinkReportBackends::from(preference);
  EXPECT_THAT(after.endpoints, SizeIs(1));
  EXPECT_THAT(after.problems, IsEmpty());
}

}  // namespace
}  // namespace tonewerk
