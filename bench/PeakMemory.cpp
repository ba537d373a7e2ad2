#include "bench/PeakMemory.h"

#include <stdio.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>

#include "bench/Measurements.h"
#include "bench/Phone.h"
#include "bench/TemporaryFolder.h"
#include "bench/TodoList.h"
#include "platform/DevicePaths.h"
#include "plist/PropertyList.h"

namespace bench {

namespace {

using platform::Bytes;
using platform::Value;

/// A line of what the kernel says of this process, in bytes.
double memory(const std::string& name) {
  std::ifstream status("/proc/self/status");
  for (std::string word; status >> word;) {
    double kilobytes = 0;
    if (word == name + ':' && status >> kilobytes) return kilobytes * 1024;
  }
  throw std::runtime_error("the kernel does not tell " + name);
}

std::string listFile(const std::string& folder) { return folder + "/fs" + std::string(platform::todoListPath); }

/// As the plug-in does it when an app was installed.
void markEntry(Phone& phone, const std::string& identifier) {
  phone.plugin().assetInstallSucceeded(platform::TSAsset::downloadAssetWithIdentifier(identifier, "Application", {}));
}

void addKeys(Phone& phone) {
  auto path = std::string(platform::todoListPath);
  Value list = plist::read(phone.device().files().readFile(path).value());
  for (std::size_t at = 0; at < list.array()->size(); ++at) list.array()->dictionary(at)->set("state", "asked for");
  phone.write(path, plist::writeBinary(list).value());
}

/// Runs the edit of a list and answers how many times the list's file it took.
double timesTheFile(const std::string& edit, const Value& list, bool binary) {
  TemporaryFolder parent;
  std::string folder = parent.path() + "/device";
  if (!device::createDevice(folder)) throw std::runtime_error("cannot make " + folder);
  std::filesystem::create_directories(std::filesystem::path(listFile(folder)).parent_path());
  Bytes document = (binary ? plist::writeBinary(list) : plist::writeXML(list)).value();
  if (!(std::ofstream(listFile(folder), std::ios::binary) << document)) throw std::runtime_error("cannot write a list");
  std::string program = std::filesystem::read_symlink("/proc/self/exe");
  FILE* output = popen(("'" + program + "' --edit " + edit + " '" + folder + "'").c_str(), "r");
  double bytes = 0;
  bool answered = output && fscanf(output, "%lf", &bytes) == 1;
  if (!output || pclose(output) != 0 || !answered) throw std::runtime_error("no answer from the edit " + edit);
  return bytes / static_cast<double>(document.size());
}

}  // namespace

bool runEdit(const std::string& edit, const std::string& folder) {
  Phone phone(folder);
  double idle = memory("VmRSS");
  std::ofstream("/proc/self/clear_refs") << 5 << std::flush;  // the peak is what it is from now on
  if (edit.starts_with("mark:")) {
    markEntry(phone, edit.substr(5));
  } else if (edit == "keys") {
    addKeys(phone);
  } else {
    return false;
  }
  printf("%.0f\n", memory("VmHWM") - idle);
  return true;
}

void printPeakMemoryRows() {
  Value list = makeTodoList(largeListSize());
  auto last = (*(*list.array())[largeListSize() - 1].dictionary())["identifier"];
  std::string mark = "mark:" + std::string(*last.string());
  double figure = timesTheFile(mark, list, true);
  printRow("peak memory: an entry of 100,000 marked", decimal(figure, 1) + " times the file", "at most 5", figure <= 5);
  printRow("... of a list in XML", decimal(timesTheFile(mark, list, false), 1) + " times the file");
  printRow("... a key added to every entry", decimal(timesTheFile("keys", list, true), 1) + " times the file");
}

}  // namespace bench
