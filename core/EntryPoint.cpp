#include "core/AppsClient.h"
#include "platform/DeviceNames.h"
#include "platform/Plugin.h"

/// What the hosting process looks up in the library; `platform/Plugin.h` describes the table.
extern "C" __attribute__((visibility("default"))) const platform::PluginTable* TSPluginTable() {
  static const platform::PluginTable table{
      platform::pluginInterfaceVersion, platform::dataclassApplication.data(),
      [](const platform::Platform& platform) -> std::shared_ptr<platform::TSClient> {
        return appsync::AppsClient::init(platform);
      }};
  return &table;
}
