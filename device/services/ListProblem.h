#pragma once

#include <string>
#include <string_view>

#include "platform/Value.h"

namespace device {

/// What whoever reads this file of the device's passes over in silence, because it is not what the file is to hold;
/// empty when there is nothing.
std::string problemOfList(std::string_view path, const platform::Value& list);

/// Whether an empty file counts as none there.
bool maySeemMissing(std::string_view path);

}  // namespace device
