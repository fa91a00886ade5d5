// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <array>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>

namespace tonewerk {

// An object's properties, or those of them that somebody here reads.
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
inline constexpr std::string_view kClientIDKey = "client.id";
inline constexpr std::string_view kLinkOutputNodeKey = "link.output.node";
inline constexpr std::string_view kLinkInputNodeKey = "link.input.node";

// Every key above: what an adapter needs to hand over.
inline constexpr std::array kUsedKeys = {kMediaClassKey,      kMediaRoleKey,         kNodeNameKey,
                                         kNodeDescriptionKey, kNodeNickKey,          kNodeDriverKey,
                                         kApplicationIDKey,   kApplicationBinaryKey, kApplicationNameKey,
                                         kClientIDKey,        kLinkOutputNodeKey,    kLinkInputNodeKey};

// Empty when absent.
std::string_view propertyOf(const Properties& properties, std::string_view key);

bool isOutputStream(const Properties& node);
// An output stream, or one that records.
bool isStream(const Properties& node);
// A duplex device is a sink.
bool isSink(const Properties& node);
bool isSource(const Properties& node);
// Whether it gives others the rhythm when it runs: hardware does, a filter does not.
bool isDriver(const Properties& node);

// What people call a sink: its description, else its nickname, else its name.
std::string deviceNameOf(const Properties& sink);

// Who plays: the application's identifier, else its binary, else its name, each as the node says it or else
// its client; else the node's own name.
std::string applicationOf(const Properties& node, const Properties& client);

// The service type under which a stream of this media role is reported.
std::uint16_t serviceTypeOf(std::string_view role);

}  // namespace tonewerk
