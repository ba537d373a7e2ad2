#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "record/stream/HeardTexts.h"

namespace record {

/// The version of recordings that this code writes; it reads this one and every earlier one.
constexpr std::uint64_t recordingVersion = 3;
constexpr std::string_view recordingMagic = "TSRECORD";

/// What happens at the boundary of the plug-in. In a recording the events of all threads stand in the order in which
/// they happened: between an `enter` or an `answer` of a thread and its next event no other thread was inside the
/// plug-in.
enum class EventKind : std::uint8_t {
  call,        // the plug-in calls a service: operation, arguments
  answer,      // the service returns: result, then what it put out
  threw,       // the service threw: what, then what it had put out
  enter,       // somebody calls the plug-in: operation, arguments
  leave,       // the plug-in returns: result, then what it put out
  end,         // the recording was ended in order
  thrown = 8,  // the plug-in threw: what, then what it had put out
};
/// Whether a call begins with it; otherwise one ends.
constexpr bool opens(EventKind kind) { return kind == EventKind::call || kind == EventKind::enter; }
/// Whether the plug-in comes to its end with it.
constexpr bool leaves(EventKind kind) { return kind == EventKind::leave || kind == EventKind::thrown; }

/// Bounds of what one event may hold, and of a whole recording's threads and operations: a reader that is given
/// something hostile holds no more.
constexpr std::size_t largestPayload = std::size_t{128} << 20;
constexpr std::size_t mostThreads = 4096;
constexpr std::size_t mostOperations = 4096;

/// An operation as a recording names it.
struct OperationName {
  std::string service;
  std::string name;
  std::string parameters;  // names with a space between them: those of the receiver, the arguments, and, behind "->",
                           // of what is put out

  friend bool operator==(const OperationName&, const OperationName&) = default;
};

struct Event {
  EventKind kind = EventKind::end;
  std::uint32_t thread = 0;
  std::uint32_t operation = 0;   // of a call and an enter: its place in the reader's list; the others have that of what
                                 // they end
  std::uint64_t number = 0;      // its place in the recording, from 1
  std::uint64_t time = 0;        // of an enter: microseconds since the recording began
  std::string payload;           // items (see Item.h)
  std::vector<LargePart> large;  // what of them is not in the payload itself, if the reader was asked for that
};

}  // namespace record
