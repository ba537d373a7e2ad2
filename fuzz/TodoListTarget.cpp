// A host's todo list, through a whole sync: reconciliation, outstanding transfers, packages that arrive or do not.

#include <cstdint>
#include <set>
#include <string>

#include "fuzz/MemoryPhone.h"
#include "fuzz/Require.h"
#include "fuzz/SampleApp.h"
#include "fuzz/ValueFacts.h"
#include "fuzz/ValueMutation.h"
#include "plist/PropertyList.h"

namespace {

using fuzz::require;
using platform::Value;

const std::string stagingDirectory = "/var/mobile/Media/PublicStaging/ApplicationSync";
const std::string todoListPath = "/var/mobile/Library/ApplicationSync/HarluneStuff/ApplicationsSync.plist";
const std::string packagePath = "/var/mobile/Media/PublicStaging/Packages/arrived.pkg";

/// The identifiers that the list wants installed.
std::set<std::string> requestsOf(const Value& todoList) {
  std::set<std::string> requests;
  if (!todoList.array()) return requests;
  for (const auto& element : *todoList.array()) {
    const auto* entry = element.dictionary();
    if (!entry || (*entry)["operation"].string() != "install") continue;
    if (auto identifier = (*entry)["identifier"].string()) requests.emplace(*identifier);
  }
  return requests;
}

/// Only marks are ever written into a list.
void requireOnlyMarksDiffer(Value before, Value after) {
  require(after.array() && after.array()->size() == before.array()->size(), "a list of the same length");
  for (std::size_t at = 0; at < before.array()->size(); ++at) {
    for (Value* list : {&before, &after}) {
      if (auto* entry = list->array()->dictionary(at)) entry->remove("operation");
    }
    require((*before.array())[at] == (*after.array())[at], "entries that differ in their marks only");
  }
}

}  // namespace

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size, std::size_t maximumSize,
                                               unsigned seed) {
  return fuzz::mutateList(data, size, maximumSize, seed);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const fuzz::SampleApp app;
  const platform::Bytes input(reinterpret_cast<const char*>(data), size);
  const Value todoList = plist::read(input);
  if (fuzz::factsOf(todoList).nodes > fuzz::largeTree(size)) return -1;

  fuzz::MemoryPhone phone("com.vantor.tsd");
  phone.write(packagePath, app.package);
  require(phone.device().installFromPackage(packagePath), "an app that is there");
  phone.write(stagingDirectory + "/ApplicationsSync.plist", input);
  phone.write(stagingDirectory + "/com.example.maps/Info.plist", app.manifest);
  phone.write(stagingDirectory + "/com.example.maps/Icon.png", app.icon);
  phone.write(stagingDirectory + "/com.example.maps/HarluneMetadata.plist", app.metadata);

  auto& daemon = phone.daemon();
  require(daemon.prepareForSync(daemon.currentSyncAnchor(), nullptr), "a sync that is prepared");
  daemon.installedAssets();
  require(daemon.reconcileSync(1, "anchor", nullptr), "a list that is taken over");
  const std::set<std::string> requests = requestsOf(todoList);
  std::set<std::string> asked;
  for (const auto& asset : daemon.outstandingAssetTransfers()) {
    require(requests.count(asset->identifier()) != 0, "assets of apps that were requested");
    require(asked.insert(asset->identifier()).second, "one asset of each app");
    phone.write(packagePath, app.package);
    asset->setPath(packagePath);
    daemon.assetTransferUpdatedProgress(asset, 0.5);
    daemon.assetTransferSucceeded(asset, true, nullptr);
    phone.deliver();
  }
  daemon.assetTransferEndedWithSuccess(true);
  daemon.syncEndedWithSuccess(true);
  phone.deliver();
  if (todoList.array()) requireOnlyMarksDiffer(todoList, phone.readList(todoListPath));
  daemon.accountsForAssets();
  daemon.vantorIDsForAssets();
  daemon.prepareForBackup();
  phone.requireNothingElsewhere();
  return 0;
}
