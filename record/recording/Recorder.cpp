#include "record/recording/Recorder.h"

#include <algorithm>
#include <exception>
#include <utility>

#include "record/stream/Thrown.h"

namespace record {

Recorder::Recorder(std::shared_ptr<Sink> sink, ThreadName threadName)
    : _writer(std::move(sink)), _threadName(std::move(threadName)) {}

std::uint64_t Recorder::newNumber(ObjectKind) { return ++_lastNumber; }

void Recorder::takeBaton() NO_THREAD_SAFETY_ANALYSIS {
  _baton.lock();
  _holder.store(std::this_thread::get_id(), std::memory_order_relaxed);
}

void Recorder::giveBaton() NO_THREAD_SAFETY_ANALYSIS {
  _holder.store(std::thread::id(), std::memory_order_relaxed);
  _baton.unlock();
}

Recorder::Thread& Recorder::thisThread() {
  auto [found, isNew] = _threads.try_emplace(std::this_thread::get_id());
  if (isNew) {
    found->second.number = _writer.addThread(_threadName ? _threadName() : "thread-" + std::to_string(_threads.size()));
  }
  return found->second;
}

std::uint32_t Recorder::numberOf(const Operation& operation) {
  auto [found, isNew] = _operations.try_emplace(&operation);
  if (isNew) found->second = _writer.addOperation({operation.service, operation.name, operation.parameters});
  return found->second;
}

void Recorder::write(EventKind kind, const Operation* operation) {
  if (!_finished) {
    const auto thread = thisThread().number;
    const std::uint32_t number = operation ? numberOf(*operation) : 0;
    std::uint64_t time = 0;
    if (kind == EventKind::enter) {
      const auto passed = std::chrono::steady_clock::now() - _begun;
      time = static_cast<std::uint64_t>(std::chrono::duration_cast<std::chrono::microseconds>(passed).count());
    }
    _writer.write(kind, thread, number, time, _items.bytes());
  }
  _items.clear();
}

Recorder::Outward::Outward(Recorder& recorder, const Operation& operation, const Numbered* receiver)
    : _recorder(recorder), _operation(operation), _stray(!recorder.holdsBaton()) {
  if (_stray) {
    _recorder.takeBaton();
  } else {
    _thread = &_recorder.thisThread();
    _outer = std::exchange(_thread->innermost, this);
  }
  items().clear();
  if (receiver) items().object(receiver->mention());
}

Recorder::Outward::~Outward() {
  if (!_inside) _recorder.takeBaton();
  if (_thread) _thread->innermost = _outer;
  if (_stray) _recorder.giveBaton();
}

void Recorder::Outward::leave() {
  if (!_stray) _recorder.write(EventKind::call, &_operation);
  _inside = false;
  _recorder.giveBaton();
}

void Recorder::Outward::enter() {
  _recorder.takeBaton();
  _inside = true;
  items().clear();
}

void Recorder::Outward::giveUp() {
  _inside = false;
  _recorder.giveBaton();
}

void Recorder::Outward::answer() {
  if (!_stray) _recorder.write(EventKind::answer, nullptr);
}

void Recorder::Outward::enterThrown() {
  enter();
  if (_ofPlugin && _ofPlugin == std::current_exception())
    putThrownByPlugin(items());
  else
    putThrown(items());
}

void Recorder::Outward::threw() {
  if (!_stray) _recorder.write(EventKind::threw, nullptr);
}

Recorder::Inward::Inward(Recorder& recorder) : _recorder(recorder) {
  _recorder.takeBaton();
  items().clear();
}

Recorder::Inward::~Inward() { _recorder.giveBaton(); }

void Recorder::Inward::begin(const Operation& operation) { _recorder.write(EventKind::enter, &operation); }

void Recorder::Inward::end(bool flushed) { ended(EventKind::leave, flushed); }

void Recorder::Inward::beginThrown() {
  if (auto* around = _recorder.thisThread().innermost) around->setThrownByPlugin();
  items().clear();
  putThrown(items());
}

void Recorder::Inward::endThrown(bool flushed) { ended(EventKind::thrown, flushed); }

void Recorder::Inward::ended(EventKind kind, bool flushed) {
  _recorder.write(kind, nullptr);
  if (flushed) _recorder._writer.flush();
  _recorder.forgetGone();
}

std::shared_ptr<void> Recorder::wrapperOf(const void* target) const {
  auto found = _wrappers.find(target);
  return found == _wrappers.end() ? nullptr : found->second.lock();
}

void Recorder::setWrapper(const void* target, const std::shared_ptr<void>& wrapper) {
  if (_wrappers.size() >= _wrappersSweptAt) {
    std::erase_if(_wrappers, [](const auto& entry) { return entry.second.expired(); });
    _wrappersSweptAt = std::max<std::size_t>(256, 2 * _wrappers.size());
  }
  _wrappers[target] = wrapper;
}

std::shared_ptr<void> Recorder::observerWrapper(std::type_index kind, const void* target,
                                                const std::weak_ptr<const void>* owner) const {
  auto found = _observers.find({kind, target});
  if (found == _observers.end()) return nullptr;
  const auto& kept = found->second.owner;
  if (owner && (kept.expired() || kept.owner_before(*owner) || owner->owner_before(kept))) return nullptr;
  return found->second.wrapper;
}

void Recorder::setObserverWrapper(std::type_index kind, const void* target, const std::weak_ptr<const void>& owner,
                                  std::shared_ptr<void> wrapper) {
  _observers[{kind, target}] = {std::move(wrapper), owner};
}

/// Only inside the plug-in, or when something of it is let go, can its objects go.
void Recorder::forgetGone() {
  for (auto& [key, observed] : _observers) {
    if (observed.wrapper && observed.owner.expired()) _gone.push_back(std::move(observed.wrapper));
  }
  // Their wrappers call nobody when they go, so the baton may stay in hand.
  _gone.clear();
}

std::uint64_t Recorder::lendBuffer(const void* buffer) {
  const std::uint64_t number = newNumber(ObjectKind::buffer);
  _buffers[buffer] = number;
  return number;
}

std::uint64_t Recorder::takeBuffer(const void* buffer) {
  auto found = _buffers.find(buffer);
  if (found == _buffers.end()) return 0;
  const std::uint64_t number = found->second;
  _buffers.erase(found);
  return number;
}

void Recorder::finish() {
  takeBaton();
  if (!_finished) _writer.finish();
  _finished = true;
  giveBaton();
}

void Recorder::release() {
  takeBaton();
  const auto kept = std::exchange(_kept, {});
  giveBaton();
}

bool Recorder::failed() {
  takeBaton();
  const bool failed = _writer.failed();
  giveBaton();
  return failed;
}

}  // namespace record
