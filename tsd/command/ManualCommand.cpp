#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>

#include "tsd/CommandError.h"
#include "tsd/command/Commands.h"
#include "tsd/help/ManualPage.h"

namespace tsd {
namespace {

void writePage(const std::string& path, const std::string& text) {
  std::ofstream file(path, std::ios::binary | std::ios::trunc);
  file << text;
  file.close();
  if (!file) throw CommandError(path + ": " + std::strerror(errno ? errno : EIO));
}

}  // namespace

ExitCode runManual(const CommandContext&, const OptionTable& table, const ManualOptions& options) {
  std::error_code problem;
  std::filesystem::create_directories(options.folder, problem);
  if (problem) throw CommandError(options.folder + ": " + problem.message());
  writePage(options.folder + '/' + table.program + ".1", manualPage(table));
  for (const auto& command : table.commands) {
    writePage(options.folder + '/' + table.program + '-' + command.name + ".1", manualPage(table, command));
  }
  return ExitCode::done;
}

}  // namespace tsd
