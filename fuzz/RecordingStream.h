#pragma once

#include <string>
#include <string_view>

namespace fuzz {

/// A fuzzer changes what is compressed in a recording: changed behind the compression it would hardly ever be read.
std::string recordingOf(std::string_view stream);
std::string streamOf(std::string_view recording);

}  // namespace fuzz
