#pragma once

#include <cstdint>
#include <string_view>

#include "platform/Value.h"

namespace device {

/// One change of a device's files or store on its way to the system: the smallest thing that can fail by itself, and
/// that a process can die before or after.
struct Step {
  enum class Kind : std::uint8_t {
    createDirectory,
    createFile,
    write,          // what the body leaves in `bytes` has been appended to what was written before
    syncFile,       // the file's content
    syncDirectory,  // the directory's entries
    syncTree,       // an item with everything in it, and its entry in its directory
    move,
    remove,  // a file, or a directory that is empty
    touch,
    storeWrite,   // changes of the store that a loss of power may take back
    storeCommit,  // changes that are durable with this step, and with them all before
  };

  Kind kind;
  std::string_view path;  // the device's; of a move, the old one; empty for the store
  std::string_view target{};
  platform::BytesView bytes{};
};

/// Is told of every step, and may forbid it. Steps come from any thread, each under whatever guard its doer holds, so
/// a watch calls nothing of the device.
class StepWatch {
 public:
  virtual ~StepWatch() = default;
  /// 0 when the step may happen, otherwise the system's number of the error with which it fails. May shorten what one
  /// write takes, which the writer has to notice.
  virtual int before(Step& step) = 0;
  /// The step has taken effect. An answer other than 0 is reported as its failure all the same.
  virtual int after(const Step& step) = 0;
};

/// Takes a step: `body(step)` does it and answers 0 or the error number, which is the answer here. `watch` may be null.
template <class Body>
int takeStep(StepWatch* watch, Step step, Body&& body) {
  if (!watch) return body(step);
  if (int failure = watch->before(step)) return failure;
  if (int failure = body(step)) return failure;
  return watch->after(step);
}

}  // namespace device
