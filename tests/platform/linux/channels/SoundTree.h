// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <filesystem>
#include <fstream>
#include <string>

#include "support/TemporaryDirectory.h"

namespace tonewerk {

// Imitates the kernel's files about the sound cards of a laptop. The built-in card has a playing and a closed
// playback substream and a capture substream; a USB headset is suspended.
class SoundTree {
 public:
  SoundTree() {
    write("proc/asound/version", "Advanced Linux Sound Architecture Driver Version k6.1.0-18-amd64.\n");
    write("proc/asound/cards", " 0 [PCH            ]: HDA-Intel - HDA Intel PCH\n");
    addCard(0, "PCH", "active", "61234", "5321000");
    addSubstream("card0/pcm0p/sub0", kRunning, kParameters);
    addSubstream("card0/pcm3p/sub0", "closed\n", "closed\n");
    addSubstream("card0/pcm0c/sub0", "closed\n", "closed\n");
    write("proc/asound/card0/pcm0p/info", "card: 0\ndevice: 0\nsubdevice: 0\nstream: PLAYBACK\n");
    write("proc/asound/card0/codec#0", "Codec: Realtek ALC257\n");
    std::filesystem::create_directory_symlink("card0", path("proc/asound/PCH"));
    addCard(1, "Headset", "suspended", "300", "900");
    addSubstream("card1/pcm0p/sub0", "closed\n", "closed\n");
    write("proc/asound/card1/stream0", "USB Headset at usb-0000:00:14.0-1, full speed : USB Audio\n");
    for (const char* other : {"controlC0", "hwC0D0", "pcmC0D0p", "seq", "timer"}) {
      std::filesystem::create_directories(path(std::string("sys/class/sound/") + other));
    }
  }

  const std::string& root() const { return directory_.path(); }
  std::string path(const std::string& name) const { return directory_.path(name); }

  void write(const std::string& name, const std::string& text) const {
    std::filesystem::create_directories(std::filesystem::path(path(name)).parent_path());
    std::ofstream(path(name)) << text;
  }
  void addCard(int number, const std::string& identifier, const std::string& status,
               const std::string& active, const std::string& suspended) const {
    const std::string card = "card" + std::to_string(number);
    write("proc/asound/" + card + "/id", identifier + "\n");
    write("sys/class/sound/" + card + "/id", identifier + "\n");
    const std::string power = "sys/class/sound/" + card + "/device/power/";
    write(power + "control", "auto\n");
    write(power + "runtime_status", status + "\n");
    write(power + "runtime_active_time", active + "\n");
    write(power + "runtime_suspended_time", suspended + "\n");
  }
  void addSubstream(const std::string& name, const std::string& status, const std::string& parameters) const {
    write("proc/asound/" + name + "/status", status);
    write("proc/asound/" + name + "/hw_params", parameters);
    write("proc/asound/" + name + "/sw_params",
          parameters == "closed\n" ? parameters : "tstamp_mode: ENABLE\n");
  }
  // The playing substream.
  void setStatus(const std::string& status) const { write("proc/asound/card0/pcm0p/sub0/status", status); }

  static constexpr char kRunning[] =
      "state: RUNNING\nowner_pid   : 2317\ntrigger_time: 20431.373104146\ntstamp      : 20459.218446026\n"
      "delay       : 3540\navail       : 61996\navail_max   : 62446\n-----\nhw_ptr      : 1336652\n"
      "appl_ptr    : 1340192\n";
  static constexpr char kParameters[] =
      "access: MMAP_INTERLEAVED\nformat: S32_LE\nsubformat: STD\nchannels: 2\nrate: 48000 (48000/1)\n"
      "period_size: 1024\nbuffer_size: 65536\n";

 private:
  TemporaryDirectory directory_;
};

}  // namespace tonewerk
