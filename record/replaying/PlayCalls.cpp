#include <map>
#include <tuple>
#include <utility>

#include "record/replaying/ReplayCrossing.h"

namespace record {

using platform::OBApplicationWorkspaceObserverProtocol;
using platform::RVAppInstallObserverDelegate;
using platform::TSClient;
using Lock = platform::Mutex::Lock;

namespace {

/// An argument of a call into the plug-in, kept while the call runs.
template <class T>
struct Argument {
  std::remove_cvref_t<T> value{};
  void read(Replayer& replayer, ItemReader& items) { value = get<std::remove_cvref_t<T>>(replayer, items); }
  const std::remove_cvref_t<T>& pass() const { return value; }
  void putOut(Replayer&, ItemWriter&) const {}
};
template <>
struct Argument<const Proxies&> {
  std::shared_ptr<const Proxies> value{};
  void read(Replayer& replayer, ItemReader& items) { value = proxiesOf(replayer, items); }
  const Proxies& pass() const { return *value; }
  void putOut(Replayer&, ItemWriter&) const {}
};
template <>
struct Argument<std::string_view> {
  std::string value{};
  void read(Replayer&, ItemReader& items) { value = items.text(); }
  std::string_view pass() const { return value; }
  void putOut(Replayer&, ItemWriter&) const {}
};
template <>
struct Argument<ErrorRef*> {
  ErrorRef value{};
  bool isWanted = false;
  void read(Replayer&, ItemReader& items) { isWanted = items.boolean(); }
  ErrorRef* pass() { return isWanted ? &value : nullptr; }
  void putOut(Replayer& replayer, ItemWriter& items) const {
    if (isWanted) put(items, replayer, value);
  }
};

/// Calls one operation of `target`, which may be null: then nobody is there any more to be called.
template <auto method, class R, class T, class... A>
void callMethod(Replayer& replayer, ItemReader& arguments, ItemWriter& result, std::shared_ptr<T> target,
                R (T::*)(A...)) {
  std::tuple<Argument<A>...> given;
  {
    Lock lock(replayer.mutex);
    std::apply([&](auto&... each) { (each.read(replayer, arguments), ...); }, given);
  }
  const auto putOuts = [&] {
    Lock lock(replayer.mutex);
    if (!replayer.isOver()) std::apply([&](auto&... each) { (each.putOut(replayer, result), ...); }, given);
  };
  const auto call = [&] {
    try {
      return std::apply([&](auto&... each) { return (target.get()->*method)(each.pass()...); }, given);
    } catch (...) {
      putOuts();
      throw;
    }
  };
  if constexpr (std::is_void_v<R>) {
    if (target) call();
    // Whoever was called may go with this, inside the call.
    target.reset();
  } else {
    if (!target) throw RecordingError("what is asked is not there any more");
    auto answer = call();
    target.reset();
    Lock lock(replayer.mutex);
    if (!replayer.isOver()) put(result, replayer, answer);
  }
  putOuts();
}

std::uint64_t receiver(ItemReader& arguments, ObjectKind kind) {
  const auto mention = arguments.object();
  if (mention.kind != kind) throw RecordingError("somebody is called who is none of the plug-in's");
  return mention.number;
}

template <auto method>
void callClient(Replayer& replayer, ItemReader& arguments, ItemWriter& result) {
  const auto number = receiver(arguments, ObjectKind::client);
  std::shared_ptr<TSClient> target;
  {
    Lock lock(replayer.mutex);
    auto found = replayer.clients().find(number);
    if (found != replayer.clients().end()) target = found->second;
  }
  callMethod<method>(replayer, arguments, result, std::move(target), method);
}

/// One of the plug-in's observers; `kept` is where the replayer has it.
template <auto kept, auto method>
void callObserver(Replayer& replayer, ItemReader& arguments, ItemWriter& result) {
  const auto number = receiver(arguments, ObjectKind::observer);
  Lock lock(replayer.mutex);
  auto target = (replayer.observed(number).*kept).lock();
  lock.unlock();
  callMethod<method>(replayer, arguments, result, std::move(target), method);
}

void create(Replayer& replayer, ItemReader&, ItemWriter& result) {
  auto made = replayer.makeClient();
  Lock lock(replayer.mutex);
  const std::uint64_t number = made ? replayer.newNumber(ObjectKind::client) : 0;
  if (made) replayer.clients()[number] = std::move(made);
  put(result, replayer, NewClient{number});
}

void releaseClient(Replayer& replayer, ItemReader& arguments, ItemWriter&) {
  const auto number = receiver(arguments, ObjectKind::client);
  std::shared_ptr<TSClient> released;
  Lock lock(replayer.mutex);
  released = std::exchange(replayer.clients()[number], nullptr);
  lock.unlock();
  released.reset();
  lock.lock();
}

void callNotified(Replayer& replayer, ItemReader& arguments, ItemWriter&) {
  const auto number = receiver(arguments, ObjectKind::observer);
  std::string name;
  platform::Value userInfo;
  std::shared_ptr<void> target;
  platform::KBNotificationCallback callback = nullptr;
  {
    Lock lock(replayer.mutex);
    name = arguments.text();
    userInfo = arguments.value();
    target = replayer.observed(number).notified.lock();
    callback = replayer.observed(number).callback;
  }
  if (target && callback) callback(replayer.platform().notifications, target.get(), name, nullptr, userInfo);
}

void callCompletion(Replayer& replayer, ItemReader& arguments, ItemWriter&) {
  const auto number = receiver(arguments, ObjectKind::callback);
  Replayer::Completion completion;
  ErrorRef error;
  {
    Lock lock(replayer.mutex);
    error = get<ErrorRef>(replayer, arguments);
    completion = std::exchange(replayer.completions()[number], nullptr);
  }
  if (!completion) return;
  const auto keep = [&] {
    Lock lock(replayer.mutex);
    replayer.completions()[number] = std::move(completion);
  };
  try {
    completion(error);
  } catch (...) {
    keep();
    throw;
  }
  keep();
}

void releaseCompletion(Replayer& replayer, ItemReader& arguments, ItemWriter&) {
  const auto number = receiver(arguments, ObjectKind::callback);
  Replayer::Completion completion;
  Lock lock(replayer.mutex);
  completion = std::exchange(replayer.completions()[number], nullptr);
  lock.unlock();
  completion = nullptr;
  lock.lock();
}

void callBlock(Replayer& replayer, ItemReader& arguments, ItemWriter& result) {
  const auto number = receiver(arguments, ObjectKind::callback);
  const Replayer::Block* block = nullptr;
  platform::OBBundleProxyRef bundle;
  {
    Lock lock(replayer.mutex);
    bundle = get<platform::OBBundleProxyRef>(replayer, arguments);
    block = std::exchange(replayer.blocks()[number], nullptr);
  }
  if (!block) throw RecordingError("a block is called that is not there");
  bool stop = false;
  const auto keep = [&] {
    Lock lock(replayer.mutex);
    replayer.blocks()[number] = block;
    put(result, replayer, stop);
  };
  try {
    (*block)(bundle, stop);
  } catch (...) {
    keep();
    throw;
  }
  keep();
}

using Table = std::map<std::pair<std::string_view, std::string_view>, PlayCall>;

void add(Table& table, const Operation& operation, PlayCall call) { table[{operation.service, operation.name}] = call; }

void addClient(Table& table) {
  namespace client = inbound::client;
  add(table, client::release, releaseClient);
  add(table, client::supportedDataclasses, callClient<&TSClient::supportedDataclasses>);
  add(table, client::currentSyncAnchor, callClient<&TSClient::currentSyncAnchor>);
  add(table, client::prepareForSyncWithHostAnchor, callClient<&TSClient::prepareForSyncWithHostAnchor>);
  add(table, client::reconcileSync, callClient<&TSClient::reconcileSync>);
  add(table, client::syncEndedWithSuccess, callClient<&TSClient::syncEndedWithSuccess>);
  add(table, client::installedAssets, callClient<&TSClient::installedAssets>);
  add(table, client::outstandingAssetTransfers, callClient<&TSClient::outstandingAssetTransfers>);
  add(table, client::assetTransferUpdatedProgress, callClient<&TSClient::assetTransferUpdatedProgress>);
  add(table, client::assetTransferSucceeded, callClient<&TSClient::assetTransferSucceeded>);
  add(table, client::assetInstallSucceeded, callClient<&TSClient::assetInstallSucceeded>);
  add(table, client::assetInstallFailed, callClient<&TSClient::assetInstallFailed>);
  add(table, client::assetTransferEndedWithSuccess, callClient<&TSClient::assetTransferEndedWithSuccess>);
  add(table, client::clearSyncData, callClient<&TSClient::clearSyncData>);
  add(table, client::reconcileRestoreOfType, callClient<&TSClient::reconcileRestoreOfType>);
  add(table, client::installedAssetMetrics, callClient<&TSClient::installedAssetMetrics>);
  add(table, client::vantorIDsForAssets, callClient<&TSClient::vantorIDsForAssets>);
  add(table, client::accountsForAssets, callClient<&TSClient::accountsForAssets>);
  add(table, client::disabledAssetTypes, callClient<&TSClient::disabledAssetTypes>);
  add(table, client::prepareForBackup, callClient<&TSClient::prepareForBackup>);
}

void addCallbacks(Table& table) {
  using Delegate = RVAppInstallObserverDelegate;
  using Observer = OBApplicationWorkspaceObserverProtocol;
  namespace delegate = inbound::delegate;
  namespace workspace = inbound::workspace;
  add(table, delegate::promiseDidBeginFulfillmentWithIdentifier,
      callObserver<&Replayer::Observed::delegate, &Delegate::promiseDidBeginFulfillmentWithIdentifier>);
  add(table, delegate::coordinatorDidInstallPlaceholder,
      callObserver<&Replayer::Observed::delegate, &Delegate::coordinatorDidInstallPlaceholder>);
  add(table, delegate::coordinatorDidCompleteSuccessfully,
      callObserver<&Replayer::Observed::delegate, &Delegate::coordinatorDidCompleteSuccessfully>);
  add(table, delegate::coordinatorShouldPrioritize,
      callObserver<&Replayer::Observed::delegate, &Delegate::coordinatorShouldPrioritize>);
  add(table, delegate::coordinatorCanceledWithReason,
      callObserver<&Replayer::Observed::delegate, &Delegate::coordinatorCanceledWithReason>);
  add(table, workspace::applicationInstallsArePrioritized,
      callObserver<&Replayer::Observed::workspace, &Observer::applicationInstallsArePrioritized>);
  add(table, workspace::applicationInstallsDidCancel,
      callObserver<&Replayer::Observed::workspace, &Observer::applicationInstallsDidCancel>);
  add(table, inbound::notification, callNotified);
  add(table, inbound::block, callBlock);
  add(table, inbound::completion, callCompletion);
  add(table, inbound::releaseCompletion, releaseCompletion);
}

}  // namespace

PlayCall playerOf(const OperationName& operation) {
  static const Table table = [] {
    Table made;
    add(made, inbound::create, create);
    addClient(made);
    addCallbacks(made);
    return made;
  }();
  auto found = table.find({operation.service, operation.name});
  return found == table.end() ? nullptr : found->second;
}

}  // namespace record
