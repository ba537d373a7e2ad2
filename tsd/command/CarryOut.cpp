#include "tsd/command/CarryOut.h"

#include <exception>
#include <new>
#include <optional>

#include "tsd/CommandError.h"
#include "tsd/daemon/InjectionRules.h"
#include "tsd/terminal/Output.h"

namespace tsd {

ExitCode carryOut(const CommandRun& run, const std::vector<std::string>& rules, CommonOptions& options,
                  Console& console) {
  ExitCode code = ExitCode::failed;
  std::string message;
  std::optional<KeptRun> kept;
  try {
    options.rules = parseRules(rules);
    code = run({options, console, kept});
    if (kept) kept->end(code);
    return code;
  } catch (const CommandError& error) {
    code = error.code();
    message = error.what();
  } catch (const std::bad_alloc&) {
    message = "out of memory";
  } catch (const std::exception& error) {
    message = error.what();
  }
  if (kept) kept->end(code, message);
  console.message(message);
  if (options.json) writeFailure(options, code, message);
  return code;
}

}  // namespace tsd
