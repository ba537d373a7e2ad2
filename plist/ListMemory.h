#pragma once

#include <memory>
#include <optional>

#include "platform/Error.h"
#include "platform/Mutex.h"
#include "platform/PropertyListSerialization.h"
#include "platform/ThreadSafety.h"
#include "platform/Value.h"

namespace plist {

/// Reads and writes as `read` and `writeBinary` do, at a fraction of the time where one long list goes round: written
/// here, read again as it was written, a few of its texts changed, written again. What nobody has changed is then
/// neither decoded nor encoded, but told by the values being the very ones that were handed out; the changes are put
/// into the bytes of the list before.
///
/// It remembers one list, an array of dictionaries of 16 KiB to 8 MiB, at three to four times its size. What is read
/// may outlive the memory and be changed like any other value. From any thread.
class ListMemory {
 public:
  ListMemory();
  ~ListMemory();
  ListMemory(const ListMemory&) = delete;
  ListMemory& operator=(const ListMemory&) = delete;

  platform::Value read(platform::Bytes input, platform::ErrorRef* error = nullptr);
  /// Reads back equal to what `plist::writeBinary` makes, but need not be the same bytes: texts that nothing refers to
  /// any more may be left in it.
  std::optional<platform::Bytes> writeBinary(const platform::Value& value, platform::ErrorRef* error = nullptr);

 private:
  class Written;

  platform::Value readAgain(const platform::Bytes& input);
  std::optional<platform::Bytes> writeChanges(const platform::Value& value);
  void remember(const platform::Value& value, const platform::Bytes& bytes);

  platform::Mutex _mutex;
  std::unique_ptr<Written> _last GUARDED_BY(_mutex);
};

}  // namespace plist
