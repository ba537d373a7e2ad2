#include <dlfcn.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <vector>

#include "contract/Host.h"
#include "device/LocalDevice.h"
#include "tests/SampleContent.h"

// The local device under the contract suite: on disk and in memory with events delivered by hand, and with its threads.
// The suite is loaded like a plug-in: what it gives to the device and gets from it crosses from one copy of platform/
// to another.
namespace {

class LocalHost final : public contract::Host {
 public:
  enum class Medium { disk, memory };
  LocalHost(Medium medium, std::unique_ptr<device::EventQueue> events) {
    if (medium == Medium::disk) {
      std::string pattern = std::filesystem::temp_directory_path() / "contract-XXXXXX";
      _folder = ::mkdtemp(pattern.data());
      device::createDevice(_folder);
      _device = device::openDevice(_folder, std::move(events), {});
    } else {
      _device = device::makeMemoryDevice(std::move(events), {});
    }
  }
  ~LocalHost() override {
    _device->events().stop();
    _device.reset();
    if (!_folder.empty()) std::filesystem::remove_all(_folder);
  }
  const platform::Platform& platform() override { return _device->platform(); }
  void deliver() override {
    _device->events().release();
    _device->events().drain();
  }
  platform::Bytes packageOf(const std::string& app, const std::string& version) override {
    return tests::packageOf(app, version);
  }

 private:
  std::string _folder;
  std::unique_ptr<device::LocalDevice> _device;
};

using Hosts = std::vector<contract::NamedHost>;
using RunContract = int (*)(int count, char** arguments, const Hosts& hosts);

}  // namespace

int main(int count, char** arguments) {
  using Medium = LocalHost::Medium;
  const Hosts hosts = {
      {"Disk", [] { return std::make_unique<LocalHost>(Medium::disk, device::makeManualEventQueue()); }},
      {"Memory", [] { return std::make_unique<LocalHost>(Medium::memory, device::makeManualEventQueue()); }},
      {"Threads", [] { return std::make_unique<LocalHost>(Medium::memory, device::makeThreadedEventQueue()); }}};
  void* suite = ::dlopen(CONTRACT_SUITE, RTLD_NOW | RTLD_LOCAL);
  void* symbol = suite ? ::dlsym(suite, "runContract") : nullptr;
  if (symbol) return reinterpret_cast<RunContract>(symbol)(count, arguments, hosts);
  std::fprintf(stderr, "%s\n", ::dlerror());
  return 1;
}
