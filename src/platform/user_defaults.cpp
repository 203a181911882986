#include "platform/user_defaults.h"

#include <cmath>
#include <type_traits>

#include "platform/atomic_file.h"
#include "platform/file_location.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "platform/value.h"

namespace cloudreel {
namespace {

// A defaults number as a boxed value, for the shared number conversions.
std::optional<Value> asNumber(const std::optional<DefaultsValue>& value) {
  if (!value) {
    return std::nullopt;
  }
  if (const auto* b = std::get_if<bool>(&*value)) {
    return Value(*b);
  }
  if (const auto* i = std::get_if<std::int64_t>(&*value)) {
    return Value(*i);
  }
  if (const auto* d = std::get_if<double>(&*value)) {
    return Value(*d);
  }
  return std::nullopt;
}

template <typename T>
T numberForKey(const UserDefaults& defaults, std::string_view key) {
  const auto value = asNumber(defaults.objectForKey(key));
  return value ? numberAs<T>(*value).value_or(T{}) : T{};
}

}  // namespace

std::filesystem::path FileDefaultsStore::standardPath() {
  return configDirectory() / "defaults.cbor";
}

DefaultsDictionary FileDefaultsStore::load(Error* error) {
  DefaultsDictionary values;
  std::error_code ec;
  if (!std::filesystem::exists(path_, ec)) {
    return values;  // a first run has no store yet
  }
  auto in = FileInputStream::open(path_, error);
  if (!in) {
    return values;
  }
  auto archive = KeyedUnarchiver::open(*in, error);
  if (!archive) {
    return values;
  }
  for (const std::string& key : archive->allKeys()) {
    switch (archive->typeOfValueForKey(key)) {
      case ArchiveValueType::Bool:
        values[key] = archive->decodeBoolForKey(key);
        break;
      case ArchiveValueType::Integer:
        values[key] = archive->decodeInt64ForKey(key);
        break;
      case ArchiveValueType::Float:
        values[key] = archive->decodeDoubleForKey(key);
        break;
      case ArchiveValueType::String:
        values[key] = archive->decodeStringForKey(key);
        break;
      case ArchiveValueType::Bytes:
        values[key] = archive->decodeBytesForKey(key);
        break;
      default:
        break;  // kinds the defaults never write are skipped
    }
  }
  if (archive->hasFailed()) {
    if (error != nullptr) {
      *error = archive->error();
    }
    return {};
  }
  return values;
}

bool FileDefaultsStore::save(const DefaultsDictionary& values, Error* error) {
  MemoryOutputStream out;
  KeyedArchiver archiver(out);
  for (const auto& [name, value] : values) {
    // A named reference, not the binding itself: clang before 16 cannot
    // capture a structured binding in a lambda.
    const auto& key = name;
    std::visit(
        [&archiver, &key](const auto& v) {
          using T = std::decay_t<decltype(v)>;
          if constexpr (std::is_same_v<T, bool>) {
            archiver.encodeBool(v, key);
          } else if constexpr (std::is_same_v<T, std::int64_t>) {
            archiver.encodeInt64(v, key);
          } else if constexpr (std::is_same_v<T, double>) {
            archiver.encodeDouble(v, key);
          } else if constexpr (std::is_same_v<T, std::string>) {
            archiver.encodeString(v, key);
          } else {
            archiver.encodeBytes(v, key);
          }
        },
        value);
  }
  if (!archiver.finish(error)) {
    return false;
  }
  std::error_code ec;
  std::filesystem::create_directories(path_.parent_path(), ec);
  return writeFileAtomically(path_, out.bytes(), error);
}

UserDefaults::UserDefaults(std::unique_ptr<DefaultsStore> store) : store_(std::move(store)) {
  Error error;
  user_ = store_->load(&error);
  if (!error.message.empty()) {
    logWarningf("user defaults could not be read, starting from the registered values: %s",
         error.message);
  }
}

namespace {
std::unique_ptr<UserDefaults>& standardDefaults() {
  static std::unique_ptr<UserDefaults> defaults;
  return defaults;
}
}  // namespace

UserDefaults& UserDefaults::standardUserDefaults() {
  if (!standardDefaults()) {
    standardDefaults() = std::make_unique<UserDefaults>(
        std::make_unique<FileDefaultsStore>(FileDefaultsStore::standardPath()));
  }
  return *standardDefaults();
}

std::unique_ptr<UserDefaults> UserDefaults::setStandardUserDefaults(
    std::unique_ptr<UserDefaults> defaults) {
  std::unique_ptr<UserDefaults> previous = std::move(standardDefaults());
  standardDefaults() = std::move(defaults);
  return previous;
}

void UserDefaults::registerDefaults(const DefaultsDictionary& values) {
  const std::lock_guard lock(mutex_);
  for (const auto& [key, value] : values) {
    registered_.insert_or_assign(key, value);
  }
}

std::optional<DefaultsValue> UserDefaults::objectForKey(std::string_view key) const {
  const std::lock_guard lock(mutex_);
  if (auto it = user_.find(key); it != user_.end()) {
    return it->second;
  }
  if (auto it = registered_.find(key); it != registered_.end()) {
    return it->second;
  }
  return std::nullopt;
}

bool UserDefaults::boolForKey(std::string_view key) const { return numberForKey<bool>(*this, key); }

std::int64_t UserDefaults::integerForKey(std::string_view key) const {
  return numberForKey<std::int64_t>(*this, key);
}

float UserDefaults::floatForKey(std::string_view key) const {
  return numberForKey<float>(*this, key);
}

double UserDefaults::doubleForKey(std::string_view key) const {
  return numberForKey<double>(*this, key);
}

std::string UserDefaults::stringForKey(std::string_view key) const {
  const auto value = objectForKey(key);
  const auto* s = value ? std::get_if<std::string>(&*value) : nullptr;
  return s != nullptr ? *s : std::string();
}

Bytes UserDefaults::dataForKey(std::string_view key) const {
  const auto value = objectForKey(key);
  const auto* b = value ? std::get_if<Bytes>(&*value) : nullptr;
  return b != nullptr ? *b : Bytes();
}

void UserDefaults::setObjectForKey(DefaultsValue value, std::string_view key) {
  const std::lock_guard lock(mutex_);
  user_.insert_or_assign(std::string(key), std::move(value));
  save();
}

void UserDefaults::removeObjectForKey(std::string_view key) {
  const std::lock_guard lock(mutex_);
  if (auto it = user_.find(key); it != user_.end()) {
    user_.erase(it);
    save();
  }
}

// Called with the lock held.
void UserDefaults::save() {
  Error error;
  if (!store_->save(user_, &error)) {
    logWarningf("user defaults could not be saved: %s", error.message);
  }
}

}  // namespace cloudreel
