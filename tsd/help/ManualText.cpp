#include "tsd/help/ManualText.h"

#include <map>

namespace tsd {

const std::vector<ManualItem>& manualOfRules() {
  static const std::vector<ManualItem> items{
      {"POINT[:APP][@N[+]]=ACTION", "A rule: at this point, of this app, at this match, something goes wrong"},
      {"POINT",
       "The name of an operation of a service or of the plug-in; where several classes have one, the class may stand "
       "in "
       "front with a full stop. transfer is each chunk of a package, step each single change of the device's files and "
       "store. 'tsd points' lists them"},
      {":APP", "Only where the call is about this app; without it, of every app"},
      {"@N, @N+", "At the N-th match alone, or at the N-th and all after it; without it, at every match"},
  };
  return items;
}

const std::vector<ManualItem>& manualOfActions() {
  static const std::vector<ManualItem> items{
      {"fail", "The call does nothing, and answers false or absent with an error"},
      {"error", "It takes effect, and reports an error besides"},
      {"none", "It answers nothing, without an error; a callback is not delivered; a package stops and never ends"},
      {"value=", "It answers this number; of a step, the system's error of this number"},
      {"kill", "The process dies before the effect"},
      {"kill-after", "The process dies after it"},
      {"cancel=", "The person cancels the install of this app at this moment"},
      {"prioritize=", "The person wants this app first"},
      {"uninstall=", "The person removes this app"},
      {"store=", "The store begins an install of this app"},
  };
  return items;
}

const std::vector<ManualItem>& manualOfSettings() {
  static const std::vector<ManualItem> items{
      {"app-installation", "allowed or forbidden: whether the restrictions let apps be installed"},
      {"app-removal", "allowed or forbidden: whether they let apps be removed"},
      {"icon-size", "16 to 1024, 120 at first: pixels of a side of an icon"},
      {"backup-placeholders", "yes or no: whether the backup service wants placeholders for restored apps"},
      {"backup-error", "no or yes: whether the backup service answers an error"},
      {"device-service-prioritize", "yes or no: whether the daemon can prioritise a transfer"},
      {"device-service-cancel", "yes or no: whether the daemon can cancel a transfer"},
  };
  return items;
}

const std::vector<ManualItem>& manualOfFiles() {
  static const std::vector<ManualItem> items{
      {"DEVICE/fs/", "The device's file system"},
      {"DEVICE/device.db", "What its services remember"},
      {"DEVICE/runs/", "The last 20 runs that changed it, each with its journal, its log and its end"},
      {"HOST/ApplicationsSync.plist", "The todo list: what is to be installed and removed"},
      {"HOST/PanelloIconState.plist", "The layout of the home screen; optional"},
      {"HOST/APP/", "An app's manifest, icon and store metadata"},
      {"HOST/Packages/APP.pkg", "An app's package"},
      {"HOST/Restore/", "The lists of a restore"},
  };
  return items;
}

const std::vector<ManualItem>& manualOfEnvironment() {
  static const std::vector<ManualItem> items{
      {"NO_COLOR", "Not empty: nothing is coloured"},
      {"TERM", "dumb: nothing is coloured, and no progress is redrawn in its place"},
      {"TMPDIR", "Where temporary files are, of which there are none without a need"},
  };
  return items;
}

std::vector<ManualExample> manualExamples(const std::string& command) {
  static const std::map<std::string, std::vector<ManualExample>> examples{
      {"",
       {{"tsd sample host", "A host with eight apps that nobody ever wrote"},
        {"tsd init phone", "An empty device"},
        {"tsd sync phone host", "Its first sync"},
        {"tsd home phone -o home.png", "What a person would see"},
        {"tsd why phone maps", "What became of one app, found by a part of its name"}}},
      {"sync",
       {{"tsd sync phone host --calls calls.jsonl", "With every call in a file, one a line"},
        {"tsd sync phone host --inject setPlaceholderPromise@1=fail", "The first placeholder is refused"},
        {"tsd sync phone host --inject transfer@3=kill", "The process dies while a package is sent"},
        {"tsd sync phone host --asset com.example.maps:stall", "A package begins to come and never arrives"},
        {"tsd sync phone host --quiet || echo failed", "For a script"}}},
      {"host",
       {{"tsd host new host", "An empty host"},
        {"tsd host add host Maps.app notes.pkg", "An app's folder and a package are put into it"},
        {"tsd host add host notes.pkg --replace --demoted by-hand", "And into the lists of a restore"},
        {"tsd host remove host com.example.notes --uninstall", "The next sync removes it from the device"},
        {"tsd host check host", "What a sync would stumble over"}}},
      {"pack", {{"tsd pack Maps.app -o maps.pkg", "A package of an app's folder"}}},
      {"sample", {{"tsd sample host --apps 2000 --restored 2000", "As large as hosts become"}}},
      {"plan", {{"tsd plan phone host --inject setPlaceholderPromise@1=fail", "Rules apply to a plan too"}}},
      {"restore", {{"tsd restore phone host", "All apps of the restore list come back as placeholders"}}},
      {"why", {{"tsd why phone com.example.maps --run 3", "What run 3 says of an app"}}},
      {"set",
       {{"tsd set phone", "All settings"}, {"tsd set phone app-installation=forbidden", "Apps may not be installed"}}},
      {"store",
       {{"tsd store phone com.example.maps", "The store begins an install of its own"},
        {"tsd store phone com.example.maps --finish --package maps.pkg", "And finishes it"}}},
      {"home", {{"tsd home phone -o - | display", "The picture on standard output"}}},
      {"report", {{"tsd report phone -o report.html", "A page about the last sync or restore"}}},
      {"watch", {{"tsd watch phone --until-idle", "Until nobody is changing the device"}}},
      {"completion", {{"source <(tsd completion bash)", "In the shell that is running"}}},
  };
  auto found = examples.find(command);
  return found == examples.end() ? std::vector<ManualExample>() : found->second;
}

}  // namespace tsd
