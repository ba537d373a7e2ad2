#pragma once

#include <string>

#include "platform/Value.h"

namespace tsd {

class SampleNumbers;

/// An icon, as PNG bytes: a rounded square in a colour of its own with a mark and the first letters of the name.
platform::Bytes drawSampleIcon(const std::string& name, SampleNumbers& numbers);

}  // namespace tsd
