#include <gtest/gtest.h>

#include "plist/PropertyList.h"
#include "tests/ScenarioTable.h"

namespace tests {
namespace {

using App = ScenarioApp;
using Before = App::Before;
using Lines = std::vector<std::string>;

constexpr char icons[] = "/var/mobile/Library/ApplicationSync/Icons";

device::StoreInstall storeInstall(std::uint64_t type, std::uint64_t state, std::uint64_t phase) {
  device::StoreInstall install;
  install.installType = type;
  install.installState = state;
  install.installPhase = phase;
  install.createsCoordinator = false;
  return install;
}

device::StoreInstall placeholderOf(std::uint64_t type, const std::string& applicationType = "User",
                                   bool systemBundle = false) {
  device::StoreInstall install = App::plainPlaceholder();
  install.installType = type;
  install.applicationType = applicationType;
  install.systemBundle = systemBundle;
  return install;
}

TEST(SyncOutcome, WhatIsOnTheDeviceDecidesHowAnAppIsPrepared) {
  expectRows<Scenario>({
      {.given = {.name = "fresh", .apps = {{.id = "app.a"}}},
       .outcome = "requested app.a; marks app.a=INSTALLED; present app.a=installed; ",
       .says = {"Changing app.a from install to DOWNLOADED", "Changing app.a from DOWNLOADED to INSTALLED"}},
      {.given = {.name = "update", .apps = {{.id = "app.a", .before = Before::installed}}},
       .outcome = "requested app.a; marks app.a=INSTALLED; present app.a=installed; ",
       .says = {"App app.a is already installed and will be updated.",
                "Created updating coordinator * (createIfNotExisting:1, existingApp:1) for app.a with error (null)",
                "transfer for asset * ended with success y error (null) existingApp:1"}},
      {.given = {.name = "a placeholder that is requested", .apps = {{.id = "app.a", .before = Before::placeholder}}},
       .outcome = "requested app.a; marks app.a=INSTALLED; present app.a=installed; ",
       .says = {"app.a already has a placeholder - skipping",
                "Asset app.a (pretty=app.a, version=(null)) prepped with icon /var/containers/*/HarluneArtwork, at *, "
                "meta at /var/containers/*/HarluneMetadata.plist, info at /var/containers/*.app/Info.plist, "
                "storePid=0, isRestore=n"}},
      {.given = {.name = "a placeholder that nobody requests",
                 .apps = {{.id = "app.a", .before = Before::placeholder, .operation = ""}}},
       .outcome = "requested app.a; present app.a=installed; "},
      {.given = {.name = "an app that the store installs",
                 .apps = {{.id = "app.a", .before = Before::placeholder, .store = {.installState = 0}}}},
       .outcome = "marks app.a=FAILED; present app.a=placeholder; ",
       .says = {"RC returned initiating coordinator * (createIfNotExisting:1, existingApp:0, creatorIdentifier=1) for "
                "app.a with error (null) - Will not perform install/update for this bundle",
                "processing app install for bundle app.a finished with status 0 error (null)",
                "E Not requesting app asset for app.a", "Changing app.a from install to FAILED"},
       .neverSays = {"*Cancelling*"}},
      {.given = {.name = "demoted, by hand and automatically, not requested",
                 .apps = {{.id = "app.a", .before = Before::placeholder, .store = placeholderOf(8), .operation = ""},
                          {.id = "app.b", .before = Before::placeholder, .store = placeholderOf(7), .operation = ""}}},
       .outcome = "present app.a=placeholder app.b=placeholder; ",
       .says = {"app.a is currenlty demoted (manual:1, auto:0) - skipping",
                "app.b is currenlty demoted (manual:0, auto:1) - skipping"}},
      {.given = {.name = "demoted and requested",
                 .apps = {{.id = "app.a", .before = Before::placeholder, .store = placeholderOf(8)},
                          {.id = "app.b", .before = Before::placeholder, .store = placeholderOf(7)}}},
       .outcome = "requested app.a app.b; marks app.a=INSTALLED app.b=INSTALLED; "
                  "present app.a=installed app.b=installed; ",
       .says = {"app.a is currenlty demoted (manual:1, auto:0) - but will be installed as it's requested by client",
                "app.b is currenlty demoted (manual:0, auto:1) - but will be installed as it's requested by client"}},
      {.given = {.name = "system apps, by either rule, though requested",
                 .apps = {{.id = "app.a", .before = Before::placeholder, .store = placeholderOf(7, "System")},
                          {.id = "app.b", .before = Before::placeholder, .store = placeholderOf(8, "User", true)}}},
       .outcome = "marks app.a=install app.b=install; present app.a=placeholder app.b=placeholder; ",
       .says = {"SystemAppPlaceholders {(app.b)}",
                "app.a is auto demoted: 1, manual demoted: 0, system app:1 - skipping",
                "app.b is system app placeholder - skipping"}},
      {.given = {.name = "a restored app is the store's",
                 .apps = {{.id = "app.a", .before = Before::placeholder, .store = placeholderOf(2)}}},
       .outcome = "marks app.a=install; present app.a=placeholder; ",
       .says = {"app.a is currenlty marked to be restored and will be handled by tillerd - skipping"}},
      {.given = {.name = "installing is restricted",
                 .apps = {{.id = "app.a"}, {.id = "app.b", .before = Before::placeholder, .store = placeholderOf(2)}},
                 .settings = {{"app-installation", "forbidden"}}},
       .outcome = "marks app.a=install app.b=install; present app.b=placeholder; ",
       .says = {"app.b is currenlty marked to be restored*",
                "skipping app.a - its not a restore and app installation is disabled"}},
  });
}

TEST(SyncOutcome, InstallsUnderWayAreLeftAlone) {
  auto under = [](const char* id, device::StoreInstall install) {
    return App{.id = id, .before = Before::placeholder, .store = std::move(install)};
  };
  auto paused = storeInstall(4, 1, 1);
  paused.paused = true;
  auto idle = App::plainPlaceholder();
  expectRows<Scenario>({
      {.given = {.name = "every rule of the snapshot",
                 .apps = {under("app.a", storeInstall(4, 1, 1)), under("app.b", storeInstall(4, 1, 0)),
                          under("app.c", storeInstall(1, 1, 0)), under("app.d", storeInstall(2, 1, 0)),
                          under("app.e", storeInstall(2, 1, 1)), under("app.f", storeInstall(2, 1, 2)),
                          under("app.g", storeInstall(3, 2, 1)), under("app.h", storeInstall(0, 0, 1)),
                          under("app.i", storeInstall(99, 1, 1)), under("app.j", storeInstall(5, 77, 66)),
                          under("app.k", paused), under("app.l", idle), under("app.m", storeInstall(6, 3, 2)),
                          under("app.n", storeInstall(7, 4, 3)), under("app.o", storeInstall(8, 5, 4))}},
       .outcome =
           "requested app.b app.g app.h app.j app.k app.l app.m app.n app.o; marks app.a=install app.b=INSTALLED "
           "app.c=install app.d=install app.e=install app.f=install app.g=INSTALLED app.h=INSTALLED app.i=install "
           "app.j=INSTALLED app.k=INSTALLED app.l=INSTALLED app.m=INSTALLED app.n=INSTALLED app.o=INSTALLED; present "
           "app.a=placeholder app.b=installed app.c=placeholder app.d=placeholder app.e=placeholder app.f=placeholder "
           "app.g=installed app.h=installed app.i=placeholder app.j=installed app.k=installed app.l=installed "
           "app.m=installed app.n=installed app.o=installed; ",
       .says = {"Waiting for -applicationInstallsArePrioritized:arePaused: to complete...",
                "[15] prioritized proxies (*) paused proxies (<OBApplicationProxy app.k placeholder>)",
                "Got install type=OBInstallTypeSync state=OBInstallStateActive phase=OBInstallPhaseInstalling for "
                "app.a",
                "Got install type=OBInstallTypeSync state=OBInstallStateActive phase=OBInstallPhaseLoading for app.b",
                "Got install type=OBInstallTypeStoreDownload state=OBInstallStateActive phase=OBInstallPhaseLoading "
                "for app.c",
                "Got install type=OBInstallTypeRestore *", "Got install type=OBInstallTypeRestore *",
                "Got install type=OBInstallTypeRestore state=OBInstallStateActive phase=OBInstallPhaseRestoringData "
                "for app.f",
                "Got install type=OBInstallTypeAutomaticDownload state=OBInstallStatePaused *",
                "Got install type=OBInstallTypeNone state=OBInstallStateWaiting *",
                "Got install type=Unknown Install Type: 99 state=OBInstallStateActive *",
                "Got install type=OBInstallTypeAutomaticUpdate state=Unknown Install State: 77 phase=Unknown Install "
                "Phase: 66 for app.j",
                "Got install type=OBInstallTypeMigration state=OBInstallStateCanceled "
                "phase=OBInstallPhaseRestoringData for app.m",
                "Got install type=OBInstallTypeDowngrade state=OBInstallStateFailed "
                "phase=OBInstallPhaseInstallingPlaceholder for app.n",
                "Got install type=Unknown Install Type: 8 state=OBInstallStateFinished phase=Unknown Install Phase: 4 "
                "for app.o",
                "signaling semaphore", "Wait completed",
                "Assets already in progress (not returning these): (app.a, app.c, app.i)",
                "Assets currently restoring: (app.d, app.e)"}},
      {.given = {.name = "a registry that never reports",
                 .apps = {under("app.a", storeInstall(4, 1, 1))},
                 .rules = {"applicationInstallsArePrioritized=none"}},
       .outcome = "requested app.a; marks app.a=INSTALLED; present app.a=installed; ",
       .says = {"E Query for in progress assets timed out", "E Failed to get list of assets already in progress!",
                "E Failed to get list of assets currently restoring!"},
       .neverSays = {"Wait completed"}},
      {.given = {.name = "nothing under way", .apps = {{.id = "app.a", .operation = ""}}},
       .outcome = "",
       .says = {"No assets currently in progress.", "signaling semaphore",
                "Assets already in progress (not returning these): ()", "Assets currently restoring: ()"}},
  });
}

TEST(SyncOutcome, ListsAndIdentifiersOfEveryShape) {
  auto list = [](const std::vector<Value>& entries) {
    Value value = Value::makeArray();
    for (const auto& entry : entries) value.array()->append(entry);
    return plist::writeXML(value).value();
  };
  auto entry = [](Value identifier, Value operation) {
    return dictionaryOf({{"identifier", identifier}, {"operation", operation}});
  };
  expectRows<Scenario>({
      {.given = {.name = "no staging directory", .apps = {{.id = "app.a", .previousMark = "install"}}, .stages = false},
       .outcome = "",
       .says = {"Nothing to do", "finished reconcile sync"},
       .neverSays = {"Notifying PN we are starting syncing", "Sending*", "*from Harlune"}},
      {.given = {.name = "a dictionary", .rawTodo = binaryList(Value::makeDictionary())},
       .outcome = "",
       .says = {"E todo list is not an array", "Nothing to do from Harlune", "Notifying PN we are starting syncing"}},
      {.given = {.name = "no property list", .rawTodo = "no list"},
       .outcome = "",
       .says = {"E couldn't parse todo list", "Nothing to do from Harlune"}},
      {.given = {.name = "empty", .rawTodo = ""},
       .outcome = "",
       .says = {"Nothing to do from Harlune"},
       .neverSays = {"E *"}},
      {.given = {.name = "elements of every kind",
                 .rawTodo = list({"text", 7, arrayOf({"app.x"}), entry(5, "install"), entry({}, "install"),
                                  entry("app.a", 3), entry("../up", "remove"), entry("a/../b", "install"),
                                  entry("a/../b", "remove"), entry("app.b", "install"), entry("app.b", "install"),
                                  entry("app.c", "remove"), entry("app.d", "remove"), entry("app.e", "remove")})},
       .outcome = "requested app.b; marks (null)=install ../up=remove 5=install a/../b=install app.a=3 app.b=install "
                  "app.c=remove app.d=remove app.e=remove; open [app.b initiating]; present app.b=placeholder; ",
       .says = {"../up targeted for termination", "app.c targeted for termination", "app.d targeted for termination",
                "app.e targeted for termination", "performing 4 deletions", "Ignoring invalid path: 5",
                "Ignoring invalid path: (null)", "Ignoring invalid path: a/../b",
                "app.b already has a placeholder - skipping"},
       .neverSays = {"a/../b targeted*"},
       .modelled = false},
      {.given = {.name = "removing is restricted",
                 .apps = {{.id = "app.a", .before = Before::installed, .operation = "remove"}},
                 .layout = {"app.a"},
                 .settings = {{"app-removal", "forbidden"}}},
       .outcome = "marks app.a=remove; present app.a=installed; ",
       .says = {"Not processing deletes because app removal is restricted", "Notifying PN we are starting syncing",
                "Sending iconlayout to PN"}},
      {.given = {.name = "removals, of an app and of nothing",
                 .apps = {{.id = "app.a", .before = Before::installed, .operation = "remove"},
                          {.id = "app.b", .operation = "remove"}}},
       .outcome = "marks app.a=remove app.b=remove; ",
       .says = {"performing 2 deletions", "Uninstall of app.a with install coordinator succeeded wiht error (null).",
                "Uninstall of app.b with install coordinator succeeded wiht error InstallCoordination *."}},
      {.given = {.name = "the home screen's order, then the list's",
                 .apps = {{.id = "app.r"}, {.id = "app.p"}, {.id = "app.q"}},
                 .layout = {"app.nowhere", "app.q", "app.p"}},
       .outcome = "requested app.q app.p app.r; marks app.p=INSTALLED app.q=INSTALLED app.r=INSTALLED; "
                  "present app.p=installed app.q=installed app.r=installed; ",
       .says = {"saved icon sort order", "prioritize app.q", "prioritize app.p", "lastly app.r"},
       .neverSays = {"*app.nowhere"}},
      {.given = {.name = "no order from the home screen",
                 .apps = {{.id = "app.a"}},
                 .rules = {"PNGetFlattenedIconState=fail"}},
       .outcome = "requested app.a; marks app.a=INSTALLED; present app.a=installed; ",
       .says = {"got no icon sort order from PN", "lastly app.a"}},
  });
}

TEST(SyncOutcome, DeletionsAreReportedUntilASyncSucceeds) {
  expectRows<Scenario>({
      {.given = {.name = "lost apps and what the list says of them",
                 .apps = {{.id = "app.a", .lost = true, .previousMark = "install", .operation = ""},
                          {.id = "app.b", .lost = true, .previousMark = "FAILED", .operation = ""},
                          {.id = "app.c", .lost = true, .previousMark = "INSTALLED", .operation = ""},
                          {.id = "app.d", .lost = true, .operation = "", .inLastSync = true},
                          {.id = "app.e", .operation = "", .inLastSync = true},
                          {.id = "app.f", .before = Before::installed, .operation = "", .inLastSync = true}}},
       .outcome = "deleted app.b app.c app.d app.e; present app.f=installed; ",
       .says = {"getting installed assets", "app.a not installed, but is in our todo list. Not marking deleted",
                "app.b not installed, and no todo (found=1 pi=0 failed=1) Marking as deleted",
                "app.c not installed, and no todo (found=1 pi=1 failed=0) Marking as deleted",
                "app.d not installed, and no todo (found=0 pi=0 failed=0) Marking as deleted",
                "app.e not installed, and no todo (found=0 pi=0 failed=0) Marking as deleted",
                "[15] finished getting installed assets toDoList:(*), uninstalled apps (app.a, app.b, app.c, app.d), "
                "last synced apps(app.d, app.e, app.f)",
                "clearing uninstalled apps: (app.a, app.b, app.c, app.d)"},
       .neverSays = {"app.f*"}},
      {.given = {.name = "an installer that cannot tell",
                 .apps = {{.id = "app.a", .lost = true, .operation = ""},
                          {.id = "app.b", .operation = "", .inLastSync = true}},
                 .failures = {{.point = "Installer.CorvaneLookupUninstalled"}}},
       .outcome = "deleted app.b; ",
       .says = {"E CorvaneLookupUninstalled returned NULL"},
       .neverSays = {"clearing uninstalled*"}},
  });
}

TEST(SyncOutcome, TransfersEndInEveryWay) {
  using Transfer = App::Transfer;
  using Package = App::Package;
  using Path = App::Path;
  const std::string fresh = "open [app.a initiating]; present app.a=placeholder; ";
  expectRows<Scenario>({
      {.given = {.name = "damaged", .apps = {{.id = "app.a", .package = Package::damaged}, {.id = "app.b"}}},
       .outcome = "requested app.a app.b; marks app.a=FAILED app.b=INSTALLED; present app.b=installed; ",
       .says = {"coordinatorDidCompleteSuccessfully for app.a with error InstallCoordination *",
                "Changing app.a from DOWNLOADED to FAILED"}},
      {.given = {.name = "damaged update keeps the old version",
                 .apps = {{.id = "app.a", .before = Before::installed, .package = Package::ofAnotherApp}}},
       .outcome = "requested app.a; marks app.a=FAILED; present app.a=installed; "},
      {.given = {.name = "never arrives, phase failed",
                 .apps = {{.id = "app.a", .transfer = Transfer::stalls},
                          {.id = "app.b", .transfer = Transfer::neverStarts}},
                 .phaseSucceeded = false},
       .outcome = "requested app.a app.b; marks app.a=install app.b=install; cancelled [coordinator app.a TSError 30]; "
                  "open [app.b initiating]; present app.b=placeholder; ",
       .says = {"asset transfer ended withsuccess: n", "Notifying PN we are done syncing",
                "Cancelling coordinator with error TSError 30 for app.a"},
       .neverSays = {"E Called with success*"}},
      {.given = {.name = "never arrives, phase claimed successful",
                 .apps = {{.id = "app.a", .transfer = Transfer::stalls},
                          {.id = "app.b", .transfer = Transfer::stalls}}},
       .outcome =
           "requested app.a app.b; marks app.a=install app.b=install; open [app.a initiating] [app.b initiating]; "
           "present app.a=placeholder app.b=placeholder; ",
       .says = {"asset transfer ended withsuccess: y",
                "E Called with success == YES but with 2 outstanding Ducto transfers!"}},
      {.given = {.name = "fails, of a new app", .apps = {{.id = "app.a", .transfer = Transfer::fails}}},
       .outcome = "requested app.a; marks app.a=install; " + fresh,
       .says = {"Ravelle is enabled - treating error Daemon 5: connection lost as non recoverable",
                "failed to transfer asset app.a. err=Daemon 5: connection lost, recoverable=0"},
       .neverSays = {"Uninstalling placeholder*"}},
      {.given = {.name = "fails, of an update",
                 .apps = {{.id = "app.a", .before = Before::installed, .transfer = Transfer::fails}}},
       .outcome = "requested app.a; marks app.a=install; cancelled [coordinator app.a RVUserPresentableError 1]; "
                  "present app.a=installed; ",
       .says = {"Uninstalling placeholder app.a", "Created updating coordinator * (createIfNotExisting:0, *"}},
      {.given =
           {.name = "fails, of a restored update",
            .apps = {{.id = "app.a", .before = Before::installed, .transfer = Transfer::fails, .isRestore = true}}},
       .outcome = "requested app.a; marks app.a=install; open [app.a updating]; present app.a=updating; ",
       .neverSays = {"Uninstalling placeholder*"}},
      {.given = {.name = "no download", .apps = {{.id = "app.a", .isDownload = false}}},
       .outcome = "requested app.a; marks app.a=SENT; " + fresh,
       .neverSays = {"Received file*"}},
      {.given = {.name = "of a restore, its package", .apps = {{.id = "app.a", .isRestore = true}}},
       .outcome = "requested app.a; marks app.a=DOWNLOADED; " + fresh,
       .says = {"Not processing restore asset <TSAsset app.a*> as coordination is enabled"}},
      {.given = {.name = "of a restore, its data", .apps = {{.id = "app.a", .isRestore = true, .parts = 2}}},
       .outcome = "requested app.a; marks app.a=DOWNLOADED; " + fresh,
       .says = {"Not processing kTSAssetPartApplicationData for restore asset <TSAsset app.a*> as coordination is "
                "enabled"}},
      {.given = {.name = "relative path", .apps = {{.id = "app.a", .path = Path::relative}}},
       .outcome = "requested app.a; marks app.a=INSTALLED; present app.a=installed; ",
       .says = {"Received file at /var/mobile/Media/PublicStaging/Packages/app.a.pkg"}},
      {.given = {.name = "no path", .apps = {{.id = "app.a", .path = Path::absent}}},
       .outcome = "requested app.a; marks app.a=install; " + fresh,
       .says = {"Ignoring invalid path: (null)"}},
      {.given = {.name = "recorded path", .apps = {{.id = "app.a", .path = Path::recorded}}},
       .outcome = "requested app.a; marks app.a=INSTALLED; present app.a=installed; ",
       .says = {"Download path recovered for app.a but the file is missing: */app.a.pkg",
                "Received file at */app.a.pkg"}},
      {.given = {.name = "climbing path", .apps = {{.id = "app.a", .path = Path::climbing}}},
       .outcome = "requested app.a; marks app.a=install; " + fresh,
       .says = {"Ignoring invalid path: /var/mobile/Media/PublicStaging/Packages/../Packages/app.a.pkg"}},
      {.given = {.name = "the daemon reports the outcome",
                 .apps = {{.id = "app.a", .isDownload = false, .report = App::Report::succeeded},
                          {.id = "app.b", .report = App::Report::failed},
                          {.id = "app.c", .isRestore = true, .report = App::Report::failed}}},
       .outcome = "requested app.a app.b app.c; marks app.a=INSTALLED app.b=FAILED app.c=DOWNLOADED; "
                  "open [app.a initiating] [app.c initiating]; present app.a=placeholder app.c=placeholder; ",
       .says = {"app.a install succeeded", "app.b install failed unrecoverably: Daemon 9: no room",
                "Changing app.b from INSTALLED to FAILED",
                "app.c install failed but was recoverable: Daemon 9: no room",
                "Uninstall of app.b with install coordinator succeeded wiht error (null)."}},
  });
}

TEST(SyncOutcome, ThePersonInterferes) {
  using Person = App::Person;
  using Transfer = App::Transfer;
  expectRows<Scenario>({
      {.given = {.name = "cancels a new app", .apps = {{.id = "app.a", .person = Person::cancels}, {.id = "app.b"}}},
       .outcome = "requested app.a app.b; marks app.a=install app.b=INSTALLED; present app.b=installed; ",
       .says = {"Cancelling asset sync for app.a", "transfer for asset * ended with success n *"},
       .neverSays = {"Uninstalling placeholder*"}},
      {.given = {.name = "cancels an update",
                 .apps = {{.id = "app.a", .before = Before::installed, .person = Person::cancels}}},
       .outcome = "requested app.a; marks app.a=install; present app.a=installed; ",
       .says = {"Cancelling asset sync for app.a", "Uninstalling placeholder app.a",
                "asset transfer ended withsuccess: y"}},
      {.given = {.name = "cancels what the daemon cannot stop, and it arrives",
                 .apps = {{.id = "app.a", .person = Person::cancels}},
                 .settings = {{"device-service-cancel", "no"}}},
       .outcome = "requested app.a; marks app.a=DOWNLOADED; ",
       .says = {"not handling applicationInstallsDidCancel because install coordination is enabled.",
                "E Cannot cancel app.a as it's already cancelled 0 OR the call is not supported"}},
      {.given = {.name = "cancels what the daemon cannot stop, and it fails",
                 .apps = {{.id = "app.a",
                           .before = Before::installed,
                           .transfer = Transfer::fails,
                           .person = Person::cancels}},
                 .settings = {{"device-service-cancel", "no"}}},
       .outcome = "requested app.a; marks app.a=install; present app.a=installed; "},
      {.given = {.name = "removes the app",
                 .apps = {{.id = "app.a", .before = Before::installed, .person = Person::uninstalls}}},
       .outcome = "requested app.a; marks app.a=install; "},
      {.given = {.name = "wants an app first", .apps = {{.id = "app.a", .person = Person::prioritizes}}},
       .outcome = "requested app.a; marks app.a=INSTALLED; present app.a=installed; ",
       .says = {"Prioritize app.a", "Prioritize app.a finished with error (null)"}},
      {.given = {.name = "wants an app first, and the daemon cannot",
                 .apps = {{.id = "app.a", .person = Person::prioritizes}},
                 .settings = {{"device-service-prioritize", "no"}}},
       .outcome = "requested app.a; marks app.a=INSTALLED; present app.a=installed; ",
       .says = {"Prioritize app.a", "E Cannot prioritize app.a as it's not supported"},
       .neverSays = {"Prioritize app.a finished*"}},
      {.given = {.name = "outside the daemon's process",
                 .apps = {{.id = "app.a"}, {.id = "app.b", .person = Person::cancels}},
                 .process = "com.vantor.shiftwell"},
       .outcome = "requested app.a app.b; marks app.a=INSTALLED app.b=install; present app.a=installed; ",
       .says = {"E Ignoring notification from RC about installing placeholder for app.a"}},
  });
}

TEST(SyncOutcome, FilesAreWhereTheyBelong) {
  Scenario scenario{.apps = {{.id = "app.a", .inLastSync = true, .hasIcon = true},
                             {.id = "app.b", .path = App::Path::recorded, .isDownload = false}},
                    .layout = {"app.b", "app.a"}};
  scenario.apps[0].path = App::Path::recorded;
  PluginRig rig(optionsOf(scenario));
  rig.write(std::string(icons) + "/leftover.png", "old");
  rig.receivePackage("app.b", "left by an earlier sync");
  auto outcome = run(rig, scenario);
  EXPECT_EQ(outcome.text(), predict(scenario).text());
  EXPECT_TRUE(inOrder(rig.messages(), {"Recovered download path for app.b at */Packages/app.b.pkg"}));

  EXPECT_FALSE(rig.exists(stagingDirectory));
  EXPECT_FALSE(rig.exists(lastSyncPath));
  EXPECT_FALSE(rig.exists(std::string(icons) + "/leftover.png"));
  EXPECT_EQ(rig.read(std::string(icons) + "/app.a.png")->substr(1, 3), "PNG");
  Bytes todo = *rig.read(todoListPath);
  EXPECT_EQ(todo.substr(0, 8), "bplist00");
  Value found = rig.readList(std::string(todoListPath) + "-debug.plist");
  EXPECT_EQ((*(*found.array())[0].dictionary())["operation"], Value("install"));
  EXPECT_EQ(rig.readList("/var/mobile/Library/ApplicationSync/AssetSortOrder.plist"), arrayOf({"app.b", "app.a"}));
  // The records of an app whose install has ended are gone, the other's are not.
  const Value records = rig.readList(restoreStatePath);
  EXPECT_TRUE(records.dictionary()->contains("app.b"));
  EXPECT_FALSE(records.dictionary()->contains("app.a"));
  EXPECT_EQ(*rig.read("/var/mobile/tmp/com.vantor.tsd.Apps/app.a.app/Icon.png"),
            *rig.read(std::string(icons) + "/app.a.png"));
  EXPECT_FALSE(rig.exists(std::string(packagesDirectory) + "/app.a.pkg"));
}

}  // namespace
}  // namespace tests
