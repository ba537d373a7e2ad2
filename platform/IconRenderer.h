#pragma once

#include <memory>
#include <string_view>

#include "platform/Value.h"

namespace platform {

/// Objects of the icon services. Dropping the last reference is their `KBRelease`.
class KBURL {
 public:
  virtual ~KBURL() = default;
};
class KBBundle {
 public:
  virtual ~KBBundle() = default;
};
class GYImage {
 public:
  virtual ~GYImage() = default;
};

/// Draws an app's home-screen icon. Null results are failures. Callable from any thread.
class IconRenderer {
 public:
  virtual ~IconRenderer() = default;

  virtual std::shared_ptr<const KBURL> KBURLCreateWithFileSystemPath(std::string_view path, bool isDirectory) = 0;
  virtual std::shared_ptr<const KBBundle> KBBundleCreate(const std::shared_ptr<const KBURL>& url) = 0;
  /// At the size and shape that suit the device.
  virtual std::shared_ptr<const GYImage> GYCreateDeviceAppropriateHomeScreenIconImageFromBundle(
      const std::shared_ptr<const KBBundle>& bundle) = 0;
};

/// An encoder of one or more images into a growing buffer.
class QGImageDestination {
 public:
  virtual ~QGImageDestination() = default;
  virtual void QGImageDestinationAddImage(const std::shared_ptr<const GYImage>& image) = 0;
  /// Completes the bytes in the buffer.
  virtual bool QGImageDestinationFinalize() = 0;
};

class ImageEncoder {
 public:
  virtual ~ImageEncoder() = default;
  /// `data` outlives the destination and is appended to. Null when the type is unknown.
  virtual std::unique_ptr<QGImageDestination> QGImageDestinationCreateWithData(Bytes& data, std::string_view type,
                                                                               std::size_t count) = 0;
};

}  // namespace platform
