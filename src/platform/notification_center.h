#pragma once
// Named notifications: a sender posts a name, and every observer registered
// for that name (from that sender or from any) is called in registration
// order. The application's panels follow documents this way
// ("KTPointDocument_DocumentChangeNotification", "KTGridColorChanged", ...).

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/object.h"

namespace cloudreel {

struct Notification {
  std::string name;
  // The posting object; valid only during delivery. Null when none was given.
  const void* object = nullptr;
  std::map<std::string, Value> userInfo;
};

class NotificationCenter {
 public:
  using Handler = std::function<void(const Notification&)>;

  // The application's default centre.
  static NotificationCenter& defaultCenter();

  // Registers the observer's handler for notifications of the name posted by
  // the object, or by anyone when object is null. Like key observation, only
  // a weak token of the observer is kept: a destroyed observer is never
  // called.
  void addObserver(const Observer& observer, std::string name, const void* object,
                   Handler handler);
  // Removes the observer's registrations for the name and object (a null
  // object matches every registration of that name).
  void removeObserver(const Observer& observer, std::string_view name, const void* object);
  // Removes the observer from everything.
  void removeObserver(const Observer& observer);

  void postNotification(const Notification& notification);
  void postNotificationName(std::string name, const void* object,
                            std::map<std::string, Value> userInfo = {});

 private:
  struct Registration {
    std::uint64_t id;
    const Observer* observer;
    std::weak_ptr<const void> alive;
    std::string name;
    const void* object;
    Handler handler;
  };
  std::vector<Registration> registrations_;
  std::uint64_t nextId_ = 1;
};

}  // namespace cloudreel
