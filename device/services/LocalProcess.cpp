#include "device/services/LocalProcess.h"

#include <cstdlib>
#include <memory>
#include <utility>

#include "device/files/DevicePath.h"
#include "plist/PropertyList.h"

namespace device {

using platform::Value;

LocalProcess::LocalProcess(Boundary& boundary, FileTree& files, std::string mainBundleIdentifier)
    : _boundary(boundary), _files(files), _mainBundleIdentifier(std::move(mainBundleIdentifier)) {
  _files.createDirectory(temporaryDirectoryPath, true, {});
}

std::string LocalProcess::mainBundleIdentifier() {
  return _boundary.call({{"Process", "mainBundleIdentifier"}}, nullptr, {}, [&] { return _mainBundleIdentifier; });
}

std::string LocalProcess::temporaryDirectory() {
  return _boundary.call({{"Process", "temporaryDirectory"}}, nullptr, {},
                        [] { return std::string(temporaryDirectoryPath); });
}

std::string LocalProcess::textOfErrorNumber(int errorNumber) {
  return _boundary.call({{"Process", "textOfErrorNumber"}}, nullptr, {{"errorNumber", errorNumber}},
                        [&] { return device::textOfErrorNumber(errorNumber); });
}

void LocalProcess::deallocateMemory(void* buffer, std::size_t length) {
  // Whatever is injected, and whoever listens and throws: nobody else has it any more.
  const std::unique_ptr<void, decltype(&std::free)> given(buffer, &std::free);
  _boundary.call({{"Process", "deallocateMemory"}}, nullptr, {{"length", length}}, [] {});
}

Value LocalProcess::infoDictionaryOfBundleAtPath(std::string_view path) {
  return _boundary.call({{"Process", "infoDictionaryOfBundleAtPath"}}, nullptr, {{"path", path}}, [&] {
    auto bytes = _files.readFile(std::string(path) + "/Info.plist");
    Value info = bytes ? plist::read(std::move(*bytes)) : Value();
    return info.dictionary() ? std::move(info) : Value();
  });
}

}  // namespace device
