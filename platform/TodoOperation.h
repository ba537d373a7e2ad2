#pragma once

#include <string_view>

/// The values of a todo-list entry's "operation": what the host wants, then how far it got. Others exist and mean
/// nothing to the plug-in.
namespace platform::todo {

constexpr std::string_view install = "install";        // the host wants the app installed or updated
constexpr std::string_view remove = "remove";          // the host wants it removed
constexpr std::string_view sent = "SENT";              // the package of an asset that is no download has arrived
constexpr std::string_view downloaded = "DOWNLOADED";  // the package of a download has arrived
constexpr std::string_view installed = "INSTALLED";    // the install has ended well
constexpr std::string_view failed = "FAILED";          // it has not, or the package is not asked for

}  // namespace platform::todo
