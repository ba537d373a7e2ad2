#pragma once

#include "EventQueue.h"
#include "HomeScreen.h"
#include "InstallService.h"
#include "InstallerService.h"
#include "MemoryFiles.h"
#include "Notifications.h"
#include "Registry.h"
#include "SmallServices.h"
#include "platform/Platform.h"

namespace tiny {

/// Every service the plug-in asks for. Kept alive longer than the plug-in; the last events are delivered before it
/// goes.
class TinyDevice {
 public:
  EventQueue& events() { return _events; }
  MemoryFiles& files() { return _files; }
  Registry& registry() { return _registry; }
  const platform::Platform& platform() { return _platform; }

 private:
  EventQueue _events;
  MemoryFiles _files;
  Process _process{_files};
  PropertyLists _propertyLists;
  SystemLog _systemLog;
  Support _support;
  DeviceService _deviceService;
  Registry _registry{_events};
  InstallerService _installer;
  InstallService _installs{_events, _files, _registry, _installer};
  Backup _backup;
  Restrictions _restrictions;
  HomeScreen _homeScreen;
  Icons _icons;
  TransactionLog _transactionLog;
  Notifications _notifications{_events};
  const platform::Platform _platform{_process,        _events,        _files,      _propertyLists, _systemLog,
                                     _support,        _deviceService, _installs,   _registry,      _installer,
                                     _backup,         _restrictions,  _homeScreen, _icons,         _icons,
                                     _transactionLog, _notifications};
};

}  // namespace tiny
