#include <sqlite3.h>

#include <cstdint>
#include <memory>
#include <mutex>
#include <string_view>
#include <utility>

#include "device/DevicePath.h"
#include "device/RecordList.h"
#include "device/StepWatch.h"
#include "device/Store.h"
#include "plist/PropertyList.h"

namespace device {

using platform::Bytes;
using platform::ErrorRef;

namespace {

/// In the header of every store's file, so that no other database is taken for one.
constexpr int applicationID = 0x41507353;
constexpr int formatVersion = 1;

constexpr char schema[] =
    "CREATE TABLE records("
    "place INTEGER PRIMARY KEY AUTOINCREMENT, kind TEXT NOT NULL, key TEXT NOT NULL, value BLOB NOT NULL,"
    "UNIQUE(kind, key))";

struct CloseDatabase {
  void operator()(sqlite3* database) const { sqlite3_close_v2(database); }
};
struct FinalizeStatement {
  void operator()(sqlite3_stmt* statement) const { sqlite3_finalize(statement); }
};
using Database = std::unique_ptr<sqlite3, CloseDatabase>;
using Statement = std::unique_ptr<sqlite3_stmt, FinalizeStatement>;

void bindText(sqlite3_stmt* statement, int index, std::string_view text) {
  sqlite3_bind_text64(statement, index, text.data(), text.size(), SQLITE_STATIC, SQLITE_UTF8);
}
std::string_view bytesOfColumn(sqlite3_stmt* statement, int column) {
  // The bytes first: asking for them may convert the value, and with it its size.
  const void* bytes = sqlite3_column_blob(statement, column);
  return {static_cast<const char*>(bytes), static_cast<std::size_t>(sqlite3_column_bytes(statement, column))};
}

/// A transaction that is rolled back unless it was committed.
class Transaction {
 public:
  explicit Transaction(sqlite3* database) : _database(database) {
    _open = sqlite3_exec(_database, "BEGIN IMMEDIATE", nullptr, nullptr, nullptr) == SQLITE_OK;
  }
  ~Transaction() {
    if (_open) sqlite3_exec(_database, "ROLLBACK", nullptr, nullptr, nullptr);
  }
  Transaction(const Transaction&) = delete;
  Transaction& operator=(const Transaction&) = delete;

  bool isOpen() const { return _open; }
  bool commit() {
    if (sqlite3_exec(_database, "COMMIT", nullptr, nullptr, nullptr) != SQLITE_OK) return false;
    _open = false;
    return true;
  }

 private:
  sqlite3* const _database;
  bool _open;
};

class DatabaseStore final : public Store {
 public:
  DatabaseStore(std::string path, std::shared_ptr<StepWatch> watch)
      : _path(std::move(path)), _watch(std::move(watch)) {}

  bool open(ErrorRef* error) {
    sqlite3* opened = nullptr;
    int status = sqlite3_open_v2(_path.c_str(), &opened,
                                 SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE | SQLITE_OPEN_NOMUTEX, nullptr);
    _database.reset(opened);
    if (status != SQLITE_OK) return fail(error);
    sqlite3_extended_result_codes(_database.get(), 1);
    // One process at a time has a device, so nothing need be shared with another.
    if (!execute("PRAGMA locking_mode=EXCLUSIVE", error) || !checkFormat(error)) return false;
    if (!execute("PRAGMA journal_mode=WAL", error) || !execute("PRAGMA synchronous=FULL", error)) return false;
    return prepare(_put,
                   "INSERT INTO records(kind, key, value) VALUES(?1, ?2, ?3) "
                   "ON CONFLICT(kind, key) DO UPDATE SET value = excluded.value",
                   error) &&
           prepare(_remove, "DELETE FROM records WHERE kind = ?1 AND key = ?2", error) && readRecords(error);
  }

  std::vector<StoreRecord> load() override {
    std::lock_guard lock(_mutex);
    return _records.all();
  }

  bool commit(const std::vector<StoreRecord>& changes, ErrorRef* error) override { return apply(changes, true, error); }
  bool write(const std::vector<StoreRecord>& changes, ErrorRef* error) override { return apply(changes, false, error); }

 private:
  bool apply(const std::vector<StoreRecord>& changes, bool flushes, ErrorRef* error) {
    std::vector<Bytes> values;
    values.reserve(changes.size());
    for (const auto& change : changes) {
      auto bytes = change.value.isAbsent() ? Bytes() : plist::writeBinary(change.value, error);
      if (!bytes) return false;
      values.push_back(std::move(*bytes));
    }
    std::lock_guard lock(_mutex);
    Step step{flushes ? Step::Kind::storeCommit : Step::Kind::storeWrite, {}};
    if (int forbidden = _watch ? _watch->before(step) : 0) {
      platform::setError(error, platform::makeError("Store", forbidden, _path + ": " + textOfErrorNumber(forbidden)));
      return false;
    }
    if (!applyLocked(changes, values, flushes, error)) return false;
    if (_watch) _watch->after(step);
    platform::setError(error, nullptr);
    return true;
  }

  bool applyLocked(const std::vector<StoreRecord>& changes, const std::vector<Bytes>& values, bool flushes,
                   ErrorRef* error) {
    // A flush writes out the whole log, and with it what was written before without one.
    if (flushes != _flushes && !execute(flushes ? "PRAGMA synchronous=FULL" : "PRAGMA synchronous=NORMAL", error))
      return false;
    _flushes = flushes;
    Transaction transaction(_database.get());
    if (!transaction.isOpen()) return fail(error);
    for (std::size_t i = 0; i < changes.size(); ++i) {
      if (!put(changes[i], values[i])) return fail(error);
    }
    if (!transaction.commit()) return fail(error);
    for (const auto& change : changes) _records.apply(change);
    return true;
  }

  bool fail(ErrorRef* error, std::string_view text = {}) const {
    if (error) {
      int code = _database ? sqlite3_extended_errcode(_database.get()) : SQLITE_NOMEM;
      std::string reason(text.empty() && _database ? sqlite3_errmsg(_database.get()) : text);
      if (text.empty() && _database && (code & 0xff) == SQLITE_CANTOPEN) {
        if (int number = sqlite3_system_errno(_database.get())) reason += ": " + textOfErrorNumber(number);
      }
      *error = platform::makeError("Store", text.empty() ? code : SQLITE_NOTADB, _path + ": " + reason);
    }
    return false;
  }

  bool execute(const char* sql, ErrorRef* error) {
    return sqlite3_exec(_database.get(), sql, nullptr, nullptr, nullptr) == SQLITE_OK || fail(error);
  }
  bool prepare(Statement& statement, const char* sql, ErrorRef* error) {
    sqlite3_stmt* prepared = nullptr;
    int status = sqlite3_prepare_v3(_database.get(), sql, -1, SQLITE_PREPARE_PERSISTENT, &prepared, nullptr);
    statement.reset(prepared);
    return status == SQLITE_OK || fail(error);
  }
  bool readNumber(const char* sql, int& number, ErrorRef* error) {
    Statement statement;
    if (!prepare(statement, sql, error)) return false;
    if (sqlite3_step(statement.get()) != SQLITE_ROW) return fail(error);
    number = sqlite3_column_int(statement.get(), 0);
    return true;
  }

  bool checkFormat(ErrorRef* error) {
    int id = 0, version = 0, tables = 0;
    if (!readNumber("PRAGMA application_id", id, error) || !readNumber("PRAGMA user_version", version, error) ||
        !readNumber("SELECT count(*) FROM sqlite_schema", tables, error))
      return false;
    if (id == 0 && version == 0 && tables == 0) return makeFormat(error);
    if (id != applicationID) return fail(error, "a database of something else, not a device's store");
    if (version != formatVersion)
      return fail(error, "a device's store of format " + std::to_string(version) + ", which is not known here");
    return true;
  }
  bool makeFormat(ErrorRef* error) {
    Transaction transaction(_database.get());
    if (!transaction.isOpen()) return fail(error);
    std::string marks = "PRAGMA application_id=" + std::to_string(applicationID) +
                        ";PRAGMA user_version=" + std::to_string(formatVersion);
    return execute(schema, error) && execute(marks.c_str(), error) && (transaction.commit() || fail(error));
  }

  bool readRecords(ErrorRef* error) {
    Statement all;
    if (!prepare(all, "SELECT kind, key, value FROM records ORDER BY place", error)) return false;
    int status;
    while ((status = sqlite3_step(all.get())) == SQLITE_ROW) {
      StoreRecord record{std::string(bytesOfColumn(all.get(), 0)), std::string(bytesOfColumn(all.get(), 1)), {}};
      ErrorRef reason;
      record.value = plist::read(Bytes(bytesOfColumn(all.get(), 2)), &reason);
      if (record.value.isAbsent()) {
        return fail(error, "the record " + record.kind + " \"" + record.key +
                               "\" cannot be read: " + (reason ? reason->description() : std::string("it is empty")));
      }
      _records.apply(record);
    }
    return status == SQLITE_DONE || fail(error);
  }

  bool put(const StoreRecord& change, const Bytes& value) {
    sqlite3_stmt* statement = change.value.isAbsent() ? _remove.get() : _put.get();
    bindText(statement, 1, change.kind);
    bindText(statement, 2, change.key);
    if (!change.value.isAbsent()) sqlite3_bind_blob64(statement, 3, value.data(), value.size(), SQLITE_STATIC);
    int status = sqlite3_step(statement);
    sqlite3_reset(statement);
    sqlite3_clear_bindings(statement);
    return status == SQLITE_DONE;
  }

  const std::string _path;
  const std::shared_ptr<StepWatch> _watch;
  std::mutex _mutex;
  // Guarded by _mutex once the store is open. The statements go before the database.
  Database _database;
  Statement _put;
  Statement _remove;
  bool _flushes = true;
  RecordList _records;  // what the file holds
};

}  // namespace

std::unique_ptr<Store> openDatabaseStore(const std::string& path, ErrorRef* error, std::shared_ptr<StepWatch> watch) {
  platform::setError(error, nullptr);
  auto store = std::make_unique<DatabaseStore>(path, std::move(watch));
  if (!store->open(error)) return nullptr;
  return store;
}

}  // namespace device
