#include "platform/notification_center.h"

#include <algorithm>

namespace cloudreel {

NotificationCenter& NotificationCenter::defaultCenter() {
  static NotificationCenter center;
  return center;
}

void NotificationCenter::addObserver(const Observer& observer, std::string name,
                                     const void* object, Handler handler) {
  std::erase_if(registrations_, [](const Registration& r) { return r.alive.expired(); });
  registrations_.push_back({nextId_++, &observer, observer.lifetimeToken(), std::move(name),
                            object, std::move(handler)});
}

void NotificationCenter::removeObserver(const Observer& observer, std::string_view name,
                                        const void* object) {
  std::erase_if(registrations_, [&](const Registration& r) {
    return r.observer == &observer && r.name == name && (object == nullptr || r.object == object);
  });
}

void NotificationCenter::removeObserver(const Observer& observer) {
  std::erase_if(registrations_, [&](const Registration& r) { return r.observer == &observer; });
}

void NotificationCenter::postNotification(const Notification& notification) {
  // Handlers may add or remove registrations, so deliver from a snapshot and
  // skip any that an earlier handler removed.
  std::vector<Registration> matching;
  for (const Registration& r : registrations_) {
    if (r.name == notification.name && (r.object == nullptr || r.object == notification.object)) {
      matching.push_back(r);
    }
  }
  for (const Registration& r : matching) {
    const auto alive = r.alive.lock();
    const bool stillRegistered =
        std::any_of(registrations_.begin(), registrations_.end(),
                    [&](const Registration& other) { return other.id == r.id; });
    if (alive && stillRegistered) {
      r.handler(notification);
    }
  }
}

void NotificationCenter::postNotificationName(std::string name, const void* object,
                                              std::map<std::string, Value> userInfo) {
  postNotification(Notification{std::move(name), object, std::move(userInfo)});
}

}  // namespace cloudreel
