#pragma once

#include <cstdint>
#include <memory>

#include "platform/Platform.h"
#include "platform/TSClient.h"

namespace platform {

/// What a plug-in and its host must have in common. They share C++ types, so the number grows with every change to a
/// class, a function or a constant of these headers that the two could see differently: an operation added, removed,
/// moved or given other parameters, a field added, another order of `Platform`, another meaning of a value or a promise
/// taken back. It stays for what only one side sees: comments that say more of the same, functions that are not virtual
/// and are compiled into each side, what the plug-in does behind `TSClient`. There is no partial match: a host takes a
/// plug-in of its own number and refuses any other. Both are built with the same C++ standard library.
constexpr std::uint32_t pluginInterfaceVersion = 4;

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
