#pragma once

#include <string>
#include <string_view>

#include "device/boundary/Boundary.h"
#include "platform/Value.h"
#include "record/RecordedCalls.h"

namespace tsd {

/// As the device's journal has it, which the readers of journals know. A message has its text alone.
device::CallRecord journalRecordOf(const record::RecordedCall& call);
/// What the plug-in needs to write a message, beside the writing: of that no journal tells.
bool isPreparation(const record::RecordedCall& call);

/// All that the report's page can show of a recording, which knows no home screen and no device. `name` is the file's.
/// Throws a `CommandError` at what is no recording.
platform::Value recordingDocument(const std::string& name, std::string_view recording, const std::string& version);

}  // namespace tsd
