#include <gtest/gtest.h>

#include "platform/Describe.h"
#include "platform/OBApplicationWorkspace.h"
#include "platform/TSAccountInfo.h"
#include "plist/PropertyList.h"
#include "tests/Scenario.h"

namespace tests {
namespace {

using Lines = std::vector<std::string>;

/// The store metadata beside the app.
std::string metadataPath(PluginRig& rig, const std::string& app) {
  auto proxy = rig.platform().workspace.applicationProxyForIdentifier(app, false);
  return proxy->bundleContainerURL.value() + "/HarluneMetadata.plist";
}

void installWith(PluginRig& rig, const std::string& app, const std::optional<Bytes>& metadata) {
  rig.install(app, "1");
  if (metadata) rig.write(metadataPath(rig, app), *metadata);
}

Value downloadInfo(Value vantorID, Value person = {}, Value alternative = {}) {
  return dictionaryOf(
      {{"accountInfo", dictionaryOf({{"VantorID", vantorID}, {"DSPersonID", person}, {"AltDSID", alternative}})}});
}

constexpr char downloadKey[] = "com.vantor.HarluneStore.downloadInfo";

/// Metadata of every kind, right and wrong.
void installAccounts(PluginRig& rig) {
  auto metadata = [](std::initializer_list<std::pair<std::string_view, Value>> entries) {
    return binaryList(filledOut(dictionaryOf(entries), 25, 1));
  };
  installWith(rig, "app.a", metadata({{"vantorId", "one"}, {downloadKey, downloadInfo("one", 11, "alt-1")}}));
  installWith(rig, "app.b", metadata({{"vantorId", "top"}, {downloadKey, downloadInfo("below", 2.5)}}));
  installWith(rig, "app.c", metadata({{"vantorId", "one"}}));
  installWith(rig, "app.d", metadata({{downloadKey, downloadInfo("one", 99, "later")}}));
  installWith(rig, "app.e", metadata({{"vantorId", 5}, {downloadKey, "text"}}));
  installWith(rig, "app.f", metadata({{"vantorId", "f"}, {downloadKey, dictionaryOf({{"accountInfo", 1}})}}));
  installWith(rig, "app.g", metadata({{downloadKey, downloadInfo(7)}}));
  installWith(rig, "app.h", metadata({{downloadKey, downloadInfo("h", true, 8)}}));
  installWith(rig, "app.i", "no property list");
  installWith(rig, "app.j", binaryList(arrayOf({"no dictionary"})));
  installWith(rig, "app.k", std::nullopt);
}

TEST(Queries, Metrics) {
  PluginRig rig;
  auto metrics = [&] { return platform::describe(rig.daemon().installedAssetMetrics()); };
  EXPECT_EQ(metrics(), "{_Count = 0; _PhysicalSize = 0; _PurgeableSize = 0}");
  device::StoreInstall system;
  system.applicationType = "System";
  EXPECT_TRUE(rig.device().beginStoreInstall("app.system", system));
  EXPECT_EQ(metrics(), "{_Count = 0; _PhysicalSize = 0; _PurgeableSize = 0}");
  std::uint64_t bytes = 0;
  for (const char* app : {"app.a", "app.b"}) {
    rig.install(app, "1");
    bytes += rig.platform().workspace.applicationProxyForIdentifier(app, false)->diskUsage.staticUsage;
  }
  EXPECT_GT(bytes, 0u);
  EXPECT_EQ(metrics(), "{_Count = 2; _PhysicalSize = " + std::to_string(bytes) + "; _PurgeableSize = 0}");
  EXPECT_TRUE(exactly(rig.messagesIn("installedAssetMetrics", 3),
                      {"found 2 apps using " + std::to_string(bytes) + " bytes (0 purgeable)"}));
}

TEST(Queries, VantorIDs) {
  PluginRig rig;
  installAccounts(rig);
  auto identifiers = rig.daemon().vantorIDsForAssets();
  EXPECT_EQ(identifiers.members(), (Lines{"one", "top", "below", "f", "h"}));
  EXPECT_TRUE(
      exactly(rig.messagesIn("vantorIDsForAssets"),
              {"getting id's for assets", "mismatched VantorID keys for app.b: top vs below",
               "E [0] unexpected type for vantorID", "E [0] unexpected type for downloadInfo",
               "unknown VantorID for app.e (plist at */HarluneMetadata.plist)", "E [0] unexpected type for accountInfo",
               "E [0] unexpected type for VantorID", "unknown VantorID for app.g (plist at *)",
               "unknown VantorID for app.i (plist at *)", "unknown VantorID for app.j (plist at *)",
               "unknown VantorID for app.k (plist at *)", "Returning vantor ID set: {(below, f, h, one, top)}"}));
}

TEST(Queries, Accounts) {
  PluginRig rig;
  installAccounts(rig);
  auto accounts = rig.daemon().accountsForAssets();
  EXPECT_EQ(accounts.size(), 4u);
  Lines calls;
  for (const auto& record : rig.records()) {
    if (record.service == "TSMutableAccountInfo") calls.push_back(lineOf(record));
  }
  EXPECT_TRUE(exactly(calls, {"setDSID(11)", "setVantorID(one)", "setAltDSID(alt-1)", "setDSID(2.5)",
                              "setVantorID(below)", "setAltDSID()", "setDSID()", "setVantorID(f)", "setAltDSID()",
                              "setDSID()", "setVantorID(h)", "setAltDSID()"}));
  EXPECT_TRUE(exactly(
      rig.messagesIn("accountsForAssets"),
      {"getting accounts for assets", "E [0] unexpected type for downloadInfo", "E [0] unexpected type for vantorID",
       "E [0] unexpected type for accountInfo", "E [0] unexpected type for VantorID",
       "E [0] unexpected type for DSPersonID", "E [0] unexpected type for AltDSID", "Returning accountInfo: *"}));
}

TEST(Queries, AnAccountThatCannotBeMadeIsAskedForAgain) {
  PluginRig rig({.rules = {"makeAccountInfo@1=none"}});
  installAccounts(rig);
  // The first app's person has the third app, too.
  EXPECT_EQ(rig.daemon().accountsForAssets().size(), 4u);
}

TEST(Queries, DisabledAssetTypes) {
  for (bool installing : {true, false}) {
    for (bool removing : {true, false}) {
      PluginRig rig;
      EXPECT_TRUE(rig.device().set("app-installation", installing ? "allowed" : "forbidden"));
      EXPECT_TRUE(rig.device().set("app-removal", removing ? "allowed" : "forbidden"));
      auto disabled = rig.client()->disabledAssetTypes();
      EXPECT_EQ(disabled ? disabled->members() : Lines(), !installing && !removing ? Lines{"Application"} : Lines());
    }
  }
  for (int answer : {-1, 0, 1, 3}) {
    PluginRig rig({.rules = {"effectiveBoolValueForSetting=value=" + std::to_string(answer)}});
    EXPECT_FALSE(rig.client()->disabledAssetTypes()) << answer;
  }
}

TEST(Queries, BackupRewritesOnlyWhatIsMarked) {
  Value metadata = filledOut(dictionaryOf({{"is-auto-download", true}}), 25, 1);
  const Bytes marked = binaryList(metadata);
  metadata.dictionary()->remove("is-auto-download");
  const Bytes kept[] = {binaryList(dictionaryOf({{"is-auto-download", false}})),
                        binaryList(dictionaryOf({{"is-auto-download", "yes"}})), binaryList(dictionaryOf({})),
                        binaryList(arrayOf({"is-auto-download"})), "no list"};
  PluginRig rig({.rules = {"writeAtomically@2=fail"}});
  installWith(rig, "app.a", marked);
  installWith(rig, "app.b", marked);  // cannot be written
  std::size_t number = 0;
  for (const auto& content : kept) installWith(rig, "app.kept" + std::to_string(number++), content);
  installWith(rig, "app.z", binaryList(dictionaryOf({{"is-auto-download", 1}, {"vantorId", "me"}})));
  rig.daemon().prepareForBackup();
  EXPECT_TRUE(exactly(
      rig.messagesIn("prepareForBackup"),
      {"preparing for backup", "clearing is-auto-download value for app.a", "clearing is-auto-download value for app.b",
       "clearing is-auto-download value for app.z", "finished preparing for backup"}));
  EXPECT_EQ(rig.readList(metadataPath(rig, "app.a")), metadata);
  EXPECT_EQ(rig.read(metadataPath(rig, "app.a"))->substr(0, 5), "<?xml");
  EXPECT_EQ(rig.read(metadataPath(rig, "app.b")), marked);
  EXPECT_EQ(platform::describe(rig.readList(metadataPath(rig, "app.z"))), "{vantorId = me}");
  number = 0;
  for (const auto& content : kept) {
    EXPECT_EQ(rig.read(metadataPath(rig, "app.kept" + std::to_string(number++))), content);
  }
  EXPECT_EQ(rig.countOf("writeAtomically"), 3u);
}

}  // namespace
}  // namespace tests
