#include "device/screen/HomeScreenService.h"

#include <cstdlib>
#include <cstring>

#include "device/records/RecordCodec.h"
#include "device/screen/IconLayout.h"
#include "plist/PropertyList.h"

namespace device {

namespace {

constexpr const char* className = "HomeScreen";
constexpr platform::HomeScreen::Port serverPort = 1;
constexpr int flattenedForm = 1;

// What the operations answer besides 0.
constexpr int invalidArgument = 22;
constexpr int outOfMemory = 12;
constexpr int notStored = 5;

}  // namespace

platform::HomeScreen::Port HomeScreenService::PNSPanelloBlockableServerPort() {
  return _boundary.call({{className, "PNSPanelloBlockableServerPort"}}, nullptr, {}, [] { return serverPort; });
}

int HomeScreenService::PNGetFlattenedIconState(Port port, int form, void** buffer, std::size_t* length) {
  if (buffer) *buffer = nullptr;
  if (length) *length = 0;
  auto flattened = [&] {
    if (!buffer || !length || form != flattenedForm) return invalidArgument;
    auto order = platform::Value::makeArray();
    {
      AppRecords::Lock lock(_records);
      for (const auto& id : _records.state().homeOrder()) order.array()->append(id);
    }
    if (order.array()->empty()) return 0;
    auto bytes = plist::writeBinary(order);
    void* copy = bytes ? std::malloc(bytes->size()) : nullptr;
    if (!copy) return outOfMemory;
    std::memcpy(copy, bytes->data(), bytes->size());
    *buffer = copy;
    *length = bytes->size();
    return 0;
  };
  return _boundary.call({{className, "PNGetFlattenedIconState"}}, nullptr, {{"port", port}, {"form", form}}, flattened,
                        notStored);
}

int HomeScreenService::PNSetIconState(Port port, platform::BytesView layout) {
  std::string problem;
  auto set = [&] {
    platform::ErrorRef error;
    const platform::Value value = plist::read(platform::Bytes(layout), &error);
    problem = error ? error->description() : problemOfLayout(value).text;
    auto parsed = layoutOfValue(value);
    if (!parsed) return invalidArgument;
    ChangeSet changes;
    changes.setLayout(std::move(*parsed));
    AppRecords::Lock lock(_records);
    return _records.commit(std::move(changes)) ? 0 : notStored;
  };
  const int status =
      _boundary.call({{className, "PNSetIconState"}}, nullptr,
                     {{"port", port}, {"layout", CallArgument::BytesCount{layout.size()}}}, set, notStored);
  if (!problem.empty() && _refused) _refused(problem);
  return status;
}

}  // namespace device
