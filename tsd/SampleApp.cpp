#include "tsd/SampleApp.h"

#include <iterator>
#include <utility>

#include "tsd/SampleIcon.h"

namespace tsd {

using platform::Value;

namespace {

constexpr const char* firstParts[] = {"Quill", "Bramble", "Tarn",   "Osier",  "Fettle", "Harrow",  "Lumen", "Dapple",
                                      "Moss",  "Pocket",  "Sorrel", "Wicker", "Candle", "Thistle", "Ferry", "Gable"};
constexpr const char* secondParts[] = {"wick", "gate", "mere", "well", "fold", "stead", "low", "field"};
constexpr const char* makers[] = {"Example Works", "Sample & Daughters", "Fictional Software", "Nowhere Labs"};

std::string lowered(std::string text) {
  for (char& c : text) {
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  }
  return text;
}

/// Every pair of parts once, then again with a number.
std::string sampleName(std::size_t first, std::size_t place) {
  std::size_t pairs = std::size(firstParts) * std::size(secondParts);
  std::size_t pair = (first + place) % pairs;
  // Neighbours differ in both parts.
  std::string name = firstParts[pair % std::size(firstParts)];
  name += secondParts[(pair + pair / std::size(firstParts)) % std::size(secondParts)];
  if (place >= pairs) name += " " + std::to_string(place / pairs + 1);
  return name;
}

std::string identifierFor(const std::string& name) {
  std::string id = "com.example.";
  for (char c : lowered(name)) id += c == ' ' ? '-' : c;
  return id;
}

}  // namespace

std::uint64_t SampleNumbers::next() {
  std::uint64_t mixed = _state += 0x9e3779b97f4a7c15u;
  mixed = (mixed ^ (mixed >> 30)) * 0xbf58476d1ce4e5b9u;
  mixed = (mixed ^ (mixed >> 27)) * 0x94d049bb133111ebu;
  return mixed ^ (mixed >> 31);
}

platform::Bytes SampleNumbers::bytes(std::size_t count) {
  platform::Bytes result(count, '\0');
  for (std::size_t i = 0; i < count;) {
    std::uint64_t number = next();
    for (int byte = 0; byte < 8 && i < count; ++byte, number >>= 8) result[i++] = static_cast<char>(number & 0xff);
  }
  return result;
}

Value SampleApp::manifest() const {
  Value value = Value::makeDictionary();
  auto& entries = *value.dictionary();
  entries.set("KBBundleIdentifier", id);
  entries.set("KBBundleVersion", version);
  entries.set("KBBundleDisplayName", name);
  entries.set("KBBundleIconFile", sampleIconName);
  entries.set("OBApplicationLaunchProhibited", false);
  return value;
}

Value SampleApp::storeMetadata() const {
  Value account = Value::makeDictionary();
  account.dictionary()->set("VantorID", this->account);
  account.dictionary()->set("DSPersonID", accountNumber);
  account.dictionary()->set("AltDSID",
                            "000" + std::to_string(accountNumber % 1000) + "-08-" + lowered(maker.substr(0, 4)));
  Value downloadInfo = Value::makeDictionary();
  downloadInfo.dictionary()->set("accountInfo", account);

  Value value = Value::makeDictionary();
  auto& entries = *value.dictionary();
  entries.set("title", name);
  entries.set("itemName", name + " by " + maker);
  entries.set("artistName", maker);
  entries.set("softwareVersionBundleId", id);
  entries.set("bundleVersion", version);
  entries.set("vantorId", this->account);
  entries.set("com.vantor.HarluneStore.downloadInfo", downloadInfo);
  if (isAutoDownload) entries.set("is-auto-download", true);
  return value;
}

std::vector<SampleApp> makeSampleApps(std::size_t count, SampleNumbers& numbers) {
  std::size_t first = numbers.below(std::size(firstParts) * std::size(secondParts));
  std::vector<SampleApp> apps;
  apps.reserve(count);
  for (std::size_t i = 0; i < count; ++i) {
    SampleApp app{};
    app.name = sampleName(first, i);
    app.id = identifierFor(app.name);
    app.version = std::to_string(2 + numbers.below(6)) + "." + std::to_string(numbers.below(10));
    app.maker = makers[numbers.below(std::size(makers))];
    bool second = numbers.below(3) == 0;
    app.account = second ? "family@example.com" : "somebody@example.com";
    app.accountNumber = second ? 20517303 : 10442871;
    app.isAutoDownload = numbers.below(3) == 0;
    app.icon = drawSampleIcon(app.name, numbers);
    apps.push_back(std::move(app));
  }
  return apps;
}

}  // namespace tsd
