// SPDX-License-Identifier: Apache-2.0
#include "system/support/PrivatePipeWire.h"

#include <array>
#include <cmath>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <numbers>

namespace tonewerk {

namespace {

constexpr int kRateHertz = 48'000;

template <typename Integer>
void append(std::string& bytes, Integer value) {
  for (std::size_t i = 0; i < sizeof value; ++i) {
    bytes.push_back(static_cast<char>(static_cast<std::uint64_t>(value) >> (8 * i)));
  }
}

// A RIFF/WAVE file of 16-bit samples, two channels.
std::string waveOf(int seconds) {
  std::string samples;
  for (int i = 0; i < seconds * kRateHertz; ++i) {
    const double phase = 2.0 * std::numbers::pi * 440.0 * i / kRateHertz;
    const auto sample = static_cast<std::int16_t>(8000.0 * std::sin(phase));
    append(samples, sample);
    append(samples, sample);
  }
  std::string wave = "RIFF";
  append(wave, static_cast<std::uint32_t>(36 + samples.size()));
  wave += "WAVEfmt ";
  append(wave, std::uint32_t{16});
  append(wave, std::uint16_t{1});  // plain samples
  append(wave, std::uint16_t{2});
  append(wave, std::uint32_t{kRateHertz});
  append(wave, std::uint32_t{kRateHertz * 4});
  append(wave, std::uint16_t{4});
  append(wave, std::uint16_t{16});
  wave += "data";
  append(wave, static_cast<std::uint32_t>(samples.size()));
  return wave + samples;
}

nlohmann::json parsed(const std::optional<std::string>& text) {
  return nlohmann::json::parse(text.value_or(""), nullptr, false);
}

// Calls `visit` with the information of each object of this kind until it returns true.
template <typename Visit>
bool anyObject(const nlohmann::json& dump, const std::string& kind, Visit visit) {
  if (!dump.is_array()) return false;
  for (const nlohmann::json& object : dump) {
    if (!object.value("type", "").ends_with(":" + kind)) continue;
    const auto info = object.find("info");
    if (info == object.end() || !info->is_object() || !info->contains("props")) continue;
    if (visit(object["id"].get<std::uint32_t>(), *info)) return true;
  }
  return false;
}

}  // namespace

PrivatePipeWire::PrivatePipeWire() {
  for (const char* name : {"runtime", "home"}) {
    std::filesystem::create_directory(directory_.path(name));
    std::filesystem::permissions(directory_.path(name), std::filesystem::perms::owner_all);
  }
}

std::map<std::string, std::string> PrivatePipeWire::environment() const {
  return {{"XDG_RUNTIME_DIR", directory_.path("runtime")},
          {"HOME", directory_.path("home")},
          {"DBUS_SESSION_BUS_ADDRESS", "unix:path=" + directory_.path("runtime/bus")}};
}

bool PrivatePipeWire::start() {
  const std::string address = "--address=" + environment().at("DBUS_SESSION_BUS_ADDRESS");
  const bool isUp = startProcess(bus_, "dbus-daemon", {"--session", "--nofork", "--nopidfile", address}) &&
                    waitUntil([&] { return std::filesystem::exists(directory_.path("runtime/bus")); }) &&
                    startProcess(pipewire_, "pipewire", {}) && waitUntil([&] {
                      return outputOf("pw-cli", {"info", "0"}).has_value();
                    }) &&
                    startProcess(sessionManager_, "wireplumber", {}) &&
                    waitUntil([&] { return hasClient("WirePlumber"); });
  if (!isUp) ADD_FAILURE() << "PipeWire does not come up; its log:\n" << log();
  return isUp;
}

void PrivatePipeWire::stop() {
  sessionManager_.kill();
  pipewire_.kill();
  bus_.kill();
  for (const char* name : {"runtime/pipewire-0", "runtime/pipewire-0.lock", "runtime/bus"}) {
    std::filesystem::remove(directory_.path(name));
  }
}

bool PrivatePipeWire::addSink(const std::string& name, const std::string& description) {
  const std::string properties = "{ factory.name=support.null-audio-sink node.name=" + name +
                                 " node.description=\"" + description +
                                 "\" media.class=Audio/Sink object.linger=true audio.position=[FL FR]"
                                 " audio.rate=48000 }";
  return outputOf("pw-cli", {"create-node", "adapter", properties}).has_value() &&
         waitUntil([&] { return hasNode(name); });
}

std::optional<std::string> PrivatePipeWire::outputOf(const std::string& program,
                                                     std::vector<std::string> arguments) const {
  return tonewerk::outputOf({program, std::move(arguments), environment()});
}

std::string PrivatePipeWire::makeTone(int seconds) const {
  std::string path = directory_.path("tone.wav");
  std::ofstream(path, std::ios::binary) << waveOf(seconds);
  return path;
}

std::optional<std::uint32_t> PrivatePipeWire::runningNode(const std::string& name) const {
  std::optional<std::uint32_t> found;
  anyObject(parsed(outputOf("pw-dump", {})), "Node",
            [&](std::uint32_t identifier, const nlohmann::json& info) {
              if (info["props"].value("node.name", "") != name || info.value("state", "") != "running")
                return false;
              found = identifier;
              return true;
            });
  return found;
}

bool PrivatePipeWire::hasNode(const std::string& name) const {
  return anyObject(parsed(outputOf("pw-dump", {})), "Node", [&](std::uint32_t, const nlohmann::json& info) {
    return info["props"].value("node.name", "") == name;
  });
}

bool PrivatePipeWire::hasClient(const std::string& name) const {
  return anyObject(parsed(outputOf("pw-dump", {})), "Client", [&](std::uint32_t, const nlohmann::json& info) {
    return info["props"].value("application.name", "") == name;
  });
}

std::string PrivatePipeWire::log() const { return textOfFile(directory_.path("log")); }

bool PrivatePipeWire::startProcess(ChildProcess& process, const std::string& program,
                                   std::vector<std::string> arguments) {
  return process.start({program, std::move(arguments), environment()}, directory_.path("log"),
                       directory_.path("log"));
}

}  // namespace tonewerk
