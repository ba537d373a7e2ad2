#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "platform/Error.h"

namespace device {

/// The longest path and the longest name in one, in bytes; longer ones are ENAMETOOLONG in every file tree.
constexpr std::size_t longestPath = 4095;
constexpr std::size_t longestName = 255;
/// The largest file that is read at once; larger ones are EFBIG.
constexpr std::size_t largestWholeRead = std::size_t{1} << 30;

/// Splits an absolute path of the device into its names; "/" has none. Answers 0, or the error number: EINVAL for a
/// relative path, an empty name (a trailing slash makes one), ".", ".." and a zero byte. The names are borrowed from
/// the path.
int splitDevicePath(std::string_view path, std::vector<std::string_view>& names);

std::string textOfErrorNumber(int errorNumber);
/// "path: text" in one line, in the domain "FileSystem".
platform::ErrorRef fileError(int errorNumber, std::string_view path);
/// Sets the error, absent for 0. Answers whether it was 0.
bool answerFileOperation(int errorNumber, std::string_view path, platform::ErrorRef* error);

}  // namespace device
