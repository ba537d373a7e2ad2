#pragma once

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <map>
#include <memory>
#include <string>

#include "platform/BackupService.h"
#include "platform/DPProfileConnection.h"
#include "platform/FileSystem.h"
#include "platform/IconRenderer.h"
#include "platform/InstallTransactionLog.h"
#include "platform/Process.h"
#include "platform/PropertyListSerialization.h"
#include "platform/TSDeviceService.h"
#include "platform/TSSupport.h"
#include "plist/PropertyList.h"

/// The services of which a device like this has little to say.
namespace tiny {

class Process final : public platform::Process {
 public:
  explicit Process(platform::FileSystem& files) : _files(files) {}
  /// The daemon's own name: the plug-in listens to installs only there.
  std::string mainBundleIdentifier() override { return "com.vantor.tsd"; }
  std::string temporaryDirectory() override { return "/tmp"; }
  std::string textOfErrorNumber(int errorNumber) override { return std::strerror(errorNumber); }
  void deallocateMemory(void* buffer, std::size_t) override { std::free(buffer); }
  platform::Value infoDictionaryOfBundleAtPath(std::string_view path) override {
    auto bytes = _files.readFile(std::string(path) + "/Info.plist");
    platform::Value info = bytes ? plist::read(std::move(*bytes)) : platform::Value();
    return info.dictionary() ? info : platform::Value();
  }

 private:
  platform::FileSystem& _files;
};

class PropertyLists final : public platform::PropertyListSerialization {
 public:
  platform::Value propertyListWithData(platform::Bytes bytes, platform::ErrorRef* error) override {
    return plist::read(std::move(bytes), error);
  }
  std::optional<platform::Bytes> dataWithPropertyList(const platform::Value& value, platform::PropertyListFormat format,
                                                      platform::ErrorRef* error) override {
    bool binary = format == platform::PropertyListFormat::binary;
    return binary ? plist::writeBinary(value, error) : plist::writeXML(value, error);
  }
};

/// Shows errors on standard error and drops the rest.
class Log final : public platform::LogHandle {
 public:
  bool isEnabled(platform::LogLevel level) const override { return level == platform::LogLevel::error; }
  void write(platform::LogLevel level, std::string_view message) override {
    if (isEnabled(level)) std::fprintf(stderr, "%.*s\n", static_cast<int>(message.size()), message.data());
  }
};

class SystemLog final : public platform::SystemLog {
  std::shared_ptr<platform::LogHandle> createHandle(std::string_view, std::string_view) override {
    return std::make_shared<Log>();
  }
};

class Support final : public platform::TSSupport {
 public:
  platform::LogHandle& TSGetLogCategory(int) override { return _log; }
  std::shared_ptr<platform::TSMutableAccountInfo> makeAccountInfo() override {
    return nullptr;
  }  // it knows no accounts

 private:
  Log _log;
};

class TransactionLog final : public platform::InstallTransactionLog {
  void initializeWithLog(std::shared_ptr<platform::LogHandle>) override {}
  void logStep(int, int, int, bool, std::string_view, std::string_view) override {}
  void logScenario(std::string_view, int, bool, std::string_view, std::string_view) override {}
};

/// A queue of transfers that is what it is: nothing in it can be moved or stopped.
class DeviceService final : public platform::TSDeviceService {
  bool respondsToPrioritizeAsset() const override { return false; }
  void prioritizeAsset(const platform::TSAssetRef&, std::function<void(platform::ErrorRef)>) override {}
  bool respondsToCancelAssetTransferForFailedAsset() const override { return false; }
  void cancelAssetTransferForFailedAsset(const platform::TSAssetRef&) override {}
};

class Backup final : public platform::BackupService {
  std::shared_ptr<platform::CLManager> makeBackupManager() override { return nullptr; }
};

class Restrictions final : public platform::DPProfileConnection {
  int effectiveBoolValueForSetting(std::string_view) override { return 1; }
};

/// Draws no icons: every app has the device's own.
class Icons final : public platform::IconRenderer, public platform::ImageEncoder {
  std::shared_ptr<const platform::KBURL> KBURLCreateWithFileSystemPath(std::string_view, bool) override {
    return nullptr;
  }
  std::shared_ptr<const platform::KBBundle> KBBundleCreate(const std::shared_ptr<const platform::KBURL>&) override {
    return nullptr;
  }
  std::shared_ptr<const platform::GYImage> GYCreateDeviceAppropriateHomeScreenIconImageFromBundle(
      const std::shared_ptr<const platform::KBBundle>&) override {
    return nullptr;
  }
  std::unique_ptr<platform::QGImageDestination> QGImageDestinationCreateWithData(platform::Bytes&, std::string_view,
                                                                                 std::size_t) override {
    return nullptr;
  }
};

}  // namespace tiny
