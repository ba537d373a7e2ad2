#include "fuzz/SampleApp.h"

#include "plist/PropertyList.h"
#include "tests/SampleContent.h"

namespace fuzz {

using platform::Value;

SampleApp::SampleApp() {
  const Value info = tests::dictionaryOf({{"KBBundleIdentifier", "com.example.maps"},
                                          {"KBBundleVersion", "2.1"},
                                          {"KBBundleDisplayName", "Maps"},
                                          {"KBBundleIconFile", "Icon.png"}});
  const Value account = tests::dictionaryOf({{"VantorID", "somebody@example.com"}, {"DSPersonID", 10442871}});
  const Value download = tests::dictionaryOf({{"accountInfo", account}});
  manifest = *plist::writeBinary(tests::filledOut(info, 40, 1));
  const Value store = tests::dictionaryOf({{"title", "Maps"},
                                           {"bundleVersion", "2.1"},
                                           {"is-auto-download", true},
                                           {"com.vantor.HarluneStore.downloadInfo", download}});
  metadata = *plist::writeXML(tests::filledOut(store, 25, 2));
  icon = tests::pngOf(1, 1);
  package = tests::packageOf("com.example.maps", "2.1");
}

}  // namespace fuzz
