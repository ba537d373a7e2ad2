#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/daemon/DeviceLock.h"
#include "tsd/terminal/Output.h"

namespace tsd {

ExitCode runInit(const CommandContext& context, const DeviceOnlyOptions& options) {
  platform::ErrorRef error;
  if (!device::createDevice(options.device, &error)) throw CommandError(textOf(error));
  const DeviceLock made(options.device);  // leaves its file behind, so that looking at the device need not make it
  if (context.options.json) {
    auto document = startDocument(context.options.command);
    document.dictionary()->set("result", "done");
    writeDocument(document);
  } else {
    context.report(options.device + ": an empty device\n");
  }
  return ExitCode::done;
}

}  // namespace tsd
