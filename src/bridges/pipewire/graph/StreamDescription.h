// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>

namespace tonewerk {

// Properties of a PipeWire object; only those of kUsedKeys are needed.
using Properties = std::map<std::string, std::string, std::less<>>;

inline constexpr std::string_view kMediaClassKey = "media.class";
inline constexpr std::string_view kMediaRoleKey = "media.role";
inline constexpr std::string_view kNodeNameKey = "node.name";
inline constexpr std::string_view kNodeDescriptionKey = "node.description";
inline constexpr std::string_view kNodeNickKey = "node.nick";
inline constexpr std::string_view kNodeDriverKey = "node.driver";
inline constexpr std::string_view kApplicationIDKey = "application.id";
inline constexpr std::string_view kApplicationBinaryKey = "application.process.binary";
inline constexpr std::string_view kApplicationNameKey = "application.name";
inline constexpr std::string_view kApplicationProcessKey = "application.process.id";  // as the process says
inline constexpr std::string_view kSocketProcessKey = "pipewire.sec.pid";             // as the kernel says
inline constexpr std::string_view kClientAPIKey = "client.api";  // of the library that the client uses
inline constexpr std::string_view kClientIDKey = "client.id";
inline constexpr std::string_view kLinkOutputNodeKey = "link.output.node";
inline constexpr std::string_view kLinkInputNodeKey = "link.input.node";

// All keys above: an adapter must pass on these properties.
inline constexpr std::array kUsedKeys = {
    kMediaClassKey,    kMediaRoleKey,     kNodeNameKey,          kNodeDescriptionKey, kNodeNickKey,
    kNodeDriverKey,    kApplicationIDKey, kApplicationBinaryKey, kApplicationNameKey, kApplicationProcessKey,
    kSocketProcessKey, kClientAPIKey,     kClientIDKey,          kLinkOutputNodeKey,  kLinkInputNodeKey};

// Empty when the property is missing.
std::string_view propertyOf(const Properties& properties, std::string_view key);

bool isOutputStream(const Properties& node);
// An output stream or an input stream.
bool isStream(const Properties& node);
// A duplex device counts as a sink.
bool isSink(const Properties& node);
bool isSource(const Properties& node);
// Whether the node drives others when it runs: hardware does, a filter does not.
bool isDriver(const Properties& node);

// The name of a sink for people: its description, else its nickname, else its name.
std::string deviceNameOf(const Properties& sink);

// The application that plays: its identifier, else its binary, else its name, each from the node or else from
// the client; else the node's own name.
std::string applicationOf(const Properties& node, const Properties& client);

// The service type under which a stream of this media role is reported.
std::uint16_t serviceTypeOf(std::string_view role);

}  // namespace tonewerk
