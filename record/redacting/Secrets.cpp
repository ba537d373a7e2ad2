#include "record/redacting/Secrets.h"

#include <algorithm>
#include <array>
#include <cstdio>

#include "platform/DeviceNames.h"
#include "platform/DevicePaths.h"
#include "platform/TodoOperation.h"

namespace record {

namespace {

/// What decides over what the plug-in does, or is said by it.
constexpr std::string_view fixedTexts[] = {platform::todo::install,
                                           platform::todo::remove,
                                           platform::todo::installed,
                                           platform::todo::failed,
                                           platform::todo::downloaded,
                                           platform::todo::sent,
                                           platform::dataclassApplication,
                                           platform::daemonBundleIdentifier,
                                           platform::migrationBundleIdentifier,
                                           platform::startupNotificationName,
                                           platform::syncNotificationName,
                                           "User",
                                           "System",
                                           "mobile",
                                           "unknown"};
/// Of entries that the plug-in reads or writes.
constexpr std::string_view fixedKeys[] = {"identifier",
                                          "operation",
                                          "version",
                                          "name",
                                          "path",
                                          "title",
                                          "itemName",
                                          "bundleVersion",
                                          "launchProhibited",
                                          "OBApplicationLaunchProhibited",
                                          "KBBundleIdentifier",
                                          "KBBundleVersion",
                                          "KBBundleDisplayName",
                                          "vantorId",
                                          "VantorID",
                                          "com.vantor.HarluneStore.downloadInfo",
                                          "accountInfo",
                                          "DSPersonID",
                                          "AltDSID",
                                          "is-auto-download",
                                          "HarluneMetadata",
                                          "ApplicationSINF",
                                          "PlaceholderIcon",
                                          "AutomaticDowngrades",
                                          "IntentionalDowngrades",
                                          "AssetParts",
                                          "Version",
                                          "_Count",
                                          "_PhysicalSize",
                                          "_PurgeableSize",
                                          "_Deleted",
                                          "FXFileOwnerAccountName",
                                          "FXFileGroupOwnerAccountName"};
constexpr std::string_view fixedPlaces[] = {platform::todoListDebugPath,
                                            platform::iconLayoutPath,
                                            platform::lastSyncListPath,
                                            platform::sortOrderPath,
                                            platform::restoreStatePath,
                                            platform::packagesDirectory,
                                            platform::stagingDirectory,
                                            platform::restoreListPath,
                                            platform::restoreListLogPath,
                                            platform::demotedAppsPath,
                                            platform::iconScratchDirectory,
                                            platform::todoListPath,
                                            "HarluneMetadata.plist",
                                            "HarluneArtwork",
                                            "Info.plist",
                                            "Icon.png",
                                            "private/tmp/com.vantor.tsd.Apps",
                                            "containers/Bundle/Application"};
constexpr std::string_view fileEndings[] = {".app", ".pkg", ".png", ".plist"};
// Of an account; shorter ones are of no account, and stand everywhere.
constexpr std::uint64_t smallestSecretNumber = 10000;

bool isWordByte(char c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_' ||
         static_cast<unsigned char>(c) >= 0x80;
}

bool isLetter(char c) { return isWordByte(c) && !(c >= '0' && c <= '9') && c != '_'; }

/// Versions, counts, dates: nothing with a letter in it.
bool isNumeric(std::string_view text) { return std::none_of(text.begin(), text.end(), isLetter); }

bool isHexadecimal(char c) { return (c >= '0' && c <= '9') || (c >= 'A' && c <= 'F') || (c >= 'a' && c <= 'f'); }

/// A name that a device makes by chance.
bool isDrawn(std::string_view name) {
  return name.size() >= 32 &&
         std::all_of(name.begin(), name.end(), [](char c) { return isHexadecimal(c) || c == '-'; });
}

template <class Visit>
void forEachPart(std::string_view path, Visit visit) {
  while (!path.empty()) {
    const auto end = std::min(path.find('/'), path.size());
    if (end > 0) visit(path.substr(0, end));
    path.remove_prefix(std::min(end + 1, path.size()));
  }
}

const std::set<std::string_view>& fixedParts() {
  static const std::set<std::string_view> parts = [] {
    std::set<std::string_view> found;
    for (auto path : fixedPlaces) forEachPart(path, [&](std::string_view part) { found.insert(part); });
    return found;
  }();
  return parts;
}

bool isFixed(std::string_view text) {
  return std::find(std::begin(fixedTexts), std::end(fixedTexts), text) != std::end(fixedTexts) ||
         std::find(std::begin(fixedKeys), std::end(fixedKeys), text) != std::end(fixedKeys) ||
         fixedParts().contains(text);
}

bool isIdentifier(std::string_view text) {
  return text.find('.') != text.npos &&
         std::all_of(text.begin(), text.end(), [](char c) { return (isWordByte(c) && c > 0) || c == '.' || c == '-'; });
}

}  // namespace

bool isTellingKey(std::string_view key) {
  return isIdentifier(key) || key.find('@') != key.npos ||
         std::any_of(key.begin(), key.end(), [](char c) { return static_cast<unsigned char>(c) >= 0x80; });
}

void Secrets::addPath(std::string_view path) {
  forEachPart(path, [this](std::string_view part) {
    if (part.size() < 2 || isFixed(part) || isDrawn(part)) return;
    for (auto ending : fileEndings) {
      if (part.size() > ending.size() && part.ends_with(ending)) {
        part.remove_suffix(ending.size());
        break;
      }
    }
    if (!isNumeric(part)) _replacements.try_emplace(std::string(part));
  });
}

void Secrets::add(std::string_view text) {
  if (text.size() < 2 || isNumeric(text) || isFixed(text) || isDrawn(text) || _kept.contains(text)) return;
  if (text.find('/') != text.npos) return addPath(text);
  _replacements.try_emplace(std::string(text));
}

void Secrets::add(std::uint64_t number) {
  if (number >= smallestSecretNumber) _replacements.try_emplace(std::to_string(number));
}

void Secrets::number() {
  std::erase_if(_replacements, [this](const auto& entry) { return _kept.contains(entry.first); });
  std::size_t rank = 0;
  for (auto& [text, replacement] : _replacements) {
    std::array<char, 24> digits{};
    const bool isNumber = isNumeric(text);
    std::snprintf(digits.data(), digits.size(), isNumber ? "1%06zu" : "x%06zu", ++rank);
    replacement = digits.data();
    if (isNumber) continue;
    if (text.find('@') != text.npos) replacement += "@account.invalid";
    if (!isIdentifier(text)) continue;
    for (auto dots = std::count(text.begin(), text.end(), '.'); dots > 0; --dots) replacement += ".x";
  }
}

/// The longest secret with which the text begins.
std::string_view Secrets::longestAt(std::string_view text) const {
  const auto isWhole = [&](std::string_view secret) {
    return secret.size() == text.size() || !isWordByte(secret.back()) || !isWordByte(text[secret.size()]);
  };
  std::string_view searched = text;
  while (!searched.empty()) {
    auto next = _replacements.upper_bound(searched);
    if (next == _replacements.begin()) return {};
    const std::string& before = std::prev(next)->first;
    const auto common = static_cast<std::size_t>(
        std::mismatch(before.begin(), before.end(), searched.begin(), searched.end()).first - before.begin());
    if (common == before.size() && isWhole(before)) return before;
    searched = searched.substr(0, common == searched.size() || common == before.size() ? common - 1 : common);
  }
  return {};
}

std::string Secrets::replaced(std::string_view text) const {
  std::string result;
  result.reserve(text.size());
  for (std::size_t at = 0; at < text.size();) {
    const bool begins = at == 0 || !isWordByte(text[at - 1]) || !isWordByte(text[at]);
    const auto secret = begins ? longestAt(text.substr(at)) : std::string_view();
    if (secret.empty()) {
      result += text[at++];
    } else {
      result += _replacements.find(secret)->second;
      at += secret.size();
    }
  }
  return result;
}

std::uint64_t Secrets::replaced(std::uint64_t number) const {
  auto found = _replacements.find(std::to_string(number));
  return found == _replacements.end() ? number : std::stoull(found->second);
}

/// They are numbered, so that what they were is not to be found from this.
std::string Secrets::replacedBytes(platform::BytesView bytes) {
  std::uint64_t hash = 14695981039346656037u;
  for (char c : bytes) hash = (hash ^ static_cast<unsigned char>(c)) * 1099511628211u;
  const auto number = _contents.try_emplace({bytes.size(), hash}, _contents.size() + 1).first->second;
  std::string other(bytes.size(), '\0');
  for (std::size_t at = 0; at < other.size() && at < sizeof number; ++at)
    other[at] = static_cast<char>(number >> 8 * at);
  return other;
}

}  // namespace record
