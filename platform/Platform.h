#pragma once

namespace platform {

class BackupService;
class Clock;
class DPProfileConnection;
class FileSystem;
class HomeScreen;
class IconRenderer;
class ImageEncoder;
class InstallCoordination;
class InstallTransactionLog;
class Installer;
class NotificationCenter;
class OBApplicationWorkspace;
class Process;
class PropertyListSerialization;
class SystemLog;
class TSDeviceService;
class TSSupport;

/// Everything the plug-in reaches the device through. The hosting process fills it and keeps it, and all it
/// refers to, alive longer than the plug-in object and every completion handler the plug-in handed out.
struct Platform {
  Process& process;
  Clock& clock;
  FileSystem& fileSystem;
  PropertyListSerialization& propertyLists;
  SystemLog& systemLog;
  TSSupport& support;
  TSDeviceService& deviceService;
  InstallCoordination& installCoordination;
  OBApplicationWorkspace& workspace;
  Installer& installer;
  BackupService& backup;
  DPProfileConnection& restrictions;
  HomeScreen& homeScreen;
  IconRenderer& iconRenderer;
  ImageEncoder& imageEncoder;
  InstallTransactionLog& transactionLog;
  NotificationCenter& notifications;
};

}  // namespace platform
