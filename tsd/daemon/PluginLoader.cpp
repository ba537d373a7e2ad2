#include "tsd/daemon/PluginLoader.h"

#include <dlfcn.h>

#include <filesystem>

#include "tsd/CommandError.h"

namespace tsd {

PluginLoader::PluginLoader(const std::string& file) : _file(file) {
  std::error_code problem;
  if (!std::filesystem::is_regular_file(file, problem)) throw CommandError(file + ": the plug-in is not there");
  // A name without a slash would be looked for on the system's library path.
  std::string path = std::filesystem::absolute(file, problem).string();
  void* library = ::dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
  if (!library) {
    const char* reason = ::dlerror();
    throw CommandError(file + ": cannot be loaded as a plug-in: " + (reason ? reason : "unknown reason"));
  }
  void* symbol = ::dlsym(library, platform::pluginEntryPointName);
  if (!symbol) {
    throw CommandError(file + ": not a plug-in: it has no entry point '" + platform::pluginEntryPointName + "'");
  }
  _table = reinterpret_cast<platform::PluginEntryPoint>(symbol)();
  if (!_table) throw CommandError(file + ": its entry point returns no table");
  if (_table->interfaceVersion != platform::pluginInterfaceVersion) {
    throw CommandError(file + ": speaks version " + std::to_string(_table->interfaceVersion) +
                       " of the plug-in interface, this program version " +
                       std::to_string(platform::pluginInterfaceVersion));
  }
  if (!_table->dataclass || !_table->create) throw CommandError(file + ": its plug-in table is incomplete");
}

std::string PluginLoader::defaultFile() {
  constexpr const char* name = "libApplicationSync.so";
  std::error_code problem;
  auto program = std::filesystem::read_symlink("/proc/self/exe", problem);
  if (problem) return name;
  auto beside = program.parent_path() / name;
  auto installed = program.parent_path() / PLUGIN_FOLDER / name;
  bool isInstalled = !std::filesystem::exists(beside, problem) && std::filesystem::exists(installed, problem);
  return (isInstalled ? installed.lexically_normal() : beside).string();
}

std::shared_ptr<platform::TSClient> PluginLoader::create(const platform::Platform& platform) const {
  auto client = _table->create(platform);
  if (!client) throw CommandError(_file + ": the plug-in could not make its object");
  return client;
}

}  // namespace tsd
