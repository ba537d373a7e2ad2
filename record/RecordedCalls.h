#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>

#include "platform/Error.h"
#include "platform/Value.h"
#include "record/Operation.h"
#include "record/Show.h"

namespace record {

/// Something that crossed the boundary, as a recording has it: a call to a service with what it answered, or the
/// beginning or the end of a call into the plug-in.
struct RecordedCall {
  std::uint64_t number = 0;  // of its event; of a service's call that of the answer
  std::uint64_t time = 0;    // microseconds since the recording began; of the last call into the plug-in, as others are
                             // recorded without their time
  std::string thread{};
  std::string service{};
  std::string operation{};
  std::string app{};  // empty when no app is meant
  OperationClass of = OperationClass::service;
  bool intoPlugin = false;
  bool end = false;  // of a call into the plug-in
  /// By name, without the absent ones. Bytes are their number; objects, lists and dictionaries are text.
  platform::Value arguments{};
  platform::Value result{};            // in the same way
  platform::ErrorRef error = nullptr;  // that was put out or thrown
};

/// All of them, in the order of their numbers. What was called and has not returned, where a recording was cut, is told
/// of the plug-in's operations alone.
RecordingFacts readCalls(std::string_view recording, const std::function<void(const RecordedCall& call)>& hear);

}  // namespace record
