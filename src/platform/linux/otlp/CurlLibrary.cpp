// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/CurlLibrary.h"

#include <dlfcn.h>
#include <optional>

namespace tonewerk {
namespace {

constexpr const char* kName = "libcurl.so.4";

// Finds functions in the library, and remembers whether all of them were there.
class Finder {
 public:
  explicit Finder(void* library) : library_(library) {}

  template <class Function>
  void find(Function& function, const char* name) {
    function = reinterpret_cast<Function>(::dlsym(library_, name));
    hasAll_ = hasAll_ && function != nullptr;
  }
  bool hasAll() const { return hasAll_; }

 private:
  void* library_;
  bool hasAll_ = true;
};

std::optional<CurlLibrary> load() {
  void* handle = ::dlopen(kName, RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
  if (handle == nullptr) return std::nullopt;
  CurlLibrary library{};
  decltype(&curl_global_init) globalInit = nullptr;
  Finder finder(handle);
  finder.find(globalInit, "curl_global_init");
  finder.find(library.multiInit, "curl_multi_init");
  finder.find(library.multiCleanup, "curl_multi_cleanup");
  finder.find(library.multiAddHandle, "curl_multi_add_handle");
  finder.find(library.multiRemoveHandle, "curl_multi_remove_handle");
  finder.find(library.multiPerform, "curl_multi_perform");
  finder.find(library.multiInfoRead, "curl_multi_info_read");
  finder.find(library.multiPoll, "curl_multi_poll");
  finder.find(library.multiWakeup, "curl_multi_wakeup");
  finder.find(library.easyInit, "curl_easy_init");
  finder.find(library.easyCleanup, "curl_easy_cleanup");
  finder.find(library.easyReset, "curl_easy_reset");
  finder.find(library.easySetopt, "curl_easy_setopt");
  finder.find(library.easyGetinfo, "curl_easy_getinfo");
  finder.find(library.easyStrerror, "curl_easy_strerror");
  finder.find(library.slistAppend, "curl_slist_append");
  finder.find(library.slistFreeAll, "curl_slist_free_all");
  finder.find(library.url, "curl_url");
  finder.find(library.urlCleanup, "curl_url_cleanup");
  finder.find(library.urlGet, "curl_url_get");
  finder.find(library.urlSet, "curl_url_set");
  finder.find(library.urlStrerror, "curl_url_strerror");
  finder.find(library.free, "curl_free");
  // The library must be initialised once in the process, before any other use.
  if (!finder.hasAll() || globalInit(CURL_GLOBAL_DEFAULT) != CURLE_OK) return std::nullopt;
  return library;
}

}  // namespace

const CurlLibrary* CurlLibrary::get() {
  static const std::optional<CurlLibrary> library = load();
  return library ? &*library : nullptr;
}

}  // namespace tonewerk
