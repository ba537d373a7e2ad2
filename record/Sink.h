#pragma once

#include <memory>
#include <string>

#include "platform/Error.h"
#include "platform/Value.h"

namespace record {

/// Where a recording goes. Called from the threads that are inside the plug-in, one at a time. Throws nothing.
class Sink {
 public:
  virtual ~Sink() = default;
  /// False when not all of it could be written; nothing more comes then, and what was written before stays readable.
  virtual bool write(platform::BytesView bytes) = 0;
};

/// A file, replaced if it is there. Null, with an error, when it cannot be made.
std::shared_ptr<Sink> makeFileSink(const std::string& path, platform::ErrorRef* error = nullptr);

}  // namespace record
