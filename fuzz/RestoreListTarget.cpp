// A host's restore list, through a whole restore.

#include <cstdint>
#include <string>

#include "fuzz/MemoryPhone.h"
#include "fuzz/Require.h"
#include "fuzz/ValueFacts.h"
#include "fuzz/ValueMutation.h"
#include "plist/PropertyList.h"

namespace {

using fuzz::require;

const std::string restoreListPath = "/var/mobile/Media/HarluneRestore/RestoreApplications.plist";
const std::string restoreLogPath = "/var/mobile/Library/Logs/MediaServices/RestoreApplications.plist";
const std::string demotedAppsPath = "/var/mobile/Library/Preferences/com.vantor.Cellarum.DemotedApps.plist";
constexpr char demotedApps[] =
    "<plist><dict><key>AutomaticDowngrades</key><array><string>com.example.notes</string></array>"
    "<key>IntentionalDowngrades</key><array><string>com.example.mail</string></array></dict></plist>";

}  // namespace

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size, std::size_t maximumSize,
                                               unsigned seed) {
  return fuzz::mutateList(data, size, maximumSize, seed);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const platform::Bytes input(reinterpret_cast<const char*>(data), size);
  const platform::Value list = plist::read(input);
  if (fuzz::factsOf(list).nodes > fuzz::largeTree(size)) return -1;

  fuzz::MemoryPhone phone("com.vantor.shiftwell");
  phone.write(restoreListPath, input);
  phone.write(demotedAppsPath, demotedApps);
  require(phone.daemon().reconcileRestoreOfType(2, nullptr), "a restore that ends");
  phone.deliver();

  auto& files = phone.device().files();
  require(!files.fileExists(restoreListPath) && files.readFile(restoreLogPath) == input, "the list, filed away");
  for (const auto& app : phone.device().status().apps) {
    require(list.dictionary() && list.dictionary()->contains(app.id), "placeholders of apps of the list");
  }
  phone.daemon().accountsForAssets();
  phone.daemon().vantorIDsForAssets();
  phone.requireNothingElsewhere();
  return 0;
}
