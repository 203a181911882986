#include "geometry/affine_transform.h"

#include <gtest/gtest.h>

#include <cmath>
#include <numbers>

#include "geometry/geometry_classes.h"
#include "platform/class_registry.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "support/near.h"

namespace cloudreel {
namespace {

constexpr double kPi = std::numbers::pi;
using P = std::array<double, 3>;
using testing::applied;
using testing::expectNear;

P translationOf(const AffineTransform& t) { return {t.mx()[12], t.mx()[13], t.mx()[14]}; }

TEST(Vector3, NormalizeAndEqualityTolerances) {
  struct NormalizeCase {
    P in, out;
  };
  for (const auto& c : {NormalizeCase{{0, 0, 0}, {0, 0, 1}},
                        {{1e-7, 0, 0}, {0, 0, 1}},
                        {{3, 0, 4}, {0.6, 0, 0.8}}}) {
    Vector3 v(c.in);
    v.normalize();
    expectNear(P{v.x(), v.y(), v.z()}, c.out, 1e-7);
  }
  struct EqualCase {
    P a, b;
    bool equal;
  };
  for (const auto& c : {EqualCase{{0, 0, 0}, {1e-12, 0, 0}, true},
                        {{0, 0, 0}, {1e-11, 0, 0}, false},
                        {{1, 1, 1}, {1.000004, 1, 1}, true},
                        {{1, 1, 1}, {1, 1, 1.00001}, false}}) {
    EXPECT_EQ(Vector3(c.a).isEqual(Vector3(c.b)), c.equal);
  }
  Vector3 v(1, -2, 0);
  v.negate();
  EXPECT_TRUE(std::signbit(v.z()));
  std::array<double, 3> out{};
  v.setDoubles(out);  // a getter despite its name
  EXPECT_EQ(out, (P{-1, 2, -0.0}));
  EXPECT_EQ(v.description(), "Vector3: <-1.00, 2.00, -0.00>");
  const auto cross = Vector3(1, 0, 0).crossProduct(Vector3(0, 1, 0));
  EXPECT_TRUE(cross->isEqual(Vector3(0, 0, 1)));
}

TEST(Vector3, SettersNotifyObserversAndSubscribers) {
  struct Subscriber : ChangeSubscriber {
    int changes = 0;
    void observeChange(const Notification&) override { ++changes; }
  } subscriber;
  std::vector<std::string> keys;
  CallbackObserver recorder([&](std::string_view key, Object&, const Change&, std::string_view) {
    keys.emplace_back(key);
  });
  Vector3 v;
  v.subscribeToChanges(subscriber);
  for (const char* key : {"x", "y", "z"}) {
    v.addObserver(recorder, key, ObservingOptions::New, "");
  }
  v.setXYZ(1, 2, 3);
  v.setY(5);
  v.normalize();  // silent
  EXPECT_EQ(keys, std::vector<std::string>({"x", "y", "z", "y"}));
  EXPECT_EQ(subscriber.changes, 2);
  Vector3::unsubscribeFromChanges(subscriber);
  v.setZ(1);
  EXPECT_EQ(subscriber.changes, 2);
}

TEST(AffineTransform, EulerRotationsFollowTheirAxisOrder) {
  AffineTransform t;
  t.setTranslation({4, 5, 6});
  t.setEulerRotationType({0, 0, 90}, 11);
  expectNear(applied(t, {1, 0, 0}), {0, 0, -1});
  expectNear(translationOf(t), {0, 0, 0});  // translation reset
  t.setEulerRotationType({90, 0, 0}, 11);
  expectNear(applied(t, {1, 0, 0}), {0, 1, 0});

  const auto before = t.mx();
  t.setEulerRotationType({10, 20, 30}, 5);  // unknown type: unchanged
  EXPECT_EQ(t.mx(), before);

  // Type 0 keeps s0 in both products of element 9.
  const double d = kPi / 180.0;
  t.setEulerRotationType({30, 40, 50}, 0);
  EXPECT_DOUBLE_EQ(t.mx()[9], -std::sin(30 * d) * std::cos(50 * d) -
                                  std::sin(30 * d) * std::cos(40 * d) * std::sin(50 * d));
}

TEST(AffineTransform, QuaternionAndAxisAngleWriteOnlyTheRotationBlock) {
  AffineTransform t;
  t.setTranslation({7, 8, 9});
  const double h = std::sqrt(0.5);
  t.setQuaternionRotation({h, 0, 0, h});  // 90° about z
  expectNear(applied(t, {1, 0, 0}), {7, 9, 9});
  // Element 2 keeps its 2·q0·q1 term.
  t.setQuaternionRotation({0.5, 0.5, 0.5, 0.5});
  EXPECT_DOUBLE_EQ(t.mx()[2], 2 * 0.5 * 0.5 + 2 * 0.5 * 0.5);

  AffineTransform r;
  r.setAxisAngleRotation({kPi / 2, 0, 0, 1});
  expectNear(applied(r, {1, 0, 0}), {0, 1, 0});
  expectNear(P{r.basisVectorX()->x(), r.basisVectorX()->y(), r.basisVectorX()->z()}, {0, -1, 0});
  expectNear(P{r.columnZ()->x(), r.columnZ()->y(), r.columnZ()->z()}, {0, 0, 1});
}

TEST(AffineTransform, MultiplicationAppliesTheArgumentAfterTheReceiver) {
  AffineTransform t;
  t.setAxisAngleRotation({kPi / 2, 0, 0, 1});
  t.multiplyByTranslation({1, 2, 3});
  expectNear(applied(t, {1, 0, 0}), {1, 3, 3});  // rotated first, then moved
  expectNear(translationOf(t), {1, 2, 3});

  AffineTransform moved;
  moved.setTranslation({1, 0, 0});
  moved.multiplyByAxisAngleRotation({kPi / 2, 0, 0, 1});  // turns the translation too
  expectNear(translationOf(moved), {0, 1, 0});

  AffineTransform scaled;
  scaled.setTranslation({1, 0, 0});
  scaled.setScale(2);
  EXPECT_DOUBLE_EQ(scaled.mx()[0], 2);
  EXPECT_DOUBLE_EQ(scaled.mx()[10], 2);
  EXPECT_DOUBLE_EQ(scaled.mx()[12], 2);
  EXPECT_FLOAT_EQ(scaled.scale(), 2.0f);

  // Multiplying by itself reads both operands before writing.
  AffineTransform square;
  square.setTranslation({1, 1, 1});
  square.multiplyByMatrix(square);
  expectNear(translationOf(square), {2, 2, 2});

  AffineTransform mirror;
  mirror.setToScale(-2);  // determinant -8
  EXPECT_FLOAT_EQ(mirror.scale(), -2.0f);
}

TEST(AffineTransform, KeyValueNoticesComeFromTheOwnersBrackets) {
  auto t = std::make_shared<AffineTransform>();
  std::vector<std::string> keys;
  std::vector<float> oldScales;
  CallbackObserver recorder(
      [&](std::string_view key, Object&, const Change& change, std::string_view) {
        keys.emplace_back(key);
        if (key == "scale") {
          oldScales.push_back(std::get<float>(*change.oldValue));
        }
      });
  for (const char* key : {"scale", "translationX", "translationY", "translationZ"}) {
    t->addObserver(recorder, key, ObservingOptions::Old, "Scale");
  }
  t->setTranslationX(3);  // silent by itself
  EXPECT_TRUE(keys.empty());
  t->sendKVOWillChange();
  t->setScale(2);
  t->sendKVODidChange();
  EXPECT_EQ(keys,
            std::vector<std::string>({"scale", "translationX", "translationY", "translationZ"}));
  EXPECT_EQ(oldScales, std::vector<float>({1.0f}));
  // Key-value coding reaches the same operations.
  EXPECT_TRUE(t->setValueForKey(Value(1.0), "scale"));
  EXPECT_FLOAT_EQ(t->scale(), 1.0f);
  EXPECT_FLOAT_EQ(std::get<float>(t->valueForKey("translationX")), 3.0f);
}

TEST(AffineTransform, ArchivesAsFloatsAndPrintsRows) {
  ClassRegistry registry;
  registerGeometryClasses(registry);
  auto t = std::make_shared<AffineTransform>();
  t->setTranslation({0.1, -2, 1e300});
  t->setAxisAngleRotation({0.3, 1, 0, 0});

  MemoryOutputStream out;
  KeyedArchiver archiver(out);
  archiver.encodeObject(t, "transform");
  archiver.encodeObject(Vector3::vectorWithXYZ(0.1, 2, 3), "vector");
  ASSERT_TRUE(archiver.finish(nullptr));
  MemoryInputStream in(out.bytes());
  Error error;
  auto archive = KeyedUnarchiver::open(in, &error, registry);
  ASSERT_TRUE(archive) << error.message;
  const auto back = archive->decodeObjectOfClassForKey<AffineTransform>("transform");
  ASSERT_TRUE(back);
  EXPECT_EQ(back->mx()[12], 0.10000000149011612);
  EXPECT_TRUE(std::isinf(back->mx()[14]));
  for (std::size_t i = 0; i < 12; ++i) {
    EXPECT_EQ(back->mx()[i], static_cast<double>(static_cast<float>(t->mx()[i])));
  }
  const auto vector = archive->decodeObjectOfClassForKey<Vector3>("vector");
  ASSERT_TRUE(vector);
  EXPECT_EQ(vector->x(), 0.1);  // vectors keep doubles

  CapturedLog log;
  AffineTransform().printMatrix();
  ASSERT_EQ(log.lines().size(), 5u);
  EXPECT_EQ(log.lines()[0], "Matrix4x4:");
  EXPECT_EQ(log.lines()[1], "1.00 0.00 0.00 0.00 ");
}

}  // namespace
}  // namespace cloudreel
