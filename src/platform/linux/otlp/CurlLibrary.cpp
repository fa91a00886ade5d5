// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/CurlLibrary.h"

#include <dlfcn.h>

#include "values/Mutex.h"

namespace tonewerk {
namespace {

constexpr const char* kName = "libcurl.so.4";

// Finds functions in the library, and remembers the first one that was not there.
class Finder {
 public:
  explicit Finder(void* library) : library_(library) {}

  template <class Function>
  void find(Function& function, const char* name) {
    function = reinterpret_cast<Function>(::dlsym(library_, name));
    if (function == nullptr && missing_ == nullptr) missing_ = name;
  }
  // Null when all were there.
  const char* missing() const { return missing_; }

 private:
  void* library_;
  const char* missing_ = nullptr;
};

// The library, once it was loaded.
struct Loaded {
  Mutex mutex;
  std::optional<CurlLibrary> library GUARDED_BY(mutex);
};

Loaded& loaded() {
  static Loaded one;
  return one;
}

}  // namespace

std::optional<CurlLibrary> CurlLibrary::load(const char* file, std::string& problem) {
  // It is never unloaded, except when it is the wrong one.
  void* const handle = ::dlopen(file, RTLD_NOW | RTLD_LOCAL);
  if (handle == nullptr) {
    const char* const why = ::dlerror();
    problem = why != nullptr ? why : std::string(file) + " cannot be loaded";
    return std::nullopt;
  }
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
  if (finder.missing() != nullptr) {
    problem = std::string(file) + " has no " + finder.missing();
    ::dlclose(handle);
    return std::nullopt;
  }
  // The library must be initialised once in the process, before any other use.
  if (const CURLcode error = globalInit(CURL_GLOBAL_DEFAULT); error != CURLE_OK) {
    problem = std::string(file) + " cannot be initialised: " + library.easyStrerror(error);
    return std::nullopt;
  }
  return library;
}

const CurlLibrary* CurlLibrary::get(std::string& problem) {
  Loaded& known = loaded();
  const MutexLock lock(known.mutex);
  if (!known.library) known.library = load(kName, problem);
  return known.library ? &*known.library : nullptr;
}

}  // namespace tonewerk
