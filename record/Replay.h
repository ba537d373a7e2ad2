#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "platform/Platform.h"
#include "platform/TSClient.h"
#include "record/Operation.h"

namespace record {

/// Makes the plug-in's object of the build that is tried.
using MakeClient = std::function<std::shared_ptr<platform::TSClient>(const platform::Platform& platform)>;

struct ReplayOptions {
  bool goOn = false;                   // past differences, as far as that can be done
  std::set<OperationClass> ignored{};  // what is not compared: messages, steps
};

/// Something that the plug-in did differently from the recording.
struct Difference {
  enum class Kind : std::uint8_t {
    otherArguments,  // the call that was expected, with other arguments
    otherResult,     // it returned something else
    missing,         // it did not make a call that was expected
    additional,      // it made a call that was not expected
    standing,        // it would wait for ever
  };
  Kind kind = Kind::otherArguments;
  OperationClass of = OperationClass::service;
  std::uint64_t event = 0;  // number of the event that was expected
  std::string thread{};
  std::string inside{};                 // the call into the plug-in that was being answered
  std::string expected{};               // a call as one line; empty: none
  std::string came{};                   // the same
  std::string app{};                    // its identifier; empty when no app was meant
  std::string message{};                // what the plug-in wrote, or would have written next; empty: nothing
  std::vector<std::string> before{};    // the last calls of that app, or of that thread if no app was meant
  std::vector<std::string> standing{};  // where each thread was
};
const char* nameOf(Difference::Kind kind);

struct ReplayResult {
  std::vector<Difference> differences;  // in their order; one unless it was told to go on
  std::uint64_t events = 0;             // that were replayed
  bool isWhole = false;                 // the recording was ended in order, and all of it was replayed
  std::string problem;                  // why the recording cannot be read on; empty: it can
  bool isStuck = false;                 // threads of the plug-in still wait, and do for ever: the process has to end
};

/// Tells a recording to a plug-in: no device, no disk. Each recorded thread has one of its own here, and they take
/// turns in the recorded order, so that every replay is the same. `recording` is the recording's bytes, and outlives
/// the call. Whatever they are, nothing is thrown but `std::bad_alloc`.
ReplayResult replay(std::string_view recording, const MakeClient& makeClient, const ReplayOptions& options = {});

}  // namespace record
