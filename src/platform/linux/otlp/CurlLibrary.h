// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <curl/curl.h>
#include <optional>
#include <string>

namespace tonewerk {

// The functions of libcurl that the adapter uses. The library is loaded when it is first needed. With the 27
// libraries that only it uses, it would be a third of the memory of an idle daemon.
struct CurlLibrary {
  decltype(&curl_multi_init) multiInit;
  decltype(&curl_multi_cleanup) multiCleanup;
  decltype(&curl_multi_add_handle) multiAddHandle;
  decltype(&curl_multi_remove_handle) multiRemoveHandle;
  decltype(&curl_multi_perform) multiPerform;
  decltype(&curl_multi_info_read) multiInfoRead;
  decltype(&curl_multi_poll) multiPoll;
  decltype(&curl_multi_wakeup) multiWakeup;
  decltype(&curl_easy_init) easyInit;
  decltype(&curl_easy_cleanup) easyCleanup;
  decltype(&curl_easy_reset) easyReset;
  decltype(&curl_easy_setopt) easySetopt;
  decltype(&curl_easy_getinfo) easyGetinfo;
  decltype(&curl_easy_strerror) easyStrerror;
  decltype(&curl_slist_append) slistAppend;
  decltype(&curl_slist_free_all) slistFreeAll;
  decltype(&curl_url) url;
  decltype(&curl_url_cleanup) urlCleanup;
  decltype(&curl_url_get) urlGet;
  decltype(&curl_url_set) urlSet;
  decltype(&curl_url_strerror) urlStrerror;
  decltype(&curl_free) free;

  // Loads and initialises the library, unless an earlier call did; it stays loaded. Where that is not
  // possible it returns null and sets `problem`, and the next call tries again. Any thread.
  [[nodiscard]] static const CurlLibrary* get(std::string& problem);

  // Loads and initialises the library `file`. One thread at a time; for get() and tests.
  [[nodiscard]] static std::optional<CurlLibrary> load(const char* file, std::string& problem);
};

}  // namespace tonewerk
