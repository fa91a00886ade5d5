// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string_view>

// The keys of what `tw-replay --reasons` prints: one JSON object a line, each with "what" and the number of
// the life that it is about. Messages are numbered within a life, from 1, in the order of their arrival.
// Times are seconds since 1970. An absent key says that there is nothing, or that it is not known.
//
//   {"what":"begin","life":1,"reporter":7,"user":1000,"at":1767225600.0,"service":"telephony",
//    "application":"org.example.Phone","process":"phone"}
//   {"what":"message","life":1,"number":1,"at":...,"category":"Playback","type":"Start","redundant":false,
//    "derived":false,"kept":true,"payload":{...}}                 and "repeats":1 of a redundant one
//   {"what":"walk","life":1,"category":"Volume","key":"session_output_running","minimum":0.5,
//    "runsBefore":false}                                         and "since" of a stretch that counts
//   {"what":"rapid","life":1,"into":3,"number":4,"pause":1.5,"maximum":5.0,"merged":true}
//   {"what":"stretch","life":1,"number":1,"at":...}               and "condition":"gather_session" if not met
//   {"what":"stretchEnd","life":1,"number":5,"cause":"changed","key":"QMSessionVolume","before":"0.5",
//    "after":"0.3","from":...,"until":...,"outcome":"summary","index":1,"messages":[1,3,5]}
//   {"what":"walkEnd","life":1,"summaries":1}                     and "runsSince" of a stretch without an end
//   {"what":"end","life":1,"reporter":7,"at":...,"ending":"stopped","messages":5,"redundant":0,"overloads":0}
namespace tonewerk::reasons {

inline constexpr std::string_view kWhat = "what";
inline constexpr std::string_view kBegin = "begin";
inline constexpr std::string_view kMessage = "message";
inline constexpr std::string_view kWalk = "walk";
inline constexpr std::string_view kRapid = "rapid";
inline constexpr std::string_view kStretch = "stretch";
inline constexpr std::string_view kStretchEnd = "stretchEnd";
inline constexpr std::string_view kWalkEnd = "walkEnd";
inline constexpr std::string_view kEnd = "end";

inline constexpr std::string_view kAfter = "after";
inline constexpr std::string_view kApplication = "application";
inline constexpr std::string_view kAt = "at";
inline constexpr std::string_view kBefore = "before";
inline constexpr std::string_view kCategory = "category";
inline constexpr std::string_view kCause = "cause";  // "stopped", "last" or "changed"
inline constexpr std::string_view kCondition = "condition";
inline constexpr std::string_view kDerived = "derived";
inline constexpr std::string_view kEnding = "ending";
inline constexpr std::string_view kFrom = "from";
inline constexpr std::string_view kIndex = "index";
inline constexpr std::string_view kInto = "into";
inline constexpr std::string_view kKept = "kept";
inline constexpr std::string_view kKey = "key";
inline constexpr std::string_view kLife = "life";
inline constexpr std::string_view kMaximum = "maximum";
inline constexpr std::string_view kMerged = "merged";
inline constexpr std::string_view kMessages = "messages";
inline constexpr std::string_view kMinimum = "minimum";
inline constexpr std::string_view kNumber = "number";
// "summary", "tooShort", "noBegin", "noEnd", "noApplication", "noVolume" or "notInGather"
inline constexpr std::string_view kOutcome = "outcome";
inline constexpr std::string_view kOverloads = "overloads";
inline constexpr std::string_view kPause = "pause";
inline constexpr std::string_view kPayload = "payload";
inline constexpr std::string_view kProcess = "process";
inline constexpr std::string_view kRedundant = "redundant";
inline constexpr std::string_view kRepeats = "repeats";
inline constexpr std::string_view kReporter = "reporter";
inline constexpr std::string_view kRunsBefore = "runsBefore";
inline constexpr std::string_view kRunsSince = "runsSince";
inline constexpr std::string_view kSince = "since";
inline constexpr std::string_view kService = "service";
inline constexpr std::string_view kSummaries = "summaries";
inline constexpr std::string_view kType = "type";
inline constexpr std::string_view kUntil = "until";
inline constexpr std::string_view kUser = "user";

inline constexpr std::string_view kCauseStopped = "stopped";
inline constexpr std::string_view kCauseLast = "last";
inline constexpr std::string_view kCauseChanged = "changed";
inline constexpr std::string_view kOutcomeSummary = "summary";
inline constexpr std::string_view kOutcomeTooShort = "tooShort";
inline constexpr std::string_view kOutcomeNoBegin = "noBegin";
inline constexpr std::string_view kOutcomeNoEnd = "noEnd";
inline constexpr std::string_view kOutcomeNoApplication = "noApplication";
inline constexpr std::string_view kOutcomeNoVolume = "noVolume";
inline constexpr std::string_view kOutcomeNotInGather = "notInGather";

}  // namespace tonewerk::reasons
