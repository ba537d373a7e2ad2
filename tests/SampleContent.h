#pragma once

#include <initializer_list>
#include <string>
#include <string_view>
#include <utility>

#include "platform/Value.h"

namespace tests {

platform::Value dictionaryOf(std::initializer_list<std::pair<std::string_view, platform::Value>> entries);
/// An archive of "Maps.app" with a manifest of that identifier and version, and one more file.
platform::Bytes packageOf(const std::string& identifier, const std::string& version);
/// A PNG of one colour.
platform::Bytes pngOf(int width, int height);

}  // namespace tests
