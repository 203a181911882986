#pragma once
// A context menu as data: the timeline's tracks and clips describe the menus
// they offer (titles, tags, actions, check marks, submenus), and a toolkit
// turns the description into its own menu. The model stays free of any
// toolkit and the menus can be tested without one.
//
// An item names its action. Actions the item's target carries out itself
// (a clip changing its ramp) come with `perform`; the others ("menuRemoveTrack:",
// "menuInsertFiller:", "editSpline:", ...) are carried out by the window that
// shows the menu, which reads the action name and the represented object.

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "platform/object.h"

namespace cloudreel {

struct Menu;

struct MenuItem {
  bool isSeparator = false;
  std::string title;
  // The action's name; empty for an item that does nothing when chosen.
  std::string action;
  int tag = 0;
  bool isChecked = false;
  ObjectPtr representedObject;
  // Set when the target carries the action out itself; called with the item.
  std::function<void(const MenuItem&)> perform;
  std::shared_ptr<Menu> submenu;

  static MenuItem separator() {
    MenuItem item;
    item.isSeparator = true;
    return item;
  }
};

struct Menu {
  std::string title;
  std::vector<MenuItem> items;

  MenuItem& addItem(std::string itemTitle, std::string action = {}, ObjectPtr represented = {}) {
    MenuItem item;
    item.title = std::move(itemTitle);
    item.action = std::move(action);
    item.representedObject = std::move(represented);
    items.push_back(std::move(item));
    return items.back();
  }
  void addSeparator() { items.push_back(MenuItem::separator()); }
  // The first item with this title, or null.
  const MenuItem* itemWithTitle(const std::string& wanted) const {
    for (const MenuItem& item : items) {
      if (!item.isSeparator && item.title == wanted) {
        return &item;
      }
    }
    return nullptr;
  }
};

}  // namespace cloudreel
