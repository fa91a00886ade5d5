// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <optional>

#include "bridges/pipewire/graph/DriverNode.h"
#include "bridges/pipewire/graph/StreamDescription.h"
#include "bridges/pipewire/graph/StreamState.h"
#include "bridges/pipewire/graph/StreamVolume.h"

namespace tonewerk {

// Hears of output streams. Calls come from inside GraphModel's functions and must not call back into it.
class StreamObserver {
 public:
  virtual ~StreamObserver() = default;
  // A stream is new, or something about it is.
  virtual void streamChanged(std::uint32_t stream, const StreamState& state) = 0;
  virtual void streamGone(std::uint32_t stream) = 0;
};

// The part of a sound graph that matters here, put together from what its objects say one by one, in any
// order: streams, the clients they belong to, the sinks they are linked to, and which sinks and sources drive
// the others.
//
// While a graph is first described nobody hears of its streams: what a stream plays to may be told after it.
//
// For one thread. Holds as much as the graph does: what is said of a node that has not appeared, or has left,
// is ignored.
class GraphModel {
 public:
  // `observer` outlives this.
  explicit GraphModel(StreamObserver& observer) : observer_(observer) {}

  // A node is in the graph. `properties` may be a first excerpt.
  void nodeAppeared(std::uint32_t node, const Properties& properties);
  // A node has told about itself in full.
  void nodeDescribed(std::uint32_t node, bool running, const Properties& properties);
  void volumeChanged(std::uint32_t node, const StreamVolume& update);
  void formatChanged(std::uint32_t node, const AudioFormat& format);
  void clientDescribed(std::uint32_t client, const Properties& properties);
  void linkAppeared(std::uint32_t link, std::uint32_t outputNode, std::uint32_t inputNode);
  // Everything that was in the graph has been told.
  void complete();
  // An object of any kind, known or not, has left the graph.
  void removed(std::uint32_t object);
  // The graph itself is gone.
  void clear();

  // The sinks and sources that drive others, by node.
  std::map<std::uint32_t, DriverNode> drivers() const;
  // None when the node is no such driver.
  [[nodiscard]] std::optional<DriverNode> driverAt(std::uint32_t node) const;
  // Runs `onChange` whenever drivers() may differ, from inside the functions above.
  void watchDrivers(std::function<void()> onChange) { onDriversChanged_ = std::move(onChange); }

 private:
  struct Node {
    Properties properties;
    bool described = false;
    bool running = false;
    StreamVolume volume;
    std::optional<AudioFormat> format;
    std::optional<StreamState> told;  // a stream's state as the observer last heard it
  };
  struct Link {
    std::uint32_t outputNode;
    std::uint32_t inputNode;
  };

  const Properties* clientOf(const Node& node) const;
  std::string devicesOf(std::uint32_t stream) const;
  StreamState stateOf(std::uint32_t stream, const Node& node) const;
  void tell(std::uint32_t stream);
  void tellAll();
  void tellDrivers(const Properties& node);

  StreamObserver& observer_;
  std::function<void()> onDriversChanged_ = [] {};
  bool isComplete_ = false;
  std::map<std::uint32_t, Node> nodes_;
  std::map<std::uint32_t, Properties> clients_;
  std::map<std::uint32_t, Link> links_;
};

}  // namespace tonewerk
