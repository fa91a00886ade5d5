// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <dlfcn.h>
#include <string>
#include <unistd.h>

// Signposts mark what an audio program does, from a begin to an end, in performance traces of test sessions.
//
//   void Decoder::run(const Packet& packet) {
//     const tonewerk::signpost::Interval interval("decode", packet.number());
//     ...
//   }
//
// Any thread may use them, also a real-time one. A pair costs a nanosecond or less while no trace runs. A
// program links nothing: this header loads the tracing library when the program starts, if tracing is
// possible. The variable TONEWERK_SIGNPOSTS decides that ("0" never, "1" always, or the library's path). If
// it is not set, the library is loaded when the reporting daemon has put its mark into its runtime directory.
// Without the library there are no traces and no errors.
namespace tonewerk::signpost {

// The functions of the library that this header calls. The library has one such object, which is never
// destroyed.
struct Provider {
  const int* tracesBegins;  // not 0 while a trace records begins
  const int* tracesEnds;    // not 0 while a trace records ends
  void (*begin)(const char* name, std::uint64_t identifier);
  void (*end)(const char* name, std::uint64_t identifier);
};

inline constexpr char kProviderLibrary[] = "libtonewerk-signpost.so.0";
inline constexpr char kProviderSymbol[] = "tonewerk_signpost_provider_0";  // a Provider
inline constexpr char kMarkName[] = "signposts";

namespace detail {

inline std::atomic<const Provider*> provider = nullptr;

// The name or path of the library; null when it must not be loaded.
inline const char* wantedLibrary() {
  const char* wish = secure_getenv("TONEWERK_SIGNPOSTS");
  if (wish != nullptr && *wish != '\0') {
    if (wish[0] == '/') return wish;
    return wish[0] == '1' ? kProviderLibrary : nullptr;
  }
  const char* runtime = secure_getenv("XDG_RUNTIME_DIR");
  const std::string suffix = std::string("/tonewerk/") + kMarkName;
  const bool isMarked = (runtime != nullptr && access((runtime + suffix).c_str(), F_OK) == 0) ||
                        access(("/run" + suffix).c_str(), F_OK) == 0;
  return isMarked ? kProviderLibrary : nullptr;
}

}  // namespace detail

// Loads the library for the rest of the process. Returns null on success or when it was loaded before,
// otherwise the problem. May take some tens of milliseconds. Only parts of a program that are loaded late
// need this call.
inline const char* load(const char* library) {
  if (detail::provider.load(std::memory_order_acquire) != nullptr) return nullptr;
  void* handle = dlopen(library, RTLD_NOW | RTLD_NODELETE);
  if (handle == nullptr) return dlerror();
  const void* found = dlsym(handle, kProviderSymbol);
  if (found == nullptr) return dlerror();
  detail::provider.store(static_cast<const Provider*>(found), std::memory_order_release);
  return nullptr;
}

namespace detail {

inline bool loadIfWanted() {
  const char* library = wantedLibrary();
  return library != nullptr && load(library) == nullptr;
}

// Runs before main(), so that no real-time thread waits for it.
inline const bool isLoadedAtStart = loadIfWanted();

}  // namespace detail

// `name` is the name that lists of probes contain; its text is copied during the call. `identifier`
// distinguishes intervals of the same name that overlap on a thread. An interval ends on the thread that
// began it.
inline void begin(const char* name, std::uint64_t identifier = 0) {
  const Provider* provider = detail::provider.load(std::memory_order_acquire);
  if (provider != nullptr && __atomic_load_n(provider->tracesBegins, __ATOMIC_RELAXED) != 0) {
    provider->begin(name, identifier);
  }
}

inline void end(const char* name, std::uint64_t identifier = 0) {
  const Provider* provider = detail::provider.load(std::memory_order_acquire);
  if (provider != nullptr && __atomic_load_n(provider->tracesEnds, __ATOMIC_RELAXED) != 0) {
    provider->end(name, identifier);
  }
}

// Marks an interval from here to the end of the scope. `name` outlives it.
class Interval {
 public:
  explicit Interval(const char* name, std::uint64_t identifier = 0) : name_(name), identifier_(identifier) {
    begin(name_, identifier_);
  }
  Interval(const Interval&) = delete;
  Interval& operator=(const Interval&) = delete;
  ~Interval() { end(name_, identifier_); }

 private:
  const char* const name_;
  const std::uint64_t identifier_;
};

}  // namespace tonewerk::signpost
