#include <gtest/gtest.h>

#include <csignal>
#include <limits>
#include <thread>

#include "device/boundary/Boundary.h"
#include "device/boundary/Journal.h"
#include "device/services/FileSystemService.h"
#include "device/services/SystemLogService.h"
#include "device/services/TSSupportService.h"
#include "device/services/TransactionLogService.h"
#include "platform/Describe.h"
#include "platform/TSAsset.h"

namespace {

using namespace device;
using platform::ErrorRef;
using platform::Value;
using Action = InjectionRule::Action;

InjectionRule rule(const std::string& text) {
  ErrorRef error;
  auto parsed = InjectionRule::parse(text, &error);
  EXPECT_TRUE(parsed.has_value()) << error->describe();
  return parsed.value_or(InjectionRule{});
}

TEST(InjectionRule, isParsedOrRefusedWithTheReason) {
  struct Row {
    const char* text;
    const char* refusal = nullptr;
    InjectionRule rule{};
  };
  const Row rows[] = {
      {"writeAtomically=fail", nullptr, {"writeAtomically", "", 0, Action::fail}},
      {"RVPlaceholder.cancelForReason:com.example.a@3=error",
       nullptr,
       {"RVPlaceholder.cancelForReason", "com.example.a", 3, Action::error}},
      {"cancelForReason@1=none", nullptr, {"cancelForReason", "", 1, Action::none}},
      {"CorvaneClearUninstalled=value=-9223372036854775808",
       nullptr,
       {"CorvaneClearUninstalled", "", 0, Action::value, INT64_MIN}},
      {"transfer:a=kill", nullptr, {"transfer", "a", 0, Action::kill}},
      {"log.error=kill-after", nullptr, {"log.error", "", 0, Action::killAfter}},
      {"AppsClient.reconcileSync=cancel=com.example.b",
       nullptr,
       {"AppsClient.reconcileSync", "", 0, Action::cancel, 0, "com.example.b"}},
      {"RVPromisedTransferToPath.setComplete=store=b",
       nullptr,
       {"RVPromisedTransferToPath.setComplete", "", 0, Action::store, 0, "b"}},
      {"step@3+=value=28", nullptr, {"step", "", 3, Action::value, 28, "", true}},
      {"", "expected POINT[:APP][@N[+]]=ACTION"},
      {"writeAtomically", "expected POINT[:APP][@N[+]]=ACTION"},
      {"=fail", "there is no point before the action"},
      {"nonsense=fail", "there is no point \"nonsense\""},
      {"FileSystem.cancelForReason=fail", "there is no point \"FileSystem.cancelForReason\""},
      {".transfer=fail", "there is no point \".transfer\""},
      {"transfer:=fail", "there is no app after the colon"},
      {"transfer@0=fail", "\"0\" after @"},
      {"transfer@1x=fail", "\"1x\" after @"},
      {"transfer@=fail", "\"\" after @"},
      {"transfer@+=fail", "\"+\" after @"},
      {"step:a=fail", "a step belongs to no app"},
      {"step=cancel=a", "nobody else can act"},
      {"step=value=0", "number of an error"},
      {"transfer=", "there is no action \"\""},
      {"transfer=explode", "there is no action \"explode\""},
      {"transfer=fail=1", "takes nothing"},
      {"transfer=value", "takes a number"},
      {"transfer=value=9223372036854775808", "takes a number"},
      {"transfer=cancel=", "takes an app"},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.text);
    ErrorRef error;
    auto parsed = InjectionRule::parse(row.text, &error);
    ASSERT_EQ(parsed.has_value(), row.refusal == nullptr);
    if (!parsed) {
      EXPECT_NE(error->description().find(row.refusal), std::string::npos) << error->description();
      EXPECT_NE(error->description().find(row.text), std::string::npos) << error->description();
      continue;
    }
    EXPECT_EQ(error, nullptr);
    EXPECT_EQ(parsed->place, row.rule.place);
    EXPECT_EQ(parsed->app, row.rule.app);
    EXPECT_EQ(parsed->match, row.rule.match);
    EXPECT_EQ(parsed->action, row.rule.action);
    EXPECT_EQ(parsed->number, row.rule.number);
    EXPECT_EQ(parsed->target, row.rule.target);
    EXPECT_EQ(parsed->isDue(parsed->match + 1), row.rule.match == 0 || row.rule.onwards);
  }
}

/// One call of each shape across a boundary with the rules, as text: "answer error", and whether the body ran.
struct Called {
  std::string text;
  std::string ran;

  template <class Result, class Show>
  void call(Boundary& boundary, const Crossing& crossing, Result answer, Result failure, Show show) {
    ErrorRef error;
    Result result = boundary.call(
        crossing, &error, {}, [&] { return ran += '!', answer; }, failure);
    text += show(result) + (error ? "+" + error->domain() + " " : " ");
  }
};

TEST(Boundary, carriesOutWhatARuleOrders) {
  struct Row {
    const char* action;
    const char* expected;  // of a boolean, a number, an optional text, a value, an error as the answer
    const char* ran;
  };
  const Row rows[] = {
      {"none@9", "true 7 text 8 none ", "!!!!!"},  // a rule that does not match yet
      {"fail", "false+Injection -1+Injection absent+Injection (null)+Injection none+Injection ", ""},
      {"error", "true+Injection 7+Injection text+Injection 8+Injection Injection+Injection ", "!!!!!"},
      {"none", "false -1 absent (null) none ", ""},
      {"value=5", "true 5 absent 5 none ", ""},
      {"value=0", "false 0 absent 0 none ", ""},
      {"store=b", "true 7 text 8 none ", "!!!!!"},
  };
  for (const auto& row : rows) {
    SCOPED_TRACE(row.action);
    Boundary boundary;
    std::string bystander;
    boundary.setRules(
        {rule(std::string("setComplete=") + (std::string(row.action) == "none@9" ? "none" : row.action))});
    if (std::string(row.action) == "none@9") boundary.setRules({rule("setComplete@9=none")});
    boundary.setBystander([&](Action, const std::string& target) {
      bystander += target;
      boundary.call({{"RVPromise", "setComplete"}}, nullptr, {}, [] {});  // no rule is about the bystander
    });
    Called called;
    Crossing crossing{{"RVPromisedTransferToPath", "setComplete"}};
    called.call<bool>(boundary, crossing, true, false, [](bool b) { return std::string(b ? "true" : "false"); });
    called.call<int>(boundary, crossing, 7, -1, [](int n) { return std::to_string(n); });
    called.call<std::optional<std::string>>(boundary, crossing, "text", std::nullopt,
                                            [](auto t) { return t.value_or("absent"); });
    called.call<Value>(boundary, crossing, 8, {}, [](const Value& v) { return platform::describe(v); });
    called.call<ErrorRef>(boundary, crossing, nullptr, nullptr,
                          [](const ErrorRef& e) { return e ? e->domain() : std::string("none"); });
    EXPECT_EQ(called.text, row.expected);
    EXPECT_EQ(called.ran, row.ran);
    EXPECT_EQ(bystander, std::string(row.action) == "store=b" ? "bbbbb" : "");
  }
}

TEST(Boundary, matchesByClassAppAndCount) {
  struct Row {
    const char* rule;
    const char* failed;  // which of the four calls below, each made twice
  };
  for (Row row : {Row{"cancelForReason=fail", "01230123"},
                  {"RVPlaceholder.cancelForReason=fail", "11"},
                  {"cancelForReason:b=fail", "22"},
                  {"cancelForReason@6=fail", "1"},
                  {"RVPromise.cancelForReason=fail", "2323"},
                  {"RVPromisedTransferToPath.cancelForReason:b@2=fail", "2"},
                  {"cancelForReason:c=fail", ""}}) {
    SCOPED_TRACE(row.rule);
    Boundary boundary;
    boundary.setRules({rule(row.rule)});
    const Crossing crossings[] = {{{"RVAppInstallCoordinator", "cancelForReason"}, "a"},
                                  {{"RVPlaceholder", "cancelForReason"}, "a"},
                                  {{"RVPromisedTransferToPath", "cancelForReason"}, "b"},
                                  {{"RVPromisedOutOfBandTransfer", "cancelForReason"}, "a"}};
    std::string failed;
    for (int round = 0; round < 2; ++round) {
      for (int i = 0; i < 4; ++i) {
        if (!boundary.call(crossings[i], nullptr, {}, [] { return true; })) failed += std::to_string(i);
      }
    }
    EXPECT_EQ(failed, row.failed);
    EXPECT_FALSE(boundary.atTransfer("a").has_value());
  }
  Boundary boundary;
  boundary.setRules({rule("error=none"), rule("transfer:a@2=none")});
  bool written = false;
  boundary.call({{"log", "error"}}, nullptr, {}, [&] { written = true; });
  EXPECT_TRUE(written) << "an operation of the same name is something else than an error message";
  EXPECT_FALSE(boundary.atTransfer("a").has_value());
  EXPECT_FALSE(boundary.atTransfer("b").has_value());
  EXPECT_EQ(boundary.atTransfer("a")->action, Action::none);
}

TEST(BoundaryDeathTest, killsBeforeOrAfterTheEffect) {
  auto run = [](const char* text) {
    Boundary boundary;
    boundary.addJournal({[](const CallRecord& record) { std::fprintf(stderr, "%s ", record.operation.c_str()); }});
    boundary.setRules({rule(text)});
    boundary.call({{"FileSystem", "removeItem"}}, nullptr, {}, [] { std::fputs("effect ", stderr); });
    std::fputs("alive", stderr);
  };
  EXPECT_EXIT(run("removeItem=kill"), testing::KilledBySignal(SIGKILL), "^$");
  EXPECT_EXIT(run("removeItem=kill-after"), testing::KilledBySignal(SIGKILL), "^effect removeItem $");
}

TEST(Journal, hasALineForEveryCall) {
  Boundary boundary;
  std::string lines;
  boundary.addJournal({[&](const CallRecord& record) { lines += journalLine(record) + "\n"; }});
  boundary.setRules({rule("applicationInstallsDidCancel=none")});
  auto asset = platform::TSAsset::downloadAssetWithIdentifier("a", "Application", std::nullopt);
  auto other = std::make_shared<platform::TSAsset>();
  std::vector<std::shared_ptr<platform::TSAsset>> assets{other};
  int coordinator = 0;
  ErrorRef error;

  boundary.enter({{"AppsClient", "reconcileSync"}}, &error, {{"syncType", 1u}, {"newAnchor", "x"}}, [&] {
    return boundary.call({{"TSDeviceService", "prioritizeAsset"}, "a"}, nullptr, {{"asset", asset}, {"all", assets}},
                         [] { return true; });
  });
  Crossing message{{"log", "default"}};
  message.isMessage = true;
  boundary.call(message, nullptr, {{"category", "8"}, {"text", "caf\xc3\xa9 \"\xff\""}}, [] {});
  boundary.enter({{"AppsClient", "applicationInstallsDidCancel"}}, {}, [] { FAIL() << "was to be kept away"; });
  Crossing read{{"FileSystem", "readFile"}};
  read.answersBytes = true;
  boundary.call(read, &error, {{"path", std::optional<std::string>()}, {"big", UINT64_MAX}, {"half", 0.5}},
                [] { return std::optional<std::string>("12345"); });
  ThreadName name("transfer-1");
  boundary.call({{"RVAppInstallCoordinator", "error"}, "a"}, &error,
                {CallArgument::object("on", "coordinator", &coordinator), {"bytes", CallArgument::BytesCount{9}}}, [&] {
                  error = platform::makeError("TSError", 29);
                  return platform::makeError("E", 1, "why", error);
                });
  EXPECT_EQ(
      lines,
      R"({"n":1,"t":0,"thread":"daemon","service":"AppsClient","op":"reconcileSync","app":null,)"
      R"("args":{"syncType":1,"newAnchor":"x"},"result":null,"error":null})"
      "\n"
      R"({"n":2,"t":0,"thread":"daemon","service":"TSDeviceService","op":"prioritizeAsset","app":"a",)"
      R"("args":{"asset":{"identifier":"a","dataclass":"Application","isDownload":true,"isRestore":false,"storePID":0,)"
      R"("completedAssetParts":0,"downloadProgress":0.0,"installProgress":0.0,"object":"asset#1"},)"
      R"("all":[{"identifier":"","dataclass":"","isDownload":false,"isRestore":false,"storePID":0,)"
      R"("completedAssetParts":0,"downloadProgress":0.0,"installProgress":0.0,"object":"asset#2"}]},)"
      R"("result":true,"error":null})"
      "\n"
      R"({"n":3,"t":0,"thread":"daemon","service":"AppsClient","op":"reconcileSync","app":null,)"
      R"("args":{},"result":true,"error":null,"end":true})"
      "\n"
      R"({"n":4,"t":0,"thread":"daemon","service":"log","op":"default","app":null,"category":"8","text":"café \")"
      "\xEF\xBF\xBD"
      R"(\""})"
      "\n"
      R"({"n":5,"t":0,"thread":"daemon","service":"FileSystem","op":"readFile","app":null,)"
      R"("args":{"path":null,"big":18446744073709551615,"half":0.5},"result":5,"error":null})"
      "\n"
      R"({"n":6,"t":0,"thread":"transfer-1","service":"RVAppInstallCoordinator","op":"error","app":"a",)"
      R"("args":{"on":"coordinator#1","bytes":9},"result":{"domain":"E","code":1,"description":"why",)"
      R"("underlying":{"domain":"TSError","code":29}},"error":{"domain":"TSError","code":29}})"
      "\n");
  auto last = parseJournalLine(std::string_view(lines).substr(lines.rfind('\n', lines.size() - 2) + 1));
  ASSERT_TRUE(last);
  EXPECT_EQ(last->app + last->thread + last->operation, "atransfer-1error");
  EXPECT_EQ(last->error->describe() + jsonText(last->arguments), R"(TSError 29{"on":"coordinator#1","bytes":9})");
  EXPECT_FALSE(parseJournalLine("{\"n\":1"));
  EXPECT_EQ(boundary.nameOfObject("coordinator", &coordinator), "coordinator#1");
  boundary.forgetObject(&coordinator);
  EXPECT_EQ(boundary.nameOfObject("coordinator", &coordinator), "coordinator#2");
}

TEST(Journal, numbersRecordsInTheOrderTheyArrive) {
  auto queue = makeThreadedEventQueue();
  Boundary boundary(&queue->clock());
  std::vector<std::uint64_t> numbers;
  std::chrono::microseconds last{};
  boundary.addJournal({[&](const CallRecord& record) { numbers.push_back(record.number); }});
  boundary.addJournal({[&](const CallRecord& record) {
    EXPECT_EQ(numbers.back(), record.number);
    EXPECT_TRUE(last <= record.time && record.began <= record.time);
    last = record.time;
  }});
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i) {
    threads.emplace_back([&] {
      for (int n = 0; n < 200; ++n) {
        auto asset = std::make_shared<platform::TSAsset>();
        boundary.enter({{"AppsClient", "installedAssets"}}, {{"asset", asset}}, [] {});
      }
    });
  }
  for (auto& thread : threads) thread.join();
  ASSERT_EQ(numbers.size(), 1600u);
  for (std::size_t i = 0; i < numbers.size(); ++i) ASSERT_EQ(numbers[i], i + 1);
}

TEST(JournalText, isValidJSONForAnyValue) {
  auto value = Value::makeDictionary();
  auto& entries = *value.dictionary();
  entries.set("z", INT64_MIN);
  entries.set("a", 1e300);
  entries.set("nan", std::numeric_limits<double>::quiet_NaN());
  entries.set("date", platform::Date{0});
  entries.set("data", Value::makeData("123"));
  entries.set("list", Value::makeArray());
  entries.set("bad\xff", false);
  EXPECT_EQ(jsonText(value),
            "{\"z\":-9223372036854775808,\"a\":1e+300,\"nan\":null,\"date\":\"2001-01-01T00:00:00Z\","
            "\"data\":3,\"list\":[],\"bad\xEF\xBF\xBD\":false}");
  EXPECT_EQ(jsonText({}), "null");
  EXPECT_EQ(jsonText(Value("x"), 2), "\"x\"");
  EXPECT_EQ(valueOfJson(jsonText(value, 2)), valueOfJson(jsonText(value)));

  auto list = Value::makeArray();
  for (int i = 0; i < 1000; ++i) list.array()->append(i);
  entries.set("list", list);
  entries.set("data", std::string(5000, 'x'));
  std::string brief = jsonText(sketchOf(value));
  EXPECT_NE(brief.find("\"list\":\"[1000 elements]\""), std::string::npos) << brief;
  EXPECT_NE(brief.find("x… (5000 bytes)\""), std::string::npos) << brief;
  EXPECT_LT(brief.size(), 1300u);
}

TEST(FileSystemService, tellsOfFailuresNobodyLooksAt) {
  auto files = makeMemoryFileTree();
  Boundary boundary;
  boundary.setRules({rule("createDirectory=fail"), rule("utimes@2=fail"), rule("copyItem=none")});
  std::string told;
  FileSystemService service(boundary, *files, [&](auto operation, auto path, auto reason) {
    told += std::string(operation) + " " + std::string(path) + ": " + std::string(reason) + "\n";
  });
  service.writeAtomically("/f", "x", nullptr, platform::Durability::lasting);
  service.removeItem("/none", nullptr);
  service.readFile("/none", nullptr);
  EXPECT_EQ(told, "");
  int number = 0;
  EXPECT_EQ(service.utimes("/f", number), 0);
  EXPECT_EQ(service.utimes("/f", number), -1);
  EXPECT_EQ(number, EIO);
  ErrorRef error;
  EXPECT_FALSE(service.createDirectory("/d", true, {}, &error));
  EXPECT_EQ(error->domain(), "Injection");
  EXPECT_FALSE(files->fileExists("/d"));
  EXPECT_FALSE(service.copyItem("/f", "/g", nullptr));
  EXPECT_FALSE(service.writeAtomically("/none/f", "x", nullptr, platform::Durability::lasting));
  EXPECT_EQ(told,
            "utimes /f: Input/output error\n"
            "createDirectory /d: injected at FileSystem.createDirectory\n"
            "copyItem /f: no reason given\n"
            "writeAtomically /none/f: No such file or directory\n");
}

TEST(Logs, areWrittenAsLines) {
  Boundary boundary;
  std::string text;
  SystemLogService log(boundary, [&](const LogRecord& record) {
    text +=
        std::string(SystemLogService::nameOfLevel(record.level)) + " " + record.category + " " + record.message + "\n";
  });
  TSSupportService support(boundary, log);
  TransactionLogService transactions(boundary);
  transactions.logStep(1, 1, 1, true, "a", "before anybody listens");
  transactions.initializeWithLog(log.createHandle("com.vantor.tsd.appsync", "Transactions"));
  transactions.logStep(4, 1, 2, false, "a", "Finished creating placeholder");
  transactions.logScenario("Orrin restore", 0, true, "b", "done");
  support.TSGetLogCategory(15).write(platform::LogLevel::error, "oops");
  EXPECT_EQ(&support.TSGetLogCategory(8), &support.TSGetLogCategory(8));
  EXPECT_EQ(text,
            "default Transactions step 4 party 1 phase 2 failure a: Finished creating placeholder\n"
            "default Transactions scenario \"Orrin restore\" step 0 success b: done\n"
            "error 15 oops\n");
  auto account = support.makeAccountInfo();
  account->setVantorID("me");
  EXPECT_EQ(account->describe(), "<TSMutableAccountInfo vantorID me DSID (null) altDSID (null)>");

  SystemLogService deaf(boundary, nullptr);
  EXPECT_FALSE(deaf.makeHandle("8")->isEnabled(platform::LogLevel::error));
  boundary.addJournal({[](const CallRecord&) {}});
  EXPECT_TRUE(deaf.makeHandle("8")->isEnabled(platform::LogLevel::error));
}

}  // namespace
