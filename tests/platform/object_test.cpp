#include "platform/object.h"

#include <gtest/gtest.h>

#include "platform/log.h"

namespace cloudreel {
namespace {

// A small model class with one property of each kind.
class Sample : public Object {
 public:
  std::string_view className() const override { return "Sample"; }
  const PropertyTable& properties() const override {
    static const PropertyTable table(
        &Object::objectProperties(),
        {property<Sample>("size", &Sample::size, &Sample::setSize),
         property<Sample>("count", &Sample::count, &Sample::setCount),
         property<Sample>("visible", &Sample::visible, &Sample::setVisible),
         property<Sample>("name", &Sample::name, &Sample::setName),
         property<Sample>("child", &Sample::child, &Sample::setChild),
         readOnlyProperty<Sample>("doubled", &Sample::doubled)});
    return table;
  }

  float size() const { return size_; }
  void setSize(float v) { changeValueForKey("size", size_, v); }
  std::int32_t count() const { return count_; }
  void setCount(std::int32_t v) { changeValueForKey("count", count_, v); }
  bool visible() const { return visible_; }
  void setVisible(bool v) { changeValueForKey("visible", visible_, v); }
  std::string name() const { return name_; }
  void setName(std::string v) { changeValueForKey("name", name_, std::move(v)); }
  std::shared_ptr<Sample> child() const { return child_; }
  void setChild(std::shared_ptr<Sample> v) { changeValueForKey("child", child_, std::move(v)); }
  double doubled() const { return 2.0 * size_; }

 private:
  float size_ = 1.0f;
  std::int32_t count_ = 0;
  bool visible_ = true;
  std::string name_;
  std::shared_ptr<Sample> child_;
};

struct Seen {
  std::string key;
  std::string context;
  Change change;
};

class Recorder : public Observer {
 public:
  void observeValueForKeyPathOfObjectChangeContext(std::string_view keyPath, Object&,
                                                   const Change& change,
                                                   std::string_view context) override {
    seen.push_back({std::string(keyPath), std::string(context), change});
  }
  std::vector<Seen> seen;
};

TEST(KeyValueCoding, ConvertsNumbersAsBoxedNumbersDo) {
  Sample s;
  struct Case {
    Value in;
    float size;
    std::int32_t count;
    bool visible;
  };
  const Case cases[] = {
      {Value(2.5), 2.5f, 2, true},
      {Value(std::int64_t{7}), 7.0f, 7, true},
      {Value(true), 1.0f, 1, true},
      {Value(0.0f), 0.0f, 0, false},
      {Value(-3.9), -3.9f, -3, true},
      {Value(1e20), 1e20f, std::numeric_limits<std::int32_t>::max(), true},
  };
  for (const Case& c : cases) {
    ASSERT_TRUE(s.setValueForKey(c.in, "size"));
    ASSERT_TRUE(s.setValueForKey(c.in, "count"));
    ASSERT_TRUE(s.setValueForKey(c.in, "visible"));
    EXPECT_FLOAT_EQ(s.size(), c.size);
    EXPECT_EQ(s.count(), c.count);
    EXPECT_EQ(s.visible(), c.visible);
    EXPECT_EQ(std::get<float>(s.valueForKey("size")), c.size);
  }
  EXPECT_DOUBLE_EQ(std::get<double>(s.valueForKey("doubled")), 2.0 * s.size());
}

TEST(KeyValueCoding, RefusesUnknownKeysAndWrongTypesWithoutChangingAnything) {
  Sample s;
  CapturedLog log;
  EXPECT_FALSE(s.setValueForKey(Value(std::string("big")), "size"));
  EXPECT_FALSE(s.setValueForKey(Value(3.0), "name"));
  EXPECT_FALSE(s.setValueForKey(Value(3.0), "noSuchKey"));
  EXPECT_FALSE(s.setValueForKey(Value(3.0), "doubled"));
  EXPECT_FALSE(s.setValueForKey(Value{}, "size"));
  EXPECT_FALSE(s.setValueForKey(Value(std::make_shared<Object>()), "child"));
  EXPECT_TRUE(isNull(s.valueForKey("noSuchKey")));
  EXPECT_FLOAT_EQ(s.size(), 1.0f);
  EXPECT_EQ(s.name(), "");
  EXPECT_EQ(log.count("noSuchKey"), 2);
}

TEST(KeyValueCoding, WalksKeyPathsThroughObjects) {
  auto parent = std::make_shared<Sample>();
  auto child = std::make_shared<Sample>();
  ASSERT_TRUE(parent->setValueForKey(Value(ObjectPtr(child)), "child"));
  EXPECT_TRUE(parent->setValueForKeyPath(Value(std::string("inner")), "child.name"));
  EXPECT_EQ(child->name(), "inner");
  EXPECT_EQ(std::get<std::string>(parent->valueForKeyPath("child.name")), "inner");
  // A path through a null object reads null and sets nothing.
  EXPECT_TRUE(isNull(parent->valueForKeyPath("child.child.name")));
  EXPECT_FALSE(parent->setValueForKeyPath(Value(1.0), "child.child.size"));
  EXPECT_TRUE(parent->setValueForKey(Value{}, "child"));
  EXPECT_EQ(parent->child(), nullptr);
}

TEST(Observation, DeliversOldAndNewValuesWithTheContext) {
  Sample s;
  Recorder r;
  s.addObserver(r, "size", ObservingOptions::Old | ObservingOptions::New, "Change Size");
  s.addObserver(r, "name", ObservingOptions::Old, "Change Name");
  s.setSize(4.0f);
  s.setName("cloud");
  s.setCount(3);  // not observed
  ASSERT_EQ(r.seen.size(), 2u);
  EXPECT_EQ(r.seen[0].key, "size");
  EXPECT_EQ(r.seen[0].context, "Change Size");
  EXPECT_EQ(std::get<float>(*r.seen[0].change.oldValue), 1.0f);
  EXPECT_EQ(std::get<float>(*r.seen[0].change.newValue), 4.0f);
  EXPECT_EQ(std::get<std::string>(*r.seen[1].change.oldValue), "");
  EXPECT_FALSE(r.seen[1].change.newValue.has_value());
}

TEST(Observation, InitialPriorAndNestedChanges) {
  Sample s;
  Recorder r;
  s.addObserver(r, "size",
                ObservingOptions::Initial | ObservingOptions::Prior | ObservingOptions::Old |
                    ObservingOptions::New,
                "ctx");
  ASSERT_EQ(r.seen.size(), 1u);  // the initial notification
  EXPECT_EQ(std::get<float>(*r.seen[0].change.newValue), 1.0f);
  r.seen.clear();

  // Nested will/did pairs of one key pair up innermost first.
  s.willChangeValueForKey("size");
  s.setSize(2.0f);
  s.didChangeValueForKey("size");
  ASSERT_EQ(r.seen.size(), 4u);
  EXPECT_TRUE(r.seen[0].change.isPrior);
  EXPECT_TRUE(r.seen[1].change.isPrior);
  EXPECT_EQ(std::get<float>(*r.seen[2].change.oldValue), 1.0f);
  EXPECT_EQ(std::get<float>(*r.seen[3].change.oldValue), 1.0f);
  EXPECT_EQ(std::get<float>(*r.seen[3].change.newValue), 2.0f);
}

TEST(Observation, RemovalIsHarmlessAndRemovedOrDestroyedObserversAreNeverCalled) {
  Sample s;
  Recorder kept;
  s.removeObserver(kept, "size");  // never registered: nothing happens
  s.addObserver(kept, "size", ObservingOptions::New, "a");
  s.addObserver(kept, "size", ObservingOptions::New, "b");
  s.removeObserver(kept, "size");  // the latest registration goes
  {
    Recorder gone;
    s.addObserver(gone, "size", ObservingOptions::New, "c");
    EXPECT_TRUE(s.isObservedForKey("size"));
  }
  // An observer removed by an earlier one during a change is not called for
  // it.
  Recorder second;
  CallbackObserver first([&](std::string_view, Object&, const Change&, std::string_view) {
    s.removeObserver(second, "size");
  });
  s.addObserver(first, "size", ObservingOptions::None, "");
  s.addObserver(second, "size", ObservingOptions::None, "");
  s.setSize(5.0f);
  ASSERT_EQ(kept.seen.size(), 1u);
  EXPECT_EQ(kept.seen[0].context, "a");
  EXPECT_TRUE(second.seen.empty());
  s.removeObserver(first, "size");
  s.removeObserver(kept, "size");
  s.removeObserver(kept, "size");
  EXPECT_FALSE(s.isObservedForKey("size"));
}

}  // namespace
}  // namespace cloudreel
