#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>

#include "platform/Value.h"

namespace record {

/// Something that the called side puts out into, where the caller wants it.
template <class T>
struct Out {
  T* place;
};
template <class T>
Out<T> out(T* place) {
  return {place};
}
/// The same for a parameter that is a reference.
template <class T>
struct OutReference {
  T& place;
};
template <class T>
OutReference<T> out(T& place) {
  return {place};
}

/// A function that one side hands to the other; it is known by a number from then on.
template <class Signature>
struct Callback {
  std::function<Signature> function;
  std::uint64_t number = 0;
};
template <class Signature>
Callback<Signature> callback(std::function<Signature> function) {
  return {std::move(function)};
}

/// A buffer that the home screen lends, and the same when it is given back.
struct LentBuffer {
  void** buffer;
  std::size_t* length;
  const void* before = *buffer;
};
struct ReturnedBuffer {
  void* buffer;
  std::size_t length;
};

/// What a block of the plug-in's tells whoever calls it.
struct Stop {
  bool& isWanted;
};

/// The clock's wait: what the plug-in waits with. Only the deadline is written.
struct Deadline {
  std::int64_t nanoseconds;
};

}  // namespace record
