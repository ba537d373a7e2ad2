#include "tsd/sample/SampleApp.h"

#include <initializer_list>
#include <iterator>
#include <string_view>
#include <utility>

#include "tsd/sample/SampleIcon.h"

namespace tsd {

using platform::Value;

namespace {

constexpr const char* firstParts[] = {"Quill", "Bramble", "Tarn",   "Osier",  "Fettle", "Harrow",  "Lumen", "Dapple",
                                      "Moss",  "Pocket",  "Sorrel", "Wicker", "Candle", "Thistle", "Ferry", "Gable"};
constexpr const char* secondParts[] = {"wick", "gate", "mere", "well", "fold", "stead", "low", "field"};
constexpr const char* makers[] = {"Example Works", "Sample & Daughters", "Fictional Software", "Nowhere Labs"};
// The names of every fifth app, and their languages.
constexpr const char* otherNames[] = {"Grünspecht", "Тихий сад",    "静かな庭", "حديقة هادئة",
                                      "शांत बाग",    "Ήσυχος κήπος", "สวนเงียบ"};
constexpr const char* otherLanguages[] = {"de", "ru", "ja", "ar", "hi", "el", "th"};

Value dictionaryOf(std::initializer_list<std::pair<std::string_view, Value>> entries) {
  Value value = Value::makeDictionary();
  for (const auto& [key, entry] : entries) value.dictionary()->set(key, entry);
  return value;
}

Value arrayOf(std::initializer_list<Value> elements) {
  Value value = Value::makeArray();
  for (const auto& element : elements) value.array()->append(element);
  return value;
}

std::string lowered(std::string text) {
  for (char& c : text) {
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  }
  return text;
}

/// Every pair of parts once, then all of them again with a number.
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

platform::Date SampleNumbers::date() { return {static_cast<double>(below(800'000'000))}; }

platform::Bytes SampleNumbers::bytes(std::size_t count) {
  platform::Bytes result(count, '\0');
  for (std::size_t i = 0; i < count;) {
    std::uint64_t number = next();
    for (int byte = 0; byte < 8 && i < count; ++byte, number >>= 8) result[i++] = static_cast<char>(number & 0xff);
  }
  return result;
}

// NOLINTNEXTLINE(readability-function-size): a list of 40 keys
Value SampleApp::manifest() const {
  SampleNumbers numbers(seed);
  Value names = dictionaryOf({});
  for (std::size_t i = 0; i < std::size(otherNames); ++i)
    names.dictionary()->set(otherLanguages[i], std::string(otherNames[i]));
  const Value document = dictionaryOf({{"Name", name + " drawing"},
                                       {"Extensions", arrayOf({"draw", "sketch"})},
                                       {"Role", "Editor"},
                                       {"Icons", arrayOf({})}});
  const Value exception = dictionaryOf({{"Subdomains", true}, {"Secure", false}, {"Oldest", 1.2}});
  return dictionaryOf({
      {"Executable", id.substr(id.rfind('.') + 1)},
      {"DevelopmentRegion", "en"},
      {"InterfaceVersion", 6},
      {"MinimumSystem", "12.0"},
      {"Category", "Travel"},
      {"Copyright", "© " + maker},
      {"BuildDate", numbers.date()},
      {"BuildNumber", numbers.below(100000)},
      {"BuildMachine", "builder-" + std::to_string(numbers.below(40))},
      {"Compiler", dictionaryOf({{"Name", "example"}, {"Version", "11.2"}, {"Flags", arrayOf({"fast", "small"})}})},
      {"KBBundleIdentifier", id},
      {"KBBundleVersion", version},
      {"KBBundleDisplayName", name},
      {"KBBundleIconFile", sampleIconName},
      {"OBApplicationLaunchProhibited", false},
      {"Encrypted", false},
      {"StatusBarHidden", true},
      {"Scale", 2.5},
      {"DeviceFamilies", arrayOf({1, 2})},
      {"Orientations", arrayOf({"upright", "left", "right"})},
      {"Capabilities", arrayOf({"camera", "compass", "metal-free"})},
      {"BackgroundModes", arrayOf({"audio", "location"})},
      {"Languages", arrayOf({"en", "de", "el", "ru", "ar", "hi", "ja", "th"})},
      {"Names", names},
      {"Permissions", dictionaryOf({{"camera", name + " takes pictures"}, {"contacts", "Finds your friends"}})},
      {"Documents", arrayOf({document, dictionaryOf({{"Name", "Anything"}, {"Role", "Viewer"}})})},
      {"Links", arrayOf({dictionaryOf({{"Scheme", "example-" + id}, {"Handler", "main"}})})},
      {"Fonts", arrayOf({"Fonts/plain.font", "Fonts/größer.font"})},
      {"Launch", dictionaryOf({{"Picture", "launch.png"}, {"Colour", arrayOf({0.25, 0.5, 1.0})}})},
      {"Network", dictionaryOf({{"Secure", true}, {"Exceptions", dictionaryOf({{"example.com", exception}})}})},
      {"Checksum", Value::makeData(numbers.bytes(32))},
      {"Certificate", Value::makeData(numbers.bytes(300))},
      {"Services", dictionaryOf({{"push", true}, {"keychain", arrayOf({id, "shared"})}, {"none", dictionaryOf({})}})},
      {"Extensions", arrayOf({id + ".share", id + ".today"})},
      {"Shortcuts", arrayOf({dictionaryOf({{"Title", "New drawing"}, {"Icon", "plus"}, {"Place", 0}})})},
      {"Accessibility", dictionaryOf({{"reader", true}, {"largestText", 3.5}})},
      {"Age", 4},
      {"LargestMemory", std::uint64_t{1} << 33},
      {"Website", "https://example.com/" + id},
      {"Note", ""},
  });
}

Value SampleApp::storeMetadata() const {
  SampleNumbers numbers(seed + 1);
  const Value owner =
      dictionaryOf({{"VantorID", account},
                    {"DSPersonID", accountNumber},
                    {"AltDSID", "000" + std::to_string(accountNumber % 1000) + "-08-" + lowered(maker.substr(0, 4))}});
  Value value = dictionaryOf({
      {"itemId", 1000000000 + numbers.below(1u << 30)},
      {"kind", "software"},
      {"genre", "Travel"},
      {"genreId", 6003},
      {"subgenres", arrayOf({dictionaryOf({{"genre", "Maps"}, {"genreId", 7011}}), dictionaryOf({{"genreId", 7012}})})},
      {"releaseDate", numbers.date()},
      {"purchaseDate", numbers.date()},
      {"title", name},
      {"itemName", name + " by " + maker},
      {"artistName", maker},
      {"artistId", numbers.below(1u << 30)},
      {"softwareVersionBundleId", id},
      {"bundleVersion", version},
      {"vantorId", account},
      {"com.vantor.HarluneStore.downloadInfo",
       dictionaryOf({{"accountInfo", owner}, {"purchaseDate", numbers.date()}})},
      {"price", 0},
      {"priceDisplay", "Χωρίς χρέωση"},
      {"rating", dictionaryOf({{"label", "4+"}, {"rank", 100}, {"system", "example"}})},
      {"storefront", 143441},
      {"copyright", "© " + maker},
      {"languages", arrayOf({"English", "Deutsch", "Ελληνικά", "русский", "العربية", "हिन्दी", "日本語", "ไทย"})},
      {"screenshots", arrayOf({"https://example.com/1.png", "https://example.com/2.png"})},
      {"artwork", Value::makeData(numbers.bytes(64))},
      {"gameCenter", false},
      {"averageRating", static_cast<double>(numbers.below(50)) / 10},
  });
  if (isAutoDownload) value.dictionary()->set("is-auto-download", true);
  return value;
}

Value SampleApp::todoEntry(std::string_view operation) const {
  SampleNumbers numbers(seed + 2);
  return dictionaryOf({
      {"kind", "software"},
      {"size", 1000 + numbers.below(1u << 28)},
      {"genre", "Travel"},
      {"added", numbers.date()},
      {"identifier", id},
      {"operation", operation},
      {"version", version},
      {"name", name},
      {"maker", maker},
      {"folder", arrayOf({"Reise", "путешествие", "旅行"})},
      {"rating", dictionaryOf({{"label", "4+"}, {"rank", 100}})},
      {"checksum", Value::makeData(numbers.bytes(20))},
      {"chosen", true},
      {"weight", 0.5},
  });
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
    app.files = i % 8 == 5 ? 40 : 3 + numbers.below(10);
    app.seed = numbers.next();
    if (i % 5 == 3) {
      std::size_t other = i / 5;
      app.name = otherNames[other % std::size(otherNames)];
      if (other >= std::size(otherNames)) app.name += " " + std::to_string(other / std::size(otherNames) + 1);
    }
    apps.push_back(std::move(app));
  }
  return apps;
}

}  // namespace tsd
