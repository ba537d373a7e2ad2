#include <benchmark/benchmark.h>

#include <memory>

#include "bench/Benchmarks.h"
#include "bench/Phone.h"
#include "bench/TodoList.h"
#include "core/Say.h"
#include "platform/DevicePaths.h"
#include "plist/PropertyList.h"

// What the plug-in and the device in memory cost beside the codec.

namespace bench {

namespace {

std::size_t appCount() { return isShort ? 10 : 100; }
std::size_t manyAppsCount() { return isShort ? 20 : 10000; }

void askForPackages(benchmark::State& state, std::size_t apps) {
  for (auto _ : state) {
    Phone phone;
    phone.stageApps(apps);
    std::vector<platform::TSAssetRef> assets;
    state.SetIterationTime(phone.askForPackages(assets));
    if (assets.size() != apps) state.SkipWithError("not every app was asked for");
  }
}

/// As many apps as in the largest of these, on many devices of a few apps each: the same memory to go through, so that
/// what is left of a difference to one device is what that device's size costs.
void askManyPhones(benchmark::State& state) {
  for (auto _ : state) {
    std::vector<std::unique_ptr<Phone>> phones(manyAppsCount() / appCount());
    for (auto& phone : phones) (phone = std::make_unique<Phone>())->stageApps(appCount());
    std::vector<platform::TSAssetRef> assets;
    double seconds = 0;
    for (auto& phone : phones) seconds += phone->askForPackages(assets);
    state.SetIterationTime(seconds);
  }
}

void markEntry(benchmark::State& state) {
  Phone phone;
  auto list = makeTodoList(listSize());
  phone.write(std::string(platform::todoListPath), plist::writeBinary(list).value());
  const auto& last = *(*list.array())[listSize() - 1].dictionary();
  auto asset = platform::TSAsset::downloadAssetWithIdentifier(*last["identifier"].string(), "Application", {});
  for (auto _ : state) phone.plugin().assetInstallSucceeded(asset);
}

void reportProgress(benchmark::State& state) {
  Phone phone;
  phone.stageApps(appCount());
  std::vector<platform::TSAssetRef> assets;
  phone.askForPackages(assets);
  std::size_t reports = 0;
  for (auto _ : state) {
    const auto& asset = assets[reports % assets.size()];
    double fraction = static_cast<double>(++reports % 1000) / 1000;
    asset->setDownloadProgress(static_cast<float>(fraction));
    phone.plugin().assetTransferUpdatedProgress(asset, fraction);
  }
}

void say(benchmark::State& state) {
  Phone phone;
  std::string text = "com.example.maps";
  for (auto _ : state) {
    benchmark::DoNotOptimize(text);
    appsync::say(phone.platform(), "Received %{public}@, %d of it", text, 1);
  }
}

void crossBoundary(benchmark::State& state) {
  device::Boundary boundary;
  std::string_view path = "/var/mobile";
  for (auto _ : state) {
    benchmark::DoNotOptimize(path);
    bool answer =
        boundary.call({{"FileSystem", "fileExists"}}, nullptr, {{"path", path}}, [&] { return !path.empty(); });
    benchmark::DoNotOptimize(answer);
  }
}

}  // namespace

void PluginBenchmarks::add() {
  int repetitions = isShort ? 1 : 5;
  benchmark::RegisterBenchmark("ask for packages", [](auto& state) {
    askForPackages(state, appCount());
  })->UseManualTime();
  benchmark::RegisterBenchmark("ask for many packages", [](auto& state) { askForPackages(state, manyAppsCount()); })
      ->UseManualTime()
      ->Repetitions(repetitions);
  benchmark::RegisterBenchmark("ask many phones", askManyPhones)->UseManualTime()->Repetitions(repetitions);
  benchmark::RegisterBenchmark("mark an entry", markEntry);
  benchmark::RegisterBenchmark("report progress", reportProgress);
  benchmark::RegisterBenchmark("say", say);
  benchmark::RegisterBenchmark("cross the boundary", crossBoundary);
}

void PluginBenchmarks::printRows(const Measurements& taken) const {
  double marking = taken["mark an entry"] / (taken["read binary"] + taken["write binary"]);
  printRow("mark an entry of a list of 10,000", decimal(marking) + " times reading and writing it", "under 1.3",
           marking < 1.3);
  double growth = taken["ask for many packages"] / static_cast<double>(manyAppsCount()) /
                  (taken["ask for packages"] / static_cast<double>(appCount()));
  printRow("outstanding packages: an app at 10,000 against one at 100", decimal(growth) + " times its time",
           "at most 1.2", growth <= 1.2);
  double size = taken["ask for many packages"] / taken["ask many phones"];
  printRow("... 10,000 on one device against 10,000 on a hundred", decimal(size) + " times the time", "at most 1.3",
           size <= 1.3);
  auto under = [&](const char* work, const char* benchmark, double unit, const char* unitName, double goal) {
    double figure = taken[benchmark] / unit;
    printRow(work, decimal(figure, 1) + ' ' + unitName, "under " + decimal(goal, 0) + ' ' + unitName, figure < goal);
  };
  under("a progress report, in memory, log off", "report progress", 1e-6, "microseconds", 5);
  under("a log call that nobody listens to", "say", 1e-9, "nanoseconds", 20);
  under("the boundary hook when off", "cross the boundary", 1e-9, "nanoseconds", 20);
}

}  // namespace bench
