#pragma once
// User defaults: registered values (the application's factory settings,
// never saved) under a persistent store of the user's own choices. A user
// value always wins over a registered one.
//
// Values are property-list kinds: booleans, integers, doubles, strings and
// byte blobs (colours are stored as the archive of a colour object).

#include <cstdint>
#include <filesystem>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <variant>

#include "platform/byte_stream.h"
#include "platform/error.h"

namespace cloudreel {

using DefaultsValue = std::variant<bool, std::int64_t, double, std::string, Bytes>;
using DefaultsDictionary = std::map<std::string, DefaultsValue, std::less<>>;

// Where the user's values live between runs.
class DefaultsStore {
 public:
  virtual ~DefaultsStore() = default;
  // Answers the stored values; a store that cannot be read answers nothing
  // and an error.
  virtual DefaultsDictionary load(Error* error) = 0;
  [[nodiscard]] virtual bool save(const DefaultsDictionary& values, Error* error) = 0;
};

// Keeps the values in memory only; for tests and throw-away sessions.
class MemoryDefaultsStore final : public DefaultsStore {
 public:
  DefaultsDictionary load(Error*) override { return values_; }
  bool save(const DefaultsDictionary& values, Error*) override {
    values_ = values;
    return true;
  }

 private:
  DefaultsDictionary values_;
};

// A keyed archive in a file, replaced atomically on every save.
class FileDefaultsStore final : public DefaultsStore {
 public:
  explicit FileDefaultsStore(std::filesystem::path path) : path_(std::move(path)) {}
  // The user's store: defaults.cbor in the configuration folder.
  static std::filesystem::path standardPath();

  DefaultsDictionary load(Error* error) override;
  bool save(const DefaultsDictionary& values, Error* error) override;

 private:
  std::filesystem::path path_;
};

class UserDefaults {
 public:
  // Loads the store's values at once; an unreadable store is logged and the
  // session starts from the registered values only.
  explicit UserDefaults(std::unique_ptr<DefaultsStore> store);

  // The process-wide defaults, on the user's file store unless replaced.
  static UserDefaults& standardUserDefaults();
  // Replaces the process-wide defaults (tests install an in-memory store)
  // and answers the previous ones.
  static std::unique_ptr<UserDefaults> setStandardUserDefaults(std::unique_ptr<UserDefaults> d);

  // Adds to the registered values; later registrations of a key win.
  void registerDefaults(const DefaultsDictionary& values);

  // The user's value, else the registered one, else nothing.
  std::optional<DefaultsValue> objectForKey(std::string_view key) const;
  // Numbers convert between kinds; a missing key or another kind reads as
  // NO, 0, 0.0, an empty string or empty bytes.
  bool boolForKey(std::string_view key) const;
  std::int64_t integerForKey(std::string_view key) const;
  float floatForKey(std::string_view key) const;
  double doubleForKey(std::string_view key) const;
  std::string stringForKey(std::string_view key) const;
  Bytes dataForKey(std::string_view key) const;

  // Stores a user value and saves the store; a failed save is logged and the
  // value stays in effect for this session.
  void setObjectForKey(DefaultsValue value, std::string_view key);
  void removeObjectForKey(std::string_view key);

 private:
  void save();

  std::unique_ptr<DefaultsStore> store_;
  // Reads come from any thread (a layer made while a file is read in the
  // background takes its point size and colour from here), writes from the
  // main thread: every access to the two dictionaries holds the lock.
  mutable std::mutex mutex_;
  DefaultsDictionary registered_;
  DefaultsDictionary user_;
};

}  // namespace cloudreel
