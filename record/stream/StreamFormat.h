#pragma once

#include <cstdint>

/// The bytes of the stream of events, which is compressed as a whole.
namespace record::stream {

/// The first byte of an entry: what it is, and whether it is of the thread of the event before.
enum class Entry : std::uint8_t {
  call,
  answer,
  threw,
  enter,
  leave,
  end,
  thread,     // name: the next thread's
  operation,  // service, name, parameters: the next operation's
  thrown,
};
constexpr std::uint8_t entryMask = 0x0f;
constexpr std::uint8_t sameThread = 0x10;

/// What may stand in place of a text, bytes or a packed item, behind its tag with this bit: how it was known.
constexpr std::uint8_t knownBit = 0x40;
enum class Known : std::uint8_t {
  medium,     // place
  newMedium,  // length, bytes: from now on known
  large,      // slot
  newLarge,   // length, bytes: from now on in slot 0
  changed,    // slot, bytes that are the same at its beginning, at its end, length, bytes between: now in slot 0
  edited,  // slot of a list, edits: now in slot 0. Of each: elements that stay, that go, that come; of each that comes
           // for one that went, its bytes that stay in front and behind; of each that comes, length, bytes
};

}  // namespace record::stream
