// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <dlfcn.h>
#include <string>
#include <unistd.h>

// Signposts: what an audio program does, from a begin to an end, for performance traces of test sessions.
//
//   void Decoder::run(const Packet& packet) {
//     const tonewerk::signpost::Interval interval("decode", packet.number());
//     ...
//   }
//
// Any thread, real-time ones included. A pair costs a nanosecond or less while no trace runs. Nothing needs
// to be linked: the library that knows how to trace is loaded when the program starts, and only where tracing
// can happen, which the variable TONEWERK_SIGNPOSTS says ("0" never, "1" always, or the library's path), or
// else the reporting daemon's mark in its runtime directory. Without that library there are no traces and no
// errors.
namespace tonewerk::signpost {

// How the library and this header meet. Its one object lives as long as the process.
struct Provider {
  const int* tracesBegins;  // not 0 while a trace wants to know
  const int* tracesEnds;
  void (*begin)(const char* name, std::uint64_t identifier);
  void (*end)(const char* name, std::uint64_t identifier);
};

inline constexpr char kProviderLibrary[] = "libtonewerk-signpost.so.0";
inline constexpr char kProviderSymbol[] = "tonewerk_signpost_provider_0";  // a Provider
inline constexpr char kMarkName[] = "signposts";

namespace detail {

inline std::atomic<const Provider*> provider = nullptr;

// Whether the library may be loaded, and by what name; null when not.
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

// Loads the library, for good; null when that works or was done before, else why not. May take some tens of
// milliseconds. For programs that load parts of themselves late; what is there at the start needs no call.
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

// Before main(), so that no real-time thread pays for it.
inline const bool isLoadedAtStart = loadIfWanted();

}  // namespace detail

// `name` is what probe lists name; its text is taken at once. `identifier` tells intervals of one name apart
// that overlap on a thread. An interval ends on the thread that began it.
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

// From here to the end of the scope. `name` outlives it.
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
