// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <compare>
#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "bridges/pipewire/graph/DriverNode.h"
#include "bridges/pipewire/graph/StreamDescription.h"
#include "bridges/pipewire/graph/StreamState.h"
#include "bridges/pipewire/graph/StreamVolume.h"

namespace tonewerk {

// Gets the changes of output streams. It is called from inside GraphModel's functions and must not call back
// into it.
class StreamObserver {
 public:
  virtual ~StreamObserver() = default;
  // A stream is new or its state has changed.
  virtual void streamChanged(std::uint32_t stream, const StreamState& state) = 0;
  virtual void streamGone(std::uint32_t stream) = 0;
};

// Says whose a node is.
struct NodeOwner {
  std::string name;         // of the node
  std::string application;  // like a stream's; empty when it is not known
  std::string binary;       // of its process, as the process says
  // Identifier of the application's process, 0 unknown: as the kernel says, where it says so.
  std::int32_t process = 0;
  // Identifier of the process in which the node computes, 0 unknown. It differs from `process` when the
  // application speaks to PipeWire through another process.
  std::int32_t computingProcess = 0;
  bool isOutputStream = false;
};

// Leads audio from one node to another.
struct NodeLink {
  std::uint32_t output = 0;  // the node that the audio comes from
  std::uint32_t input = 0;

  // NOLINTNEXTLINE(modernize-use-nullptr): there is none
  friend auto operator<=>(const NodeLink&, const NodeLink&) = default;
};

// Holds the relevant part of an audio graph: streams, the clients that own them, the sinks they are linked
// to, the sinks and sources that drive other nodes, and the nodes between. It is built from the objects'
// descriptions, which arrive one by one in any order.
//
// No stream is reported before complete(), because the sink of a stream may be described after the stream.
//
// Used on one thread. Its size is bounded by the graph's: descriptions of a node that has not appeared, or
// has left, are ignored.
class GraphModel {
 public:
  // `observer` outlives this object.
  explicit GraphModel(StreamObserver& observer) : observer_(observer) {}

  // A node is in the graph. `properties` may be incomplete.
  void nodeAppeared(std::uint32_t node, const Properties& properties);
  // A node has described itself completely.
  void nodeDescribed(std::uint32_t node, bool running, const Properties& properties);
  void volumeChanged(std::uint32_t node, const StreamVolume& update);
  void formatChanged(std::uint32_t node, const AudioFormat& format);
  void clientDescribed(std::uint32_t client, const Properties& properties);
  void linkAppeared(std::uint32_t link, std::uint32_t outputNode, std::uint32_t inputNode);
  // All objects that were in the graph at the start have been described.
  void complete();
  // An object of any kind, known or not, has left the graph.
  void removed(std::uint32_t object);
  // The graph itself is gone.
  void clear();

  // The sinks and sources that drive other nodes, by node.
  std::map<std::uint32_t, DriverNode> drivers() const;
  // None when the node is not a sink or source that drives others.
  [[nodiscard]] std::optional<DriverNode> driverAt(std::uint32_t node) const;
  // Runs `onChange` whenever drivers() may differ, from inside the functions above.
  void watchDrivers(std::function<void()> onChange) { onDriversChanged_ = std::move(onChange); }

  // Whose a node is; only empty values for one that is not in the graph.
  NodeOwner ownerOf(std::uint32_t node) const;
  // Each pair of nodes once, in ascending order.
  std::vector<NodeLink> nodeLinks() const;
  // Runs `onChange` whenever a node or a link has come or gone, from inside the functions above.
  void watchShape(std::function<void()> onChange) { onShapeChanged_ = std::move(onChange); }

 private:
  struct Node {
    Properties properties;
    bool described = false;
    bool running = false;
    StreamVolume volume;
    std::optional<AudioFormat> format;
    std::optional<StreamState> reported;  // the stream's state that the observer last got
  };
  struct Link {
    std::uint32_t outputNode;
    std::uint32_t inputNode;
  };

  const Properties* clientOf(const Node& node) const;
  std::string devicesOf(std::uint32_t stream) const;
  StreamState stateOf(std::uint32_t stream, const Node& node) const;
  void reportStream(std::uint32_t stream);
  void reportAllStreams();
  void reportDriverChange(const Properties& node);

  StreamObserver& observer_;
  std::function<void()> onDriversChanged_ = [] {};
  std::function<void()> onShapeChanged_ = [] {};
  bool isComplete_ = false;
  std::map<std::uint32_t, Node> nodes_;
  std::map<std::uint32_t, Properties> clients_;
  std::map<std::uint32_t, Link> links_;
};

}  // namespace tonewerk
