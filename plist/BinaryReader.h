#pragma once

#include "platform/Error.h"
#include "platform/Value.h"

namespace plist {

/// Reads a document that begins with "bplist00". Absent, with the error set, on failure.
platform::Value readBinary(platform::Bytes input, platform::ErrorRef& error);

}  // namespace plist
