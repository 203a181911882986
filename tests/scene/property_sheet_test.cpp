// The property sheet: which fields each kind of object offers, and that an
// edit through it is one named undo step that also rebuilds what is drawn.
#include "scene/property_sheet.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>

#include "camera/camera.h"
#include "camera/camera_field.h"
#include "camera/discrete_camera_path.h"
#include "camera/scene_camera.h"
#include "camera/slerp_camera_path.h"
#include "platform/color.h"
#include "render/render_options.h"
#include "scene/light_source.h"
#include "scene/my_document.h"
#include "scene/point_3d.h"
#include "scene/point_layer.h"
#include "scene/property_sheet_controller.h"
#include "scene/sphere.h"
#include "support/memory_defaults.h"
#include "support/pixel_harness.h"

namespace cloudreel {
namespace {

struct Located {
  const PropertySection* section = nullptr;
  const PropertyField* field = nullptr;
};

Located find(const std::vector<PropertySection>& sections, std::string_view keyPath) {
  for (const auto& section : sections) {
    for (const auto& field : section.fields) {
      if (field.keyPath == keyPath) {
        return {&section, &field};
      }
    }
  }
  return {};
}

std::vector<std::string> titles(const std::vector<PropertySection>& sections) {
  std::vector<std::string> result;
  for (const auto& s : sections) {
    result.push_back(s.title);
  }
  return result;
}

std::shared_ptr<PointLayer> squareLayer(int n) {
  auto layer = std::make_shared<PointLayer>();
  layer->allocatePointArrayWithSize(n);
  layer->setNPoints(n);
  for (int i = 0; i < n; ++i) {
    layer->colorPoints()[static_cast<std::size_t>(i)] = {
        static_cast<float>(i % 8), 0.0f, 0.0f, 255, 0, 0, 0};
  }
  return layer;
}

// Writes through the sheet and closes the event, as a panel edit does.
bool write(MyDocument& document, const std::shared_ptr<Object>& object, std::string_view key,
           const Value& value) {
  const auto sections = PropertySheet::sectionsForObject(object);
  const Located at = find(sections, key);
  EXPECT_NE(at.field, nullptr) << key;
  if (at.field == nullptr) {
    return false;
  }
  const bool ok = PropertySheet::writeValue(document, *at.section, *at.field, value);
  document.undoManager().closeEventGroup();
  return ok;
}

TEST(PropertySheet, EachKindOffersItsOwnFieldsAndEveryFieldReads) {
  testing::MemoryDefaults defaults;
  struct Case {
    std::shared_ptr<Object> object;
    std::vector<std::string> sections;
    std::vector<std::string> present;
    std::vector<std::string> absent;
  };
  auto field = std::make_shared<CameraField>();
  field->addCamera(Camera::initWithZDistance(3.0));
  auto meshLayer = squareLayer(3);
  meshLayer->setTriangles({0, 1, 2});
  const Case cases[] = {
      {squareLayer(4),
       {"Layer", "Point"},
       {"name", "isVisible", "pointSize", "bucketLimit", "opacity", "colorMode", "fixedColor",
        "drawMode", "antialias", "attenuatePoints", "atten_a", "atten_b", "atten_c"},
       {"drawWireFrame", "drawPointsOnly"}},
      {meshLayer, {"Layer", "Point"}, {"drawWireFrame", "drawPointsOnly"}, {}},
      {std::make_shared<Sphere>(),
       {"Layer", "Primitive Properties"},
       {"shape", "size", "segments", "color"},
       {"pointSize"}},
      {std::make_shared<Point3D>(), {"Layer"}, {"name", "enableFog"}, {"size"}},
      {std::make_shared<LightSource>(),
       {"Layer", "Light"},
       {"objectToWorld.translationX", "objectToWorld.translationZ"},
       {}},
      {Camera::initWithZDistance(5.0),
       {"Camera"},
       {"fieldOfView", "zNear", "zFar", "positionZ"},
       {"heading", "isVisible"}},
      {SceneCamera::initWithZDistance(5.0), {"Camera"}, {"heading", "pitch", "bank"}, {}},
      {field,
       {"Layer", "Path", "Cameras"},
       {"fps", "nFrames", "durationAsFormattedString", "frustumLength", "imageOpacity",
        "drawFrustum", "variableOpacity", "variableExponent"},
       {"frTranslate.x"}},
      {std::make_shared<SLERPCameraPath>(),
       {"Layer", "Path", "SLERP"},
       {"nFrames", "currentFrame", "translateGain", "frTranslate.x", "toRotate.z"},
       {"frustumLength"}},
      {std::make_shared<DiscreteCameraPath>(), {"Layer", "Path"}, {"nFrames", "fps"}, {}},
  };
  for (const auto& c : cases) {
    const auto sections = PropertySheet::sectionsForObject(c.object);
    SCOPED_TRACE(std::string(c.object->className()));
    EXPECT_EQ(titles(sections), c.sections);
    for (const auto& key : c.present) {
      const Located at = find(sections, key);
      ASSERT_NE(at.field, nullptr) << key;
      EXPECT_FALSE(isNull(PropertySheet::readValue(*at.section, *at.field))) << key;
    }
    for (const auto& key : c.absent) {
      EXPECT_EQ(find(sections, key).field, nullptr) << key;
    }
  }
  // A stored path's frames come from its records and a field's from its
  // cameras: shown, not editable. An interpolated path's are its own.
  EXPECT_TRUE(find(PropertySheet::sectionsForObject(field), "nFrames").field->readOnly);
  EXPECT_TRUE(
      find(PropertySheet::sectionsForObject(std::make_shared<DiscreteCameraPath>()), "nFrames")
          .field->readOnly);
  EXPECT_FALSE(
      find(PropertySheet::sectionsForObject(std::make_shared<SLERPCameraPath>()), "nFrames")
          .field->readOnly);
  EXPECT_TRUE(PropertySheet::sectionsForObject(nullptr).empty());
}

TEST(PropertySheet, AnEditIsOneNamedUndoStepThatUndoesAndRedoes) {
  testing::MemoryDefaults defaults;
  MyDocument document;
  auto layer = squareLayer(4);
  auto primitive = std::make_shared<Sphere>();
  document.addLayer(layer);
  document.addLayer(primitive);
  document.undoManager().removeAllActions();

  struct Case {
    std::shared_ptr<Object> object;
    std::string key;
    Value value;
    std::string actionName;
  };
  const Case cases[] = {
      // Keys the document observes keep its action names.
      {layer, "pointSize", 6.0, "Change Point Size"},
      {layer, "name", std::string("Cloud"), "Change Name"},
      {primitive, "size", 2.5, "Change Size"},
      {primitive, "color", ObjectPtr(Color::colorWithRGBA(1, 0, 0)), "Change Colour"},
      // The others are named after the field.
      {layer, "opacity", 0.25, "Change Opacity"},
      {layer, "colorMode", std::int32_t{1}, "Change Colour Mode"},
      {layer, "fixedColor", ObjectPtr(Color::colorWithRGBA(0, 1, 0)), "Change Fixed Colour"},
      {layer, "attenuatePoints", true, "Change Attenuate With Distance"},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.key);
    const Value before = c.object->valueForKeyPath(c.key);
    ASSERT_TRUE(write(document, c.object, c.key, c.value));
    const Value after = c.object->valueForKeyPath(c.key);
    EXPECT_NE(after, before);
    EXPECT_EQ(document.undoManager().undoActionName(), c.actionName);
    document.undoManager().undo();
    EXPECT_EQ(c.object->valueForKeyPath(c.key), before);
    // One step: nothing else is left to undo.
    EXPECT_FALSE(document.undoManager().canUndo());
    document.undoManager().redo();
    EXPECT_EQ(c.object->valueForKeyPath(c.key), after);
    document.undoManager().removeAllActions();
  }
}

TEST(PropertySheet, ValuesAreClampedAndBadOnesRefusedWithoutAnUndoStep) {
  testing::MemoryDefaults defaults;
  MyDocument document;
  auto layer = squareLayer(4);
  document.addLayer(layer);
  document.undoManager().removeAllActions();

  EXPECT_TRUE(write(document, layer, "pointSize", 1000.0));
  EXPECT_EQ(layer->pointSize(), 64.0f);
  EXPECT_TRUE(write(document, layer, "opacity", -3.0));
  EXPECT_EQ(layer->opacity(), 0.0f);
  document.undoManager().removeAllActions();

  const Value refused[][2] = {
      {std::string("pointSize"), std::numeric_limits<double>::quiet_NaN()},
      {std::string("pointSize"), std::string("big")},
      {std::string("colorMode"), std::int32_t{2}},
      {std::string("colorMode"), std::int32_t{-1}},
      {std::string("fixedColor"), std::string("red")},
      {std::string("nPoints"), std::int32_t{1}},  // shown, not editable
  };
  for (const auto& [key, value] : refused) {
    const std::string k = std::get<std::string>(key);
    SCOPED_TRACE(k);
    const Value before = layer->valueForKey(k);
    EXPECT_FALSE(write(document, layer, k, value));
    EXPECT_EQ(layer->valueForKey(k), before);
  }
  // Writing the value already held is no edit.
  EXPECT_TRUE(write(document, layer, "pointSize", 64.0));
  EXPECT_FALSE(document.undoManager().canUndo());
}

TEST(PropertySheet, ObjectsTheDocumentDoesNotObserveAreStillUndoable) {
  testing::MemoryDefaults defaults;
  MyDocument document;
  // A reconstruction's camera field is a child layer: never attached.
  auto cloud = squareLayer(2);
  auto field = std::make_shared<CameraField>();
  cloud->addChildLayer(field);
  document.addLayer(cloud);
  auto camera = Camera::initWithZDistance(4.0);
  document.undoManager().removeAllActions();

  EXPECT_TRUE(write(document, field, "frustumLength", 5.0));
  EXPECT_TRUE(write(document, field, "isVisible", false));
  EXPECT_TRUE(write(document, camera, "fieldOfView", 60.0));
  EXPECT_EQ(document.undoManager().undoActionName(), "Change Field Of View");
  document.undoManager().undo();
  EXPECT_EQ(camera->fieldOfView(), 30.0f);
  document.undoManager().undo();
  EXPECT_TRUE(field->isVisible());
  document.undoManager().undo();
  EXPECT_EQ(field->frustumLength(), 2.0f);
  EXPECT_FALSE(document.undoManager().canUndo());
  document.undoManager().redo();
  EXPECT_EQ(field->frustumLength(), 5.0f);
}

TEST(PropertySheet, AShapeChangeAndItsUndoRebuildThePrimitive) {
  testing::MemoryDefaults defaults;
  MyDocument document;
  auto primitive = std::make_shared<Sphere>();
  document.addLayer(primitive);
  document.undoManager().removeAllActions();
  primitive->setDisplayListInvalid(false);

  EXPECT_TRUE(write(document, primitive, "shape", std::int32_t{Sphere::kShapeCube}));
  EXPECT_EQ(primitive->name(), "Cube");
  EXPECT_TRUE(primitive->displayListInvalid());
  EXPECT_EQ(document.undoManager().undoActionName(), "Change Shape");

  // The setter alone would leave the cube's drawing in place.
  primitive->setDisplayListInvalid(false);
  document.undoManager().undo();
  EXPECT_EQ(primitive->shape(), Sphere::kShapeTeapot);
  EXPECT_TRUE(primitive->displayListInvalid());
  primitive->setDisplayListInvalid(false);
  document.undoManager().redo();
  EXPECT_EQ(primitive->shape(), Sphere::kShapeCube);
  EXPECT_TRUE(primitive->displayListInvalid());
}

class PropertySheetDrawingTest : public testing::PixelTest {};

TEST_F(PropertySheetDrawingTest, EditsAndTheirUndoDropTheCachedPointDrawing) {
  testing::MemoryDefaults defaults;
  MyDocument document;
  auto layer = squareLayer(16);
  document.addLayer(layer);
  document.undoManager().removeAllActions();
  const auto draw = [&] { render(32, 32, [&] { layer->drawGLWithOptions(RenderOptions{}); }); };

  for (const auto& [key, value] : {std::pair<std::string, Value>{"pointSize", 4.0},
                                   {"opacity", 0.5},
                                   {"attenuatePoints", true}}) {
    SCOPED_TRACE(key);
    draw();
    ASSERT_TRUE(layer->hasPointDrawing());
    EXPECT_TRUE(write(document, layer, key, value));
    EXPECT_FALSE(layer->hasPointDrawing());
    draw();
    document.undoManager().undo();
    EXPECT_FALSE(layer->hasPointDrawing());
  }
}

class RecordingView : public PropertySheetView {
 public:
  void reloadSheet() override { ++reloads; }
  void refreshValues() override { ++refreshes; }
  int reloads = 0;
  int refreshes = 0;
};

TEST(PropertySheetController, FollowsTheSelectionAndEditsTheFollowedDocument) {
  testing::MemoryDefaults defaults;
  auto document = std::make_shared<MyDocument>();
  auto cloud = squareLayer(4);
  cloud->setName("cloud");
  auto primitive = std::make_shared<Sphere>();
  document->addLayer(cloud);
  document->addLayer(primitive);  // selected

  PropertySheetController controller;
  RecordingView view;
  controller.setView(&view);
  EXPECT_EQ(controller.title(), "No Selection");
  EXPECT_TRUE(controller.sections().empty());
  EXPECT_FALSE(controller.setValueAt(0, 0, 1.0));

  controller.setDocument(document);
  EXPECT_EQ(titles(controller.sections()),
            (std::vector<std::string>{"Layer", "Primitive Properties"}));
  EXPECT_EQ(controller.title(), "Properties: Teapot");

  const int reloads = view.reloads;
  document->setSelectedLayer(cloud);
  EXPECT_GT(view.reloads, reloads);
  EXPECT_EQ(titles(controller.sections()), (std::vector<std::string>{"Layer", "Point"}));
  EXPECT_EQ(controller.title(), "Properties: cloud");

  // An edit shows new values in the same controls.
  const Located at = find(controller.sections(), "pointSize");
  const auto section = static_cast<std::size_t>(at.section - controller.sections().data());
  const auto field = static_cast<std::size_t>(at.field - at.section->fields.data());
  const int afterSelect = view.reloads;
  EXPECT_TRUE(controller.setValueAt(section, field, 3.0));
  EXPECT_EQ(cloud->pointSize(), 3.0f);
  EXPECT_EQ(view.reloads, afterSelect);
  EXPECT_GT(view.refreshes, 0);
  EXPECT_EQ(std::get<double>(controller.valueAt(section, field)), 3.0);
  EXPECT_TRUE(isNull(controller.valueAt(section, 99)));
  EXPECT_FALSE(controller.setValueAt(99, 0, 1.0));

  // Without a selected layer the scene camera is shown.
  document->setSelectedLayer(nullptr);
  EXPECT_EQ(titles(controller.sections()), std::vector<std::string>{"Camera"});
  EXPECT_EQ(controller.title(), "Properties: Scene Camera");
  controller.setView(nullptr);
}

}  // namespace
}  // namespace cloudreel
