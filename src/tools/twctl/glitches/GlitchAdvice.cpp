// SPDX-License-Identifier: Apache-2.0
#include "tools/twctl/glitches/GlitchAdvice.h"

namespace tonewerk {
namespace {

// For a command line.
std::string pidOf(const GlitchVerdict& verdict) {
  return verdict.culpritPid ? std::to_string(*verdict.culpritPid) : "PID";
}

std::string nameOf(const GlitchVerdict& verdict) {
  if (verdict.culpritApplication) return *verdict.culpritApplication;
  if (verdict.culpritProcess) return *verdict.culpritProcess;
  return verdict.culpritNode.value_or("it");
}

// The command line for what the kernel logged around a time.
std::string kernelLogAt(double time) {
  constexpr std::int64_t kAround = 5;  // seconds
  const auto second = static_cast<std::int64_t>(time);
  return "`journalctl -k --since @" + std::to_string(second - kAround) + " --until @" +
         std::to_string(second + kAround) + "`";
}

// A period that is twice as long, in frames.
std::string largerQuantum(const GlitchVerdict& verdict) {
  constexpr std::int64_t kUsual = 512;
  constexpr std::int64_t kMost = 8192;
  const std::int64_t quantum = verdict.quantum.value_or(kUsual);
  const std::int64_t larger = quantum < kMost / 2 ? 2 * quantum : kMost;
  return "Give all programs more time for each cycle, at the price of a longer delay: `pw-metadata -n "
         "settings "
         "0 clock.min-quantum " +
         std::to_string(larger) + "`.";
}

}  // namespace

std::string meaningOf(const GlitchVerdict& verdict) {
  const std::string cause = verdict.sharedCause().value_or("");
  const std::string name = nameOf(verdict);
  const std::string over = verdict.overMs ? ", by at least " + millisecondsText(*verdict.overMs) : "";
  const std::string period = verdict.periodMs ? " of " + millisecondsText(*verdict.periodMs) : "";
  if (cause == "late") {
    return (name == "it" ? "A program" : name) + " computed longer than the cycle" + period + " lasts" +
           over + ".";
  }
  if (cause == "not scheduled") {
    const std::string victim = verdict.node ? *verdict.node : std::string("a program");
    return victim + " was ready to compute, but got no processor in time" + over + ".";
  }
  if (cause == "stuck") {
    return (name == "it" ? "A program" : name) + " did not answer for whole cycles" +
           (verdict.overMs ? ", at least for " + millisecondsText(*verdict.overMs) : "") + ".";
  }
  if (cause == "waiting for another") return "A program waited for another one, which is not known.";
  if (cause == "device") return "The device itself, or its clock, was not in time; the programs were.";
  if (cause == "graph changed") return "Programs were connected or disconnected at that moment.";
  if (cause == "system slept") return "The system slept, or its clock jumped.";
  if (!verdict.isJudged())
    return "The PipeWire bridge judges overloads; this one comes from another program, or from an earlier "
           "bridge.";
  return "What caused it is not known.";
}

std::vector<std::string> remediesFor(const GlitchVerdict& verdict) {
  const std::string cause = verdict.sharedCause().value_or("");
  const std::string pid = pidOf(verdict);
  if (cause == "late") {
    return {"Let " + nameOf(verdict) + " do less: fewer effects, or a lower quality of them.",
            largerQuantum(verdict),
            "When it happens again and again at light load, tell its makers: it does something in its audio "
            "thread that may take any time, such as reading a file."};
  }
  if (cause == "not scheduled") {
    const std::string hog = verdict.culpritProcess
                                ? "Let " + *verdict.culpritProcess +
                                      " run when no audio does, or give it less of the "
                                      "processor: `renice -n 19 -p " +
                                      pid + "`."
                                : std::string("See what else keeps the processor busy: `top`.");
    return {
        hog,
        "Give the audio thread of " + verdict.node.value_or("the program") +
            " real-time priority: install rtkit, or join the group that has it, and log in again. `ps -eLo "
            "pid,cls,rtprio,comm` shows who has it (FF, RR).",
        largerQuantum(verdict)};
  }
  if (cause == "stuck") {
    return {
        "See whether it is stopped (T) or waits for a disk (D): `ps -o pid,stat,wchan,comm -p " + pid + "`.",
        "Let it go on (`kill -CONT " + pid + "`), or end it and start it again.",
        "When it waits for a disk or the network, tell its makers: an audio thread must not."};
  }
  if (cause == "waiting for another") {
    return {
        "It is innocent. See which program comes before it in the chain, and which one causes most: `twctl "
        "glitches --by application`."};
  }
  if (cause == "device") {
    return {"See what the kernel said then: " + kernelLogAt(verdict.at) + ".",
            "Use another port or cable, and no hub between; with a wireless device, come nearer.",
            largerQuantum(verdict)};
  }
  if (cause == "graph changed") {
    return {
        "Nothing, when it happened once: a change may cost a cycle. When it goes on, see who connects: "
        "`pw-mon`."};
  }
  if (cause == "system slept") return {"Nothing: audio cannot go on while the system sleeps."};
  if (!verdict.isJudged()) {
    return {
        "Let the bridge of this version run, so that the next one is judged: `systemctl --user enable --now "
        "tw-pipewire`."};
  }
  return {
      "Look at all of them, one alone says little: `twctl glitches --by application` and `twctl glitches "
      "--by "
      "hour`."};
}

}  // namespace tonewerk
