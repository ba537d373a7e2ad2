#include <gtest/gtest.h>

#include "platform/Describe.h"
#include "platform/InstallCoordination.h"
#include "platform/OBApplicationWorkspace.h"
#include "plist/PropertyList.h"
#include "tests/Scenario.h"

namespace tests {
namespace {

using Lines = std::vector<std::string>;

constexpr char controlCharacter[] = "a bell: \a";  // no XML document can hold it

Value recordAt(const char* path) { return dictionaryOf({{"1", dictionaryOf({{"path", path}})}}); }

void stage(PluginRig& rig, const Lines& apps) {
  Value list = Value::makeArray();
  for (const auto& app : apps) {
    list.array()->append(dictionaryOf({{"identifier", app}, {"operation", "install"}}));
  }
  rig.write(std::string(stagingDirectory) + "/ApplicationsSync.plist", binaryList(list));
  ASSERT_TRUE(rig.reconcileSync());
}

TEST(HardCases, ATransferThatFailsWithoutAReasonIsNotAnArrival) {
  PluginRig rig;
  rig.install("app.a", "1");
  stage(rig, {"app.a"});
  auto assets = rig.daemon().outstandingAssetTransfers();
  ASSERT_EQ(assets.size(), 1u);
  assets[0]->setPath(rig.receivePackage("app.a", packageOf("app.a", "2")));
  rig.transferEnded(assets[0], false, nullptr);
  rig.deliver();
  EXPECT_EQ(rig.device().app("app.a")->version, "1");
  EXPECT_EQ(cancellationsIn(rig.records()), Lines{"coordinator app.a RVUserPresentableError 1"});
  EXPECT_TRUE(inOrder(rig.traceIn("assetTransferSucceeded", "app.a"), {"failed to transfer asset app.a. err=(null)*"}));
  EXPECT_EQ(rig.countOf("setComplete", "app.a"), 0u);
  Lines lines;
  for (const auto& record : rig.records()) {
    if (record.operation == "RVCreateUserPresentableError") lines.push_back(platform::describe(record.arguments));
  }
  EXPECT_TRUE(exactly(lines, {"*domain = TSError; code = 30*"}));
}

TEST(HardCases, WhatXMLCannotCarryIsWrittenAsBinary) {
  PluginRig rig;
  rig.install("app.a", "1");
  auto proxy = rig.platform().workspace.applicationProxyForIdentifier("app.a", false);
  const std::string metadata = proxy->bundleContainerURL.value() + "/HarluneMetadata.plist";
  rig.write(metadata, binaryList(dictionaryOf({{"title", controlCharacter}, {"is-auto-download", true}})));
  rig.daemon().prepareForBackup();
  EXPECT_EQ(rig.readList(metadata), dictionaryOf({{"title", controlCharacter}}));

  rig.write(restoreStatePath,
            binaryList(dictionaryOf(
                {{"app.a", recordAt("/p")}, {"app.b", recordAt(controlCharacter)}, {"app.c", recordAt("/q")}})));
  for (const char* app : {"app.a", "app.c"}) {
    rig.daemon().assetInstallSucceeded(platform::TSAsset::downloadAssetWithIdentifier(app, "Application", {}));
  }
  EXPECT_EQ(rig.readList(restoreStatePath), dictionaryOf({{"app.b", recordAt(controlCharacter)}}));
}

TEST(HardCases, ARestoreStateThatCannotBeReadNowIsKept) {
  auto clean = [](const Bytes& content, const std::vector<std::string>& rules) {
    PluginRig rig({.rules = rules});
    rig.write(restoreStatePath, content);
    rig.daemon().assetInstallSucceeded(platform::TSAsset::downloadAssetWithIdentifier("app.a", "Application", {}));
    return rig.read(restoreStatePath);
  };
  const Bytes records = binaryList(dictionaryOf({{"app.a", recordAt("/p")}, {"app.b", recordAt("/q")}}));
  EXPECT_EQ(clean(records, {"propertyListWithData=fail"}), records);
  const Bytes refused[] = {
      "<plist><dict><key>app.b</key><true/><key>app.b</key><true/></dict></plist>",
      "<?xml version='1.0' encoding='x-no-such'?><plist><dict/></plist>",
      "bplist01 of a later day",
      // a UID, which has no value here.
      Bytes("bplist00\xd1\x01\x02\x51"
            "a\x80\x01\x08\x0b\x0d\0\0\0\0\0\0\x01\x01\0\0\0\0\0\0\0\x03\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0\x0f",
            8 + 3 + 2 + 2 + 3 + 32),
  };
  for (const auto& content : refused) EXPECT_EQ(clean(content, {}), content) << content.substr(0, 8);
  for (const Bytes& broken : {Bytes("no list"), Bytes("<plist><dict>"), records.substr(0, records.size() - 4)}) {
    EXPECT_EQ(clean(broken, {}), std::nullopt) << broken.substr(0, 8);
  }
}

TEST(HardCases, ACoordinatorOfAnUnknownAppStillHasTheRestoreStateCleaned) {
  PluginRig rig({.rules = {"bundleID=none"}});
  auto delegate = std::dynamic_pointer_cast<platform::RVAppInstallObserverDelegate>(rig.client());
  auto coordinator = rig.platform().installCoordination.coordinatorForAppWithBundleID(
      platform::RVCoordinatorKind::RVInitiatingAppInstallCoordinator, "app.a", 3, true);
  Value entries = Value::makeArray();
  entries.array()->append(dictionaryOf({{"operation", "install"}}));  // nobody's
  rig.write(todoListPath, binaryList(entries));
  rig.write(restoreStatePath, binaryList(dictionaryOf({})));
  delegate->coordinatorDidCompleteSuccessfully(coordinator);
  EXPECT_FALSE(rig.exists(restoreStatePath));
  const Value records = dictionaryOf({{"app.a", recordAt("/p")}});
  rig.write(restoreStatePath, binaryList(records));
  delegate->coordinatorDidCompleteSuccessfully(coordinator);
  EXPECT_EQ(rig.readList(restoreStatePath), records);
  EXPECT_EQ(rig.readList(todoListPath), entries);
  delegate->coordinatorShouldPrioritize(coordinator);
  EXPECT_TRUE(rig.transfers().prioritized().empty());
}

TEST(HardCases, AnAppMayHaveAnEmptyName) {
  PluginRig rig;
  Value entries = Value::makeArray();
  entries.array()->append(dictionaryOf({{"identifier", "app.a"}, {"operation", "install"}, {"name", ""}}));
  rig.write(todoListPath, binaryList(entries));
  EXPECT_EQ(rig.daemon().outstandingAssetTransfers().size(), 1u);
  EXPECT_EQ(rig.countOf("setPlaceholderPromise", "app.a"), 1u);
}

}  // namespace
}  // namespace tests
