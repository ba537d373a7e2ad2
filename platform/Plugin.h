#pragma once

#include <cstdint>
#include <memory>

#include "platform/Platform.h"
#include "platform/TSClient.h"

namespace platform {

/// Grows whenever an interface in this folder changes in a way that a plug-in or a host built before would not survive.
constexpr std::uint32_t pluginInterfaceVersion = 1;

/// What a plug-in's library answers from its entry point. The first field never moves; a host looks at the others
/// only when the version is its own.
struct PluginTable {
  std::uint32_t interfaceVersion;
  const char* dataclass;
  /// The plug-in object, one per process; null when it cannot be made. Throws nothing.
  std::shared_ptr<TSClient> (*create)(const Platform& platform);
};

/// Type and name of the entry point.
using PluginEntryPoint = const PluginTable* (*)();
constexpr const char* pluginEntryPointName = "TSPluginTable";

}  // namespace platform
