// SPDX-License-Identifier: Apache-2.0
#include "bridges/pipewire/graph/GraphModel.h"

#include <algorithm>
#include <charconv>
#include <set>
#include <utility>

#include "bridges/pipewire/graph/CleanText.h"

namespace tonewerk {

namespace {

template <typename Number>
std::optional<Number> numberOf(std::string_view text) {
  Number value = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
  if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
  return value;
}

// 0 when it is not the identifier of a process.
std::int32_t processOf(const Properties& client, std::string_view key) {
  return std::max(numberOf<std::int32_t>(propertyOf(client, key)).value_or(0), 0);
}

// The server for PulseAudio's protocol is one process with a client for each application.
bool speaksForAnother(const Properties& client) {
  return propertyOf(client, kClientAPIKey) == "pipewire-pulse";
}

std::optional<DriverNode> driverOf(const Properties& node) {
  if (!isDriver(node) || !(isSink(node) || isSource(node))) return std::nullopt;
  const std::string_view name = propertyOf(node, kNodeNameKey);
  return DriverNode{isSink(node) ? DriverNode::kSink : DriverNode::kSource,
                    name.empty() ? deviceNameOf(node) : cleanText(name)};
}

void mergeInto(Properties& properties, const Properties& update) {
  for (const auto& [key, value] : update) properties[key] = value;
}

}  // namespace

void GraphModel::nodeAppeared(std::uint32_t node, const Properties& properties) {
  const bool isNew = !nodes_.contains(node);
  mergeInto(nodes_[node].properties, properties);
  reportAllStreams();
  reportDriverChange(nodes_[node].properties);
  if (isNew) onShapeChanged_();
}

void GraphModel::nodeDescribed(std::uint32_t node, bool running, const Properties& properties) {
  const auto known = nodes_.find(node);
  if (known == nodes_.end()) return;
  mergeInto(known->second.properties, properties);
  known->second.described = true;
  known->second.running = running;
  // All streams, because a sink's name is part of the state of each stream that plays to it.
  reportAllStreams();
  reportDriverChange(known->second.properties);
}

void GraphModel::volumeChanged(std::uint32_t node, const StreamVolume& update) {
  const auto known = nodes_.find(node);
  if (known == nodes_.end()) return;
  known->second.volume.merge(update);
  reportStream(node);
}

void GraphModel::formatChanged(std::uint32_t node, const AudioFormat& format) {
  const auto known = nodes_.find(node);
  if (known == nodes_.end()) return;
  known->second.format = format;
  reportStream(node);
}

void GraphModel::clientDescribed(std::uint32_t client, const Properties& properties) {
  mergeInto(clients_[client], properties);
  reportAllStreams();
}

void GraphModel::linkAppeared(std::uint32_t link, std::uint32_t outputNode, std::uint32_t inputNode) {
  links_[link] = {outputNode, inputNode};
  reportStream(outputNode);
  onShapeChanged_();
}

void GraphModel::complete() {
  isComplete_ = true;
  reportAllStreams();
}

void GraphModel::removed(std::uint32_t object) {
  clients_.erase(object);
  if (const auto link = links_.find(object); link != links_.end()) {
    const std::uint32_t stream = link->second.outputNode;
    links_.erase(link);
    reportStream(stream);
    onShapeChanged_();
  }
  const auto node = nodes_.find(object);
  if (node == nodes_.end()) return;
  const bool wasReported = node->second.reported.has_value();
  const Properties properties = std::move(node->second.properties);
  nodes_.erase(node);
  if (wasReported) observer_.streamGone(object);
  reportAllStreams();
  reportDriverChange(properties);
  onShapeChanged_();
}

void GraphModel::clear() {
  const std::map<std::uint32_t, Node> nodes = std::exchange(nodes_, {});
  clients_.clear();
  links_.clear();
  isComplete_ = false;
  for (const auto& [identifier, node] : nodes) {
    if (node.reported) observer_.streamGone(identifier);
  }
  onDriversChanged_();
  onShapeChanged_();
}

std::map<std::uint32_t, DriverNode> GraphModel::drivers() const {
  std::map<std::uint32_t, DriverNode> drivers;
  for (const auto& [identifier, node] : nodes_) {
    if (std::optional<DriverNode> driver = driverOf(node.properties)) {
      drivers.emplace(identifier, *std::move(driver));
    }
  }
  return drivers;
}

std::optional<DriverNode> GraphModel::driverAt(std::uint32_t node) const {
  const auto found = nodes_.find(node);
  return found == nodes_.end() ? std::nullopt : driverOf(found->second.properties);
}

NodeOwner GraphModel::ownerOf(std::uint32_t node) const {
  NodeOwner owner;
  const auto found = nodes_.find(node);
  if (found == nodes_.end()) return owner;
  static const Properties kNoClient;
  const Properties* known = clientOf(found->second);
  const Properties& client = known == nullptr ? kNoClient : *known;
  const Properties& properties = found->second.properties;
  owner.name = cleanText(propertyOf(properties, kNodeNameKey));
  owner.application = applicationOf(properties, client);
  owner.binary = cleanText(propertyOf(client, kApplicationBinaryKey));
  owner.computingProcess = processOf(client, kSocketProcessKey);
  const std::int32_t said = processOf(client, kApplicationProcessKey);
  // What a process says of itself may be wrong, such as its number in a container.
  const bool isKnown = owner.computingProcess != 0 && !speaksForAnother(client);
  owner.process = isKnown || said == 0 ? owner.computingProcess : said;
  if (owner.computingProcess == 0) owner.computingProcess = owner.process;
  owner.isOutputStream = isOutputStream(properties);
  return owner;
}

std::vector<NodeLink> GraphModel::nodeLinks() const {
  std::set<NodeLink> links;
  for (const auto& [identifier, link] : links_) links.insert({link.outputNode, link.inputNode});
  return {links.begin(), links.end()};
}

const Properties* GraphModel::clientOf(const Node& node) const {
  const std::optional<std::uint32_t> identifier =
      numberOf<std::uint32_t>(propertyOf(node.properties, kClientIDKey));
  const auto client = identifier ? clients_.find(*identifier) : clients_.end();
  return client == clients_.end() ? nullptr : &client->second;
}

std::string GraphModel::devicesOf(std::uint32_t stream) const {
  std::set<std::string> names;
  for (const auto& [identifier, link] : links_) {
    if (link.outputNode != stream) continue;
    const auto input = nodes_.find(link.inputNode);
    // Other listeners of a stream, such as a recorder or a level meter, are not devices.
    if (input != nodes_.end() && isSink(input->second.properties)) {
      names.insert(deviceNameOf(input->second.properties));
    }
  }
  std::string joined;
  for (const std::string& name : names) joined += (joined.empty() ? "" : ", ") + name;
  return cleanText(joined);
}

StreamState GraphModel::stateOf(std::uint32_t stream, const Node& node) const {
  static const Properties kNoClient;
  const Properties* client = clientOf(node);
  StreamState state;
  state.described = node.described && (client != nullptr || !node.properties.contains(kClientIDKey));
  state.application = applicationOf(node.properties, client == nullptr ? kNoClient : *client);
  state.role = propertyOf(node.properties, kMediaRoleKey);
  state.running = node.running;
  state.volume = node.volume.shown();
  state.format = node.format;
  state.device = devicesOf(stream);
  return state;
}

void GraphModel::reportStream(std::uint32_t stream) {
  if (!isComplete_) return;
  const auto found = nodes_.find(stream);
  if (found == nodes_.end() || !isOutputStream(found->second.properties)) return;
  Node& node = found->second;
  StreamState state = stateOf(stream, node);
  if (node.reported == state) return;
  node.reported = std::move(state);
  observer_.streamChanged(stream, *node.reported);
}

void GraphModel::reportAllStreams() {
  for (const auto& [identifier, node] : nodes_) reportStream(identifier);
}

void GraphModel::reportDriverChange(const Properties& node) {
  if (driverOf(node)) onDriversChanged_();
}

}  // namespace tonewerk
