// The contract suite on this device: the tests are the library's, the device is ours.

#include "TinyDevice.h"
#include "contract/Host.h"

namespace {

class TinyHost final : public contract::Host {
 public:
  const platform::Platform& platform() override { return _device.platform(); }
  void deliver() override { _device.events().deliver(); }
  platform::Bytes packageOf(const std::string& app, const std::string& version) override {
    return "<plist version=\"1.0\"><dict><key>KBBundleIdentifier</key><string>" + app +
           "</string><key>KBBundleVersion</key><string>" + version + "</string></dict></plist>";
  }

 private:
  tiny::TinyDevice _device;
};

}  // namespace

std::vector<contract::NamedHost> contract::hosts() {
  return {{"tiny", [] { return std::make_unique<TinyHost>(); }}};
}
