// SPDX-License-Identifier: Apache-2.0
// Compiled as C++17 and as C++20: the C++ interface as other programs include it, with every template in use.
#include <string>
#include <tonewerk/reporting.hpp>
#include <tonewerk/reporting_audio.hpp>
#include <type_traits>
#include <utility>

namespace reporting = tonewerk::reporting;

template <class T>
constexpr bool isMoveOnly = std::is_nothrow_move_constructible_v<T>&& std::is_nothrow_move_assignable_v<T> &&
                            !std::is_copy_constructible_v<T> && !std::is_copy_assignable_v<T>;
static_assert(isMoveOnly<reporting::Client> && isMoveOnly<reporting::Session> &&
              isMoveOnly<reporting::Sender>);
static_assert(isMoveOnly<reporting::Playing> && isMoveOnly<reporting::RecordingInput>);
static_assert(!std::is_copy_constructible_v<reporting::Payload<>>);
static_assert(reporting::Category::kIO != (reporting::Category::kIO | reporting::Domain::kHAL));

int tonewerkCxxHeader();

int tonewerkCxxHeader() {
  reporting::Client client;
  reporting::Session session(client);
  reporting::Sender sender(session);
  reporting::Payload<512> payload;
  payload.put("bool", true).put("int", 1).put("unsigned", 1U).put("long", 1LL).put("float", 0.5F);
  payload.put("literal", "text").put("string", std::string("text")).put("view", std::string_view("text"));
  payload.put("date", reporting::Date{1}).put("now", std::chrono::system_clock::now());
  payload.map("map", [](reporting::AnyPayload& map) {
    map.list("list", [](reporting::AnyPayload& list) { list.put(1).put("text").map([](auto&) {}); });
  });
  sender.send(reporting::Category::kVolume, reporting::Type::kState, payload);
  reporting::Parameters<> parameters;
  parameters.putNil().put(1);
  client.request("method", parameters, [](reporting::Answer answer) { answer.result.clear(); });
  session.start([](const reporting::Answer& answer) { static_cast<void>(answer.status); });
  {
    reporting::Playing playing(sender, 0.5);
    playing.setVolume(0.25);
    reporting::RecordingInput recording(session);
    recording = reporting::RecordingInput(sender);
    reporting::reportDevice(session, "Speaker");
    reporting::reportRoute(sender, "Headphones", "plugged");
    reporting::reportFormat(session, 48000, 2, "lpcm");
    reporting::reportOverload(sender, {"mixer", 0.5, 512, 7});
    reporting::reportOverload(session);
  }
  reporting::Sender moved = std::move(sender);
  session.destroy();
  return moved && !session && client ? 0 : 1;
}
