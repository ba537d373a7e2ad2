#include <CLI/CLI.hpp>
#include <algorithm>
#include <charconv>
#include <cstdint>
#include <cstdio>
#include <exception>
#include <functional>
#include <limits>
#include <map>
#include <memory>
#include <new>
#include <string>
#include <vector>

#include "tsd/CommandError.h"
#include "tsd/OptionTable.h"
#include "tsd/command/CarryOut.h"
#include "tsd/command/Commands.h"
#include "tsd/help/HelpText.h"
#include "tsd/stopping/LastWords.h"
#include "tsd/terminal/Output.h"
#include "tsd/terminal/Suggestion.h"

namespace tsd {
namespace {

/// What the command line asked for.
struct Invocation {
  CommonOptions common;
  std::vector<std::string> rules;
  CommandRun run;
  /// The values of options that take only a few; the parser does not give them.
  std::map<const CLI::Option*, std::vector<std::string>> words;
};

const std::map<std::string, ProgressMode> progressModes{{"auto", ProgressMode::automatic},
                                                        {"plain", ProgressMode::plain},
                                                        {"tty", ProgressMode::tty},
                                                        {"none", ProgressMode::none}};

constexpr const char* commonGroup = "Common";
constexpr const char* version = TSD_VERSION;

/// Lets the option take only these values.
CLI::Option* takeOneOf(Invocation& invocation, CLI::Option* option, const std::vector<std::string>& words) {
  invocation.words[option] = words;
  return option->check(CLI::IsMember(words).description(""));
}

void addCommonOptions(CLI::App* command, Invocation& invocation) {
  CommonOptions& common = invocation.common;
  command->add_flag("--json", common.json, wrapped("One JSON document on standard output, errors included"))
      ->group(commonGroup);
  auto* progress = command->add_option_function<std::string>(
      "--progress", [&common](const std::string& mode) { common.progress = progressModes.at(mode); },
      "How progress is shown: auto, plain, tty or none");
  takeOneOf(invocation, progress, {"auto", "plain", "tty", "none"})->option_text("MODE")->group(commonGroup);
  command
      ->add_flag_callback(
          "-q,--quiet",
          [&common] {
            common.quiet = true;
            common.progress = ProgressMode::none;
          },
          wrapped("No progress, and no report of what was done; what went wrong is told all the same"))
      ->group(commonGroup);
  command->add_option("--log", common.log, "Write the system log to this file")
      ->option_text("FILE")
      ->group(commonGroup);
  command->add_option("--calls", common.calls, "Write the journal of all calls to this file")
      ->option_text("FILE")
      ->group(commonGroup);
  command->add_option("--inject", invocation.rules, wrapped("Inject a fault: POINT[:APP][@N[+]]=ACTION (repeatable)"))
      ->option_text("RULE")
      ->expected(1)
      ->take_all()
      ->group(commonGroup);
  command->add_option("--plugin", common.plugin, wrapped("The plug-in's file; by default the one beside this program"))
      ->option_text("FILE")
      ->group(commonGroup);
}

/// Adds a subcommand with the common options; `run` gets `options` as they were parsed.
template <class Options>
CLI::App* addCommand(CLI::App& program, Invocation& invocation, const char* name, const char* description,
                     ExitCode (*run)(const CommandContext&, const Options&), const std::shared_ptr<Options>& options) {
  CLI::App* command = program.add_subcommand(name, description);
  addCommonOptions(command, invocation);
  command->callback([&invocation, name, run, options] {
    invocation.common.command = name;
    invocation.run = [run, options](const CommandContext& context) { return run(context, *options); };
  });
  return command;
}

/// A whole number in decimal digits. Anything else, or a number out of bounds, is refused with a usage error.
template <class Number>
void addNumber(CLI::App* command, const char* name, Number& target, const char* description,
               Number least = std::numeric_limits<Number>::min(), Number most = std::numeric_limits<Number>::max()) {
  auto take = [name, &target, least, most](const std::string& text) {
    Number number{};
    auto [end, problem] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (problem != std::errc() || end != text.data() + text.size() || number < least || number > most) {
      throw CommandError(ExitCode::usage, std::string(name) + ": '" + text + "' is not a whole number from " +
                                              std::to_string(least) + " to " + std::to_string(most));
    }
    target = number;
  };
  command->add_option_function<std::string>(name, take, wrapped(description))->option_text("N");
}

/// A folder's name must not be empty: its content would be looked for in the system's root.
std::string checkFolder(const std::string& folder) { return folder.empty() ? "a folder is expected" : ""; }

std::string checkFile(const std::string& file) { return file.empty() ? "a file is expected" : ""; }

void addDevice(CLI::App* command, std::string& device) {
  command->add_option("DEVICE", device, "The device's folder")->required()->check(checkFolder)->option_text(" ");
}

void addApp(CLI::App* command, std::string& app) {
  command->add_option("APP", app, "The app's bundle identifier")->required()->option_text(" ");
}

void addHost(CLI::App* command, std::string& host) {
  command->add_option("HOST", host, "The host's folder")->required()->check(checkFolder)->option_text(" ");
}

void addSample(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<SampleOptions>();
  auto* command =
      addCommand(program, invocation, "sample", "Write a host folder to try things with", runSample, options);
  addHost(command, options->host);
  addNumber<std::size_t>(command, "--apps", options->apps, "Apps in the todo list (8)", 1, 100000);
  addNumber<std::uint64_t>(command, "--package-size", options->packageSize, "Bytes of each package, about (262144)", 0,
                           std::uint64_t{1} << 31);
  addNumber<std::size_t>(command, "--files", options->files,
                         "Files of each package (3 to 12, and 40 in one of eight packages)", 3, 1000);
  addNumber<std::size_t>(command, "--restored", options->restored,
                         "Apps in the restore list, as far as there are so many (5)", 0, 100000);
  addNumber(command, "--seed", options->seed, "The same seed gives the same folder (1)");
  command->add_flag("--demo", options->demo,
                    wrapped("Make three entries special: a damaged package, a bad identifier and an app to remove. "
                            "Packages/older then holds older versions of the first app and of the one to remove, to "
                            "be put on the device with 'tsd store DEVICE APP --finish --package FILE'"));
}

void addHostEditor(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<HostOptions>();
  auto* command = addCommand(program, invocation, "host", "Make, change or check a host's folder", runHost, options);
  auto* action = command->add_option("ACTION", options->action,
                                     wrapped("new: an empty host; add: put apps into it; remove: take apps out of it; "
                                             "check: find what a sync would stumble over, each package read whole"));
  takeOneOf(invocation, action, {"new", "add", "remove", "check"})->required()->option_text(" ");
  addHost(command, options->host);
  command
      ->add_option("SOURCE", options->items,
                   wrapped("What is added: packages, or folders that one is made of; what is removed: identifiers"))
      ->option_text("...");
  command->add_flag("--restore", options->restore, wrapped("Of add: put the apps into the restore list too"));
  auto* demoted = command->add_option("--demoted", options->demoted,
                                      wrapped("Of add: into the restore list, and into the list of demoted apps as "
                                              "by-hand, automatically or both"));
  takeOneOf(invocation, demoted, {"by-hand", "automatically", "both"})->option_text("HOW");
  command->add_flag("--replace", options->replace, wrapped("Of add: what the host has of these apps goes"));
  command->add_flag("--uninstall", options->uninstall,
                    wrapped("Of remove: leave an entry in the todo list that removes the app from devices"));
}

void addPack(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<PackOptions>();
  auto* command = addCommand(program, invocation, "pack", "Make a package of an app's folder", runPack, options);
  command
      ->add_option("FOLDER", options->folder,
                   wrapped("A NAME.app folder, one with nothing but that in it, or another with an Info.plist"))
      ->required()
      ->check(checkFolder)
      ->option_text(" ");
  command->add_option("-o,--output", options->file, "The package")->required()->check(checkFile)->option_text("FILE");
  command->add_flag("--replace", options->replace, "An older file of that name goes");
}

template <class Options>
CLI::App* addDeviceCommand(CLI::App& program, Invocation& invocation, const char* name, const char* description,
                           ExitCode (*run)(const CommandContext&, const Options&)) {
  auto options = std::make_shared<Options>();
  auto* command = addCommand(program, invocation, name, description, run, options);
  addDevice(command, options->device);
  return command;
}

void addTrace(CLI::App* command, Invocation& invocation) {
  command
      ->add_option("--trace", invocation.common.trace,
                   wrapped("Write a timeline to this file, in the trace event format that timeline viewers open"))
      ->option_text("FILE");
}

/// Of commands that drive the plug-in.
void addRecord(CLI::App* command, Invocation& invocation) {
  command
      ->add_option("--record", invocation.common.record,
                   wrapped("Record what the plug-in is told and does into this file, for 'tsd replay'"))
      ->option_text("FILE");
}

void addSync(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<SyncOptions>();
  auto* command = addCommand(program, invocation, "sync", "Sync a device with a host folder", runSync, options);
  addDevice(command, options->device);
  addHost(command, options->host);
  auto* asset = command->add_option_function<std::vector<std::string>>(
      "--asset",
      [options](const std::vector<std::string>& texts) {
        for (const auto& text : texts) addAssetReport(options->reports, text);
      },
      wrapped(
          "What the daemon reports of an app's asset: APP:KEY=VALUE,... with the keys isDownload, isRestore (true or "
          "false), completedAssetParts (a number), path (relative, absolute, none, recorded or a text), or "
          "just stall: progress without an end (repeatable)"));
  asset->option_text("ASSET")->expected(1)->take_all();
  invocation.words[asset] = assetReportWords();
  auto* endPhase = command->add_option_function<std::string>(
      "--end-phase", [options](const std::string& text) { options->endPhase = text == "success"; },
      wrapped("How the transfer phase is reported to have ended, whatever happened"));
  takeOneOf(invocation, endPhase, {"success", "failed"})->option_text("success|failed");
  command->add_flag("--daemon-reports", options->daemonReports,
                    wrapped("Report the installs' outcomes to the plug-in as well"));
  addNumber<std::size_t>(command, "--repeat", options->repeat, "Syncs in a row, with one plug-in object (1)", 1,
                         1000000);
  addTrace(command, invocation);
  addRecord(command, invocation);
  addNumber<std::size_t>(command, "--transfers", options->transfers, "Packages sent at the same time (2)", 1, 256);
}

void addPlan(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<PlanOptions>();
  auto* command =
      addCommand(program, invocation, "plan", "Show what a sync would do, and why, without doing it", runPlan, options);
  addDevice(command, options->device);
  addHost(command, options->host);
}

void addRestore(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<RestoreOptions>();
  auto* command =
      addCommand(program, invocation, "restore", "Bring back a host's apps as placeholders", runRestore, options);
  addDevice(command, options->device);
  addHost(command, options->host);
  addNumber(command, "--type", options->type, "Type of the restore, 0 to 3; 2 and 3 bring apps back (2)", 0, 3);
  addTrace(command, invocation);
  addRecord(command, invocation);
  command->add_flag("--in-daemon", options->inDaemon,
                    wrapped("Run in the daemon's own process, not the migration component's"));
}

void addHome(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<HomeOptions>();
  auto* command = addCommand(program, invocation, "home", "Draw what a person would see", runHome, options);
  addDevice(command, options->device);
  command
      ->add_option("-o,--output", options->file,
                   wrapped("The picture, a PNG or, by its ending, an SVG file; - for standard output. Without it the "
                           "picture is of text"))
      ->check(checkFile)
      ->option_text("FILE");
  command->add_flag("--dark", options->dark, "Light on dark");
}

void addWatch(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<WatchOptions>();
  auto* command =
      addCommand(program, invocation, "watch", "Show the home screen's apps while they change", runWatch, options);
  addDevice(command, options->device);
  command->add_flag("--until-idle", options->untilIdle, wrapped("End when nobody is changing the device"));
}

void addReport(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<ReportOptions>();
  options->version = version;
  auto* command = addCommand(program, invocation, "report", "Write a page about a run or a recording, for any browser",
                             runReport, options);
  command->add_option("DEVICE", options->device, "The device's folder, or a recording")
      ->required()
      ->check(checkFile)
      ->option_text(" ");
  addNumber<std::uint64_t>(command, "--run", options->run, "Number of the run (that of the last sync or restore)", 1);
  command->add_option("-o,--output", options->file, "The page, an HTML file; - for standard output")
      ->required()
      ->check(checkFile)
      ->option_text("FILE");
}

void addQuery(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<QueryOptions>();
  auto* command = addCommand(program, invocation, "query", "Ask the plug-in a question", runQuery, options);
  addDevice(command, options->device);
  auto* question =
      command->add_option("QUESTION", options->question, "metrics, accounts, vantor-ids or disabled-asset-types");
  takeOneOf(invocation, question, {"metrics", "accounts", "vantor-ids", "disabled-asset-types"})
      ->required()
      ->option_text(" ");
  addRecord(command, invocation);
}

void addRecordingFile(CLI::App* command, std::string& file) {
  command->add_option("FILE", file, "The recording")->required()->check(checkFile)->option_text(" ");
}

void addReplay(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<ReplayOptions>();
  auto* command = addCommand(program, invocation, "replay", "Tell a recording to the plug-in, and compare what it does",
                             runReplay, options);
  addRecordingFile(command, options->file);
  command->add_flag("--go-on", options->goOn, wrapped("Go on behind a difference, and list all of them"));
  auto* ignore = command->add_option("--ignore", options->ignored,
                                     wrapped("What is not compared: messages, or steps of the transaction log "
                                             "(repeatable)"));
  takeOneOf(invocation, ignore, {"messages", "steps"})->option_text("WHAT")->expected(1)->take_all();
}

void addRecording(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<RecordingOptions>();
  auto* command =
      addCommand(program, invocation, "recording", "Look into a recording, or redact it", runRecording, options);
  auto* action = command->add_option("ACTION", options->action,
                                     wrapped("show: every call, as a line; journal: the same as records of the "
                                             "call journal; redact: write it anew, with other texts in "
                                             "place of identifiers, names, accounts and contents. With --plugin the "
                                             "new one has to replay"));
  takeOneOf(invocation, action, {"show", "journal", "redact"})->required()->option_text(" ");
  addRecordingFile(command, options->file);
  command->add_option("OUTPUT", options->output, wrapped("Of redact: the new recording; nothing may be there"))
      ->check(checkFile)
      ->option_text(" ");
}

void addSet(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<SetOptions>();
  auto* command = addCommand(program, invocation, "set", "Show or change the settings of a device", runSet, options);
  addDevice(command, options->device);
  auto* settings =
      command
          ->add_option("KEY=VALUE", options->settings,
                       wrapped("app-installation, app-removal = allowed or forbidden; icon-size = 16 to 1024; "
                               "backup-placeholders, device-service-prioritize, device-service-cancel = yes or no; "
                               "backup-error = no or yes. Without any the settings are shown"))
          ->option_text("...");
  invocation.words[settings] = settingWords();
}

void addUninstall(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<UninstallOptions>();
  auto* command = addCommand(program, invocation, "uninstall", "Uninstall an app as the person on the device would",
                             runUninstall, options);
  addDevice(command, options->device);
  addApp(command, options->app);
}

void addWhy(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<WhyOptions>();
  auto* command =
      addCommand(program, invocation, "why", "Tell what happened to an app in the last runs", runWhy, options);
  addDevice(command, options->device);
  command
      ->add_option("APP", options->app,
                   wrapped("The app's bundle identifier, its name, or a part of either that no other app has"))
      ->required()
      ->option_text(" ");
  addNumber<std::uint64_t>(command, "--run", options->run, "Tell of the run of this number ('tsd runs' lists them)", 1);
  command->add_flag("--all", options->all, "Tell of all kept runs that mention the app");
}

void addStore(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<StoreOptions>();
  auto* command =
      addCommand(program, invocation, "store", "Start or finish an install by the store", runStore, options);
  addDevice(command, options->device);
  addApp(command, options->app);
  auto* finish =
      command->add_flag("--finish", options->finish, wrapped("Finish the install; begin it first if there is none"));
  command->add_option("--package", options->package, "The package to finish with, a file of the host")
      ->option_text("FILE")
      ->needs(finish);
  auto& install = options->install;
  addNumber(command, "--type", install.installType, "Install type (1)");
  addNumber(command, "--state", install.installState, "Install state (1)");
  addNumber(command, "--phase", install.installPhase, "Install phase (0)");
  command->add_flag("--paused", install.paused, "The install is paused");
  command->add_flag_callback(
      "--no-progress", [&install] { install.hasProgress = false; }, "Without install progress");
  command->add_option("--app-type", install.applicationType, "Application type (User)")->option_text("T");
  command->add_flag("--system-bundle", install.systemBundle, "Registered as a system bundle");
  command->add_flag_callback(
      "--no-coordinator", [&install] { install.createsCoordinator = false; }, "Without a coordinator");
}

OptionEntry entryOf(const CLI::Option& option, const Invocation& invocation) {
  OptionEntry entry;
  entry.isArgument = option.get_positional();
  if (entry.isArgument) {
    entry.names = {option.get_name(true)};
    entry.value = entry.names.front();
  } else {
    for (const auto& name : option.get_snames()) entry.names.push_back("-" + name);
    for (const auto& name : option.get_lnames()) entry.names.push_back("--" + name);
    if (option.get_items_expected_max() > 0) entry.value = option.get_option_text();
  }
  entry.description = unwrapped(option.get_description());
  auto words = invocation.words.find(&option);
  if (words != invocation.words.end()) entry.words = words->second;
  entry.isRequired = option.get_required();
  entry.isRepeatable =
      option.get_expected_max() > 1 || option.get_multi_option_policy() == CLI::MultiOptionPolicy::TakeAll;
  entry.isCommon = option.get_group() == commonGroup;
  return entry;
}

OptionTable tableOf(const CLI::App& program, const Invocation& invocation) {
  OptionTable table{program.get_name(), version, program.get_description(), exitCodes(), {}, {}, {}, {}};
  table.points = device::injectionPoints();
  table.calls = pointEntries();
  table.actions = device::injectionActions();
  for (const auto* command : program.get_subcommands({})) {
    CommandEntry entry{command->get_name(), command->get_description(), {}};
    for (const auto* option : command->get_options()) entry.options.push_back(entryOf(*option, invocation));
    table.commands.push_back(std::move(entry));
  }
  return table;
}

/// Adds a subcommand about the program itself, which needs no device: `run` gets what all subcommands take.
template <class Options>
CLI::App* addTableCommand(CLI::App& program, Invocation& invocation, const char* name, const char* description,
                          ExitCode (*run)(const CommandContext&, const OptionTable&, const Options&),
                          const std::shared_ptr<Options>& options) {
  CLI::App* command = program.add_subcommand(name, description);
  command->callback([&program, &invocation, name, run, options] {
    invocation.common.command = name;
    invocation.run = [&program, &invocation, run, options](const CommandContext& context) {
      return run(context, tableOf(program, invocation), *options);
    };
  });
  return command;
}

void addCompletion(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<CompletionOptions>();
  auto* command =
      addTableCommand(program, invocation, "completion", "Write the completion for a shell", runCompletion, options);
  auto* shell = command->add_option("SHELL", options->shell, "bash, zsh or fish");
  takeOneOf(invocation, shell, {"bash", "zsh", "fish"})->required()->option_text(" ");
}

void addManual(CLI::App& program, Invocation& invocation) {
  auto options = std::make_shared<ManualOptions>();
  auto* command =
      addTableCommand(program, invocation, "manual", "Write a manual page for each subcommand", runManual, options);
  command->add_option("FOLDER", options->folder, "The folder for the pages; made if it is not there")
      ->required()
      ->check(checkFolder)
      ->option_text(" ");
}

std::vector<std::string> namesOfCommands(const CLI::App& program) {
  std::vector<std::string> names;
  for (const auto* each : program.get_subcommands({})) names.push_back(each->get_name());
  return names;
}

void addHelp(CLI::App& program, Invocation& invocation) {
  auto name = std::make_shared<std::string>();
  auto* command = program.add_subcommand("help", "Tell what the program or a subcommand does");
  takeOneOf(invocation, command->add_option("COMMAND", *name, "A subcommand"), namesOfCommands(program))
      ->option_text(" ");
  command->callback([&program, &invocation, name] {
    invocation.common.command = "help";
    invocation.run = [&program, name](const CommandContext&) {
      // The program's own help would be that of the requested subcommand, which is this one.
      writeOutput(name->empty()
                      ? program.get_formatter()->make_help(&program, program.get_name(), CLI::AppFormatMode::Normal)
                      : program.get_subcommand(*name)->help(program.get_name()));
      return ExitCode::done;
    };
  });
}

void addCommands(CLI::App& program, Invocation& invocation) {
  program.require_subcommand(1);
  std::string codes;
  for (const auto& each : exitCodes()) {
    codes += (codes.empty() ? "Exit codes: " : ", ") + std::to_string(static_cast<int>(each.code)) + ' ' + each.meaning;
  }
  program.footer(wrapped(codes + '.', 78));
  program.set_version_flag("--version", std::string("tsd ") + version);
  addSample(program, invocation);
  addHostEditor(program, invocation);
  addPack(program, invocation);
  addDeviceCommand(program, invocation, "init", "Make an empty device", runInit);
  addSync(program, invocation);
  addPlan(program, invocation);
  addRestore(program, invocation);
  addDeviceCommand(program, invocation, "status", "Show the apps of a device and the running installs", runStatus);
  addDeviceCommand(program, invocation, "runs", "List the runs that a device keeps", runRuns);
  addWhy(program, invocation);
  addHome(program, invocation);
  addWatch(program, invocation);
  addReport(program, invocation);
  addQuery(program, invocation);
  for (auto* command :
       {addDeviceCommand(program, invocation, "backup", "Make the apps' store metadata ready for a backup", runBackup),
        addDeviceCommand(program, invocation, "clear", "Forget all sync data and placeholders", runClear)}) {
    addRecord(command, invocation);
  }
  addReplay(program, invocation);
  addRecording(program, invocation);
  addSet(program, invocation);
  addUninstall(program, invocation);
  addStore(program, invocation);
  addCompletion(program, invocation);
  addTableCommand(program, invocation, "points", "List the points of --inject", runPoints,
                  std::make_shared<PointsOptions>());
  addManual(program, invocation);
  addHelp(program, invocation);
}

/// The subcommand's name when the first argument is one.
std::string commandNamed(CLI::App& program, int count, char** arguments) {
  if (count < 2) return {};
  const auto names = namesOfCommands(program);
  return std::find(names.begin(), names.end(), arguments[1]) == names.end() ? std::string() : arguments[1];
}

bool asksForJson(int count, char** arguments) {
  return std::find(arguments, arguments + count, std::string("--json")) != arguments + count;
}

ExitCode run(int count, char** arguments) {
  Console console;
  Invocation invocation;
  CLI::App program("Plays the sync daemon and its host against a device in a folder.", "tsd");
  addCommands(program, invocation);
  std::string command = commandNamed(program, count, arguments);
  std::string message;
  try {
    if (count > 1 && arguments[1][0] != '-' && command.empty()) {
      throw CommandError(ExitCode::usage, "there is no subcommand '" + std::string(arguments[1]) + "'" +
                                              didYouMean(arguments[1], namesOfCommands(program)));
    }
    invocation.common.arguments.assign(arguments + std::min(count, 2), arguments + count);
    program.parse(count, arguments);
    return carryOut(invocation.run, invocation.rules, invocation.common, console);
  } catch (const CLI::Success& wish) {
    program.exit(wish);
    return ExitCode::done;
  } catch (const CLI::ParseError& error) {
    message = error.what();
  } catch (const CommandError& error) {
    message = error.what();
  }
  console.message(message + " ('tsd " + (command.empty() ? "" : command + " ") + "--help' tells more)");
  invocation.common.command = command;
  invocation.common.json = asksForJson(count, arguments);
  if (invocation.common.json) writeFailure(invocation.common, ExitCode::usage, message);
  return ExitCode::usage;
}

}  // namespace
}  // namespace tsd

int main(int count, char** arguments) {
  tsd::prepareProcess();
  try {
    return static_cast<int>(tsd::run(count, arguments));
  } catch (const std::bad_alloc&) {
    tsd::sayWithoutMemory("out of memory");
  } catch (const std::exception& problem) {
    tsd::sayWithoutMemory(problem.what());
  }
  return static_cast<int>(tsd::ExitCode::failed);
}
