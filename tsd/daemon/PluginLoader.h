#pragma once

#include <memory>
#include <string>

#include "platform/Plugin.h"

namespace tsd {

/// The plug-in's library. It stays loaded until the process ends, since what the plug-in handed out may outlive its
/// object.
class PluginLoader {
 public:
  /// Loads the file. Throws a `CommandError` that names the file and what is wrong: it cannot be loaded, it has no
  /// entry point, its interface has another version, its table is incomplete.
  explicit PluginLoader(const std::string& file);

  /// The plug-in beside this program, or where the two are installed together.
  static std::string defaultFile();

  /// The plug-in object, one per process. Throws a `CommandError` when it cannot be made.
  std::shared_ptr<platform::TSClient> create(const platform::Platform& platform) const;
  std::string dataclass() const { return _table->dataclass; }

 private:
  std::string _file;
  const platform::PluginTable* _table = nullptr;
};

}  // namespace tsd
