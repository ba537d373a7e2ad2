#pragma once

#include <string>
#include <string_view>

#include "platform/Value.h"

namespace tsd {

/// All that the report's page can show of a recording, which knows no home screen and no device. `name` is the file's.
/// Throws a `CommandError` at what is no recording.
platform::Value recordingDocument(const std::string& name, std::string_view recording, const std::string& version);

}  // namespace tsd
