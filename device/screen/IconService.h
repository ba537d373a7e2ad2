#pragma once

#include <memory>
#include <string_view>

#include "device/boundary/Boundary.h"
#include "device/files/FileTree.h"
#include "device/records/AppRecords.h"
#include "platform/IconRenderer.h"

namespace device {

/// The icon renderer: a bundle's icon file, a PNG, at the size that the setting "icon-size" says, with rounded corners.
/// An icon file that is larger than 16 MiB or has more than 4096 pixels in either direction is not decoded.
class IconService final : public platform::IconRenderer {
 public:
  IconService(AppRecords& records, FileTree& files, Boundary& boundary)
      : _records(records), _files(files), _boundary(boundary) {}

  std::shared_ptr<const platform::KBURL> KBURLCreateWithFileSystemPath(std::string_view path,
                                                                       bool isDirectory) override;
  std::shared_ptr<const platform::KBBundle> KBBundleCreate(const std::shared_ptr<const platform::KBURL>& url) override;
  std::shared_ptr<const platform::GYImage> GYCreateDeviceAppropriateHomeScreenIconImageFromBundle(
      const std::shared_ptr<const platform::KBBundle>& bundle) override;

 private:
  int iconSize();

  AppRecords& _records;
  FileTree& _files;
  Boundary& _boundary;
};

/// The encoder of "public.png".
class PNGEncoder final : public platform::ImageEncoder {
 public:
  explicit PNGEncoder(Boundary& boundary) : _boundary(boundary) {}

  std::unique_ptr<platform::QGImageDestination> QGImageDestinationCreateWithData(platform::Bytes& data,
                                                                                 std::string_view type,
                                                                                 std::size_t count) override;

 private:
  Boundary& _boundary;
};

}  // namespace device
