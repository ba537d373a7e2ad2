#include <algorithm>
#include <filesystem>

#include "tsd/command/Commands.h"
#include "tsd/conduit/WholeFile.h"
#include "tsd/daemon/DeviceView.h"
#include "tsd/picture/HomeDrawing.h"
#include "tsd/picture/HomeText.h"
#include "tsd/terminal/Output.h"

namespace tsd {

using platform::Value;

namespace {

Value documentOfIcon(const HomeIcon& icon) {
  Value item = Value::makeDictionary();
  auto& entries = *item.dictionary();
  entries.set("id", icon.id);
  entries.set("name", icon.name);
  entries.set("look", nameOfLook(icon.look));
  entries.set("progress", icon.progress);
  entries.set("failed", icon.failed);
  return item;
}

Value document(const CommandContext& context, const std::string& file, const HomePages& home) {
  Value document = startDocument(context.options.command);
  auto& entries = *document.dictionary();
  entries.set("result", "done");
  if (!file.empty()) entries.set("file", file);
  Value pages = Value::makeArray();
  for (const auto& page : home.pages) {
    Value icons = Value::makeArray();
    for (const auto& icon : page) icons.array()->append(documentOfIcon(icon));
    pages.array()->append(icons);
  }
  entries.set("pages", pages);
  entries.set("pagesDrawn", std::min(home.pages.size(), homePagesDrawn));
  Value failed = Value::makeArray();
  for (const auto& app : home.failed) {
    auto& item = failed.array()->appendDictionary();
    item.set("id", app.id);
    item.set("reason", app.reason);
  }
  entries.set("failed", failed);
  entries.set("syncing", home.syncing);
  return document;
}

/// "3 apps on 1 page: 2 installed, 1 waiting"
std::string summaryOf(const HomePages& home) {
  std::string text = std::to_string(home.icons()) + (home.icons() == 1 ? " app on " : " apps on ") +
                     std::to_string(home.pages.size()) + (home.pages.size() == 1 ? " page" : " pages");
  const char* between = ": ";
  for (std::size_t i = 0; i < homeLooks; ++i) {
    auto look = static_cast<HomeLook>(i);
    std::size_t count = home.countOf(look);
    if (count == 0) continue;
    text += between + std::to_string(count) + " " + nameOfLook(look);
    between = ", ";
  }
  return text;
}

/// By the file's ending.
PictureFormat formatOf(const std::string& file) {
  return std::filesystem::path(file).extension() == ".svg" ? PictureFormat::svg : PictureFormat::png;
}

}  // namespace

ExitCode runHome(const CommandContext& context, const HomeOptions& options) {
  DeviceView view(context, options.device);
  auto home = readHomePages(view.device(), view.status(), homePageSize, homePagesDrawn);
  std::error_code problem;
  auto name = std::filesystem::weakly_canonical(options.device, problem).filename().string();
  if (name.empty()) name = options.device;
  if (options.file == "-") {
    writeOutput(drawHome(home, name, options.dark ? darkTheme : lightTheme, PictureFormat::png));
    return ExitCode::done;
  }
  if (!options.file.empty())
    writeWholeFile(options.file, drawHome(home, name, options.dark ? darkTheme : lightTheme, formatOf(options.file)));
  if (context.options.json)
    writeDocument(document(context, options.file, home));
  else if (options.file.empty())
    writeOutput(homeInText(home, name));
  else
    context.report(printable(options.file) + ": " + (home.pages.empty() ? "no apps" : summaryOf(home)) + ".\n");
  return ExitCode::done;
}

}  // namespace tsd
