#pragma once

#include "platform/Error.h"
#include "platform/Value.h"

namespace plist {

/// Reads an XML document in any encoding that the parser knows. Absent, with the error set, on failure.
platform::Value readXML(platform::Bytes input, platform::ErrorRef& error);

}  // namespace plist
