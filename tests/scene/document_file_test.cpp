// The document file: the whole scene written to disk and read back, older
// files upgraded by the keys they lack, damaged ones refused without
// touching the open document, and saves that fail keeping the old file.

#include <epoxy/gl.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <cstring>

#include "camera/discrete_camera_path.h"
#include "camera/scene_camera.h"
#include "camera/transform_stack.h"
#include "platform/class_registry.h"
#include "platform/keyed_archiver.h"
#include "platform/log.h"
#include "render/gl/gl_context.h"
#include "render/render_options.h"
#include "scene/core_classes.h"
#include "scene/light_source.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"
#include "support/file_size_limit.h"
#include "support/memory_defaults.h"
#include "support/pixel_harness.h"
#include "support/scripted_user_interaction.h"
#include "support/temp_dir.h"
#include "timeline/float_clips.h"
#include "timeline/float_value_track.h"
#include "timeline/timeline.h"

namespace cloudreel {
namespace {

using testing::readFile;
using testing::writeFile;

constexpr const char* kTwoFrames =
    "1 0 0 0 0 1 0 0 0 0 1 0 0 0 0 1\n1 0 0 0 0 1 0 0 0 0 1 0 5 0 0 1\n";

std::shared_ptr<PointLayer> cloud(int n, std::string name) {
  auto layer = std::make_shared<PointLayer>();
  layer->allocatePointArrayWithSize(n);
  layer->setNPoints(n);
  int i = 0;
  for (color_point& p : layer->colorPoints()) {
    p = {float(i), float(-i), 0.5f, std::uint8_t(i), 2, 3, std::uint8_t(i)};
    ++i;
  }
  layer->setName(std::move(name));
  return layer;
}

class DocumentFileTest : public ::testing::Test {
 protected:
  void SetUp() override {
    registerCoreClasses(ClassRegistry::shared());
    previousUser_ = UserInteraction::setShared(user);
  }
  void TearDown() override { UserInteraction::setShared(previousUser_); }

  // A document with a bit of everything: an inline cloud animated by a
  // track, a camera path both in the tree and in the stored list, a
  // bookmark, changed bucket settings and a moved light.
  std::unique_ptr<MyDocument> richDocument() {
    auto document = std::make_unique<MyDocument>();
    auto points = cloud(300, "Cloud");
    document->addLayer(points);
    auto path = DiscreteCameraPath::initWithText(kTwoFrames);
    path->setName("Flight");
    document->addLayer(path);
    document->addCameraPath(path);
    auto track = std::make_shared<FloatValueTrack>(points, "pointSize", "Point Size");
    track->justAddClip(std::make_shared<AnimatedValueClip>(0.0f, 4.0f, 1.0f, 9.0f));
    document->timeline()->addTrack(track);
    auto mark = copyOf(*document->sceneCamera());
    document->setViewBookmarks(MyDocument::Bookmarks{{"Overview", mark}});
    document->setOverrideBuckets(false);
    document->setBucketOverrideFraction(0.75f);
    document->lightSource()->objectToWorld()->setTranslation({4, 5, 6});
    return document;
  }

  const testing::MemoryDefaults defaults;
  testing::TempDir dir;
  std::shared_ptr<testing::ScriptedUserInteraction> user =
      std::make_shared<testing::ScriptedUserInteraction>();

 private:
  std::shared_ptr<UserInteraction> previousUser_;
};

TEST_F(DocumentFileTest, TheWholeSceneComesBackWithSharedObjectsStillShared) {
  const auto original = richDocument();
  Error error;
  ASSERT_TRUE(original->writeToURLError(dir / "scene.reel", &error)) << error.message;

  MyDocument document;
  ASSERT_TRUE(document.readFromURLError(dir / "scene.reel", &error)) << error.message;
  ASSERT_EQ(document.layers().size(), 2u);
  const auto points = std::dynamic_pointer_cast<PointLayer>(document.layers()[0]);
  ASSERT_TRUE(points);
  EXPECT_EQ(points->nPoints(), 300);
  EXPECT_EQ(points->colorPoints()[299].y, -299.0f);
  // Read back as one object wherever it was referenced, and attached.
  ASSERT_EQ(document.storedCameraPaths().size(), 1u);
  EXPECT_EQ(document.storedCameraPaths()[0], document.layers()[1]);
  EXPECT_EQ(document.cameraPaths(), document.storedCameraPaths());
  EXPECT_EQ(points->document(), &document);
  ASSERT_TRUE(document.timeline());
  const auto& tracks = document.timeline()->tracks();
  ASSERT_EQ(tracks.size(), 2u);
  EXPECT_EQ(tracks[1]->theObject(), points);
  ASSERT_TRUE(document.viewBookmarks());
  EXPECT_EQ(document.viewBookmarks()->count("Overview"), 1u);
  EXPECT_EQ(document.sceneCamera()->name(), "Scene Camera");
  EXPECT_EQ(document.overrideBuckets(), false);
  EXPECT_EQ(document.bucketOverrideFraction(), 0.75f);
  EXPECT_EQ(document.lightSource()->objectToWorld()->translationZ(), 6.0f);
  EXPECT_EQ(document.transformStacks().size(), 1u);
  EXPECT_FALSE(document.undoManager().canUndo());

  // The read-back timeline animates the read-back layer, and animation is
  // not an edit: a thousand frames leave the undo history as it was.
  document.addLayer(cloud(1, "Edit"));
  for (int frame = 0; frame < 1000; ++frame) {
    document.timeline()->applyForTime(static_cast<float>(frame) / 250.0f);
  }
  document.timeline()->applyForTime(2.0f);
  EXPECT_GT(points->pointSize(), 1.0f);
  EXPECT_LT(points->pointSize(), 9.0f);
  EXPECT_EQ(document.undoManager().undoActionName(), "New Layer");
  document.undoManager().undo();
  EXPECT_EQ(document.layers().size(), 2u);
  EXPECT_FALSE(document.undoManager().canUndo());
  // The user's own edits stay undoable.
  points->setPointSize(2.0f);
  EXPECT_EQ(document.undoManager().undoActionName(), "Change Point Size");

  // The same bytes in memory as on disk.
  const std::string onDisk = readFile(dir / "scene.reel");
  EXPECT_EQ(original->dataOfTypeError("reel", &error), Bytes(onDisk.begin(), onDisk.end()));
}

// Older files lack keys: each has its stand-in, and the camera upgrade is
// logged once.
TEST_F(DocumentFileTest, OlderFilesAreUpgradedByTheKeysTheyLack) {
  MemoryOutputStream out;
  {
    KeyedArchiver coder(out);
    coder.encodeList(std::vector<std::shared_ptr<Layer>>{cloud(3, "Old")}, "layers");
    coder.encodeObject(nullptr, "overrideBuckets");
    ASSERT_TRUE(coder.finish(nullptr));
  }
  MyDocument document;
  const CapturedLog log;
  Error error;
  ASSERT_TRUE(document.readFromDataOfTypeError(out.bytes(), "reel", &error)) << error.message;
  EXPECT_EQ(log.count("creating new Scene Camera for pre-r701 document"), 1);
  EXPECT_NE(document.sceneCamera()->name(), "Scene Camera");
    EXPECT_TRUE(document.transformStacks().empty());
  EXPECT_TRUE(document.lightSource());
  EXPECT_FALSE(document.timeline());
  EXPECT_FALSE(document.viewBookmarks());
  EXPECT_FALSE(document.overrideBuckets());
  EXPECT_FALSE(document.bucketOverrideFraction());
  EXPECT_EQ(document.layers().size(), 1u);
}

TEST_F(DocumentFileTest, WhatIsNoDocumentIsCorruptAndChangesNothing) {
  const auto saved = richDocument();
  const Bytes good = saved->dataOfTypeError("reel", nullptr);
  MemoryOutputStream settings;  // a valid archive, but of something else
  {
    KeyedArchiver coder(settings);
    coder.encodeFloat(1.0f, "KTPointSize");
    ASSERT_TRUE(coder.finish(nullptr));
  }
  const Bytes wrongType = [&] {
    MemoryOutputStream out;
    KeyedArchiver coder(out);
    coder.encodeString("not a list", "layers");
    (void)coder.finish(nullptr);
    return out.takeBytes();
  }();
  const std::vector<Bytes> damaged = {Bytes{'h', 'e', 'l', 'l', 'o'}, Bytes{},
                                      Bytes(good.begin(), good.begin() + good.size() / 2),
                                      settings.bytes(), wrongType};
  MyDocument document;
  document.addLayer(cloud(5, "Mine"));
  const auto camera = document.sceneCamera();
  for (const Bytes& bytes : damaged) {
    Error error;
    EXPECT_FALSE(document.readFromDataOfTypeError(bytes, "reel", &error));
    EXPECT_EQ(error, (Error{"NSOSStatusErrorDomain", -4, "The document is corrupt"}));
    ASSERT_EQ(document.layers().size(), 1u);
    EXPECT_EQ(document.layers()[0]->name(), "Mine");
    EXPECT_EQ(document.layers()[0]->document(), &document);
    EXPECT_EQ(document.sceneCamera(), camera);
    EXPECT_EQ(document.undoManager().undoActionName(), "New Layer");
  }
}

// A linked cloud is written back when modified, before the archive; a
// linked child is not. A linked file that is gone is looked for in the point
// cache, then the user is asked; when it cannot be had, the read fails with
// the file's name and the open document stays as it was.
TEST_F(DocumentFileTest, LinkedPointFilesAreSavedBackAndLookedForWhenTheyMoved) {
  Error error;
  ASSERT_FALSE(cloud(4, "a").get()->savePointsToURLError(dir / "top.rwb", &error));
  ASSERT_FALSE(cloud(4, "b").get()->savePointsToURLError(dir / "child.rwb", &error));
  auto top = PointLayer::initWithURLShouldLink(dir / "top.rwb", true);
  auto child = PointLayer::initWithURLShouldLink(dir / "child.rwb", true);
  ASSERT_TRUE(top && child);
  top->addChildLayer(child);
  MyDocument document;
  document.addLayer(top);
  for (const auto& layer : {top, child}) {
    layer->colorPoints()[0].r = 77;
    layer->setIsModified(true);
  }
  const std::string childBefore = readFile(dir / "child.rwb");
  ASSERT_TRUE(document.writeToURLError(dir / "linked.reel", &error)) << error.message;
  EXPECT_EQ(readFile(dir / "top.rwb")[88 + 12], 77);
  EXPECT_EQ(readFile(dir / "child.rwb"), childBefore);

  // Moved into the point cache: found there without a question.
  std::filesystem::create_directory(dir / "cache");
  UserDefaults::standardUserDefaults().setObjectForKey((dir / "cache").string(),
                                                       kPointCachePathKey);
  std::filesystem::rename(dir / "top.rwb", dir / "cache/top.rwb");
  MyDocument reopened;
  ASSERT_TRUE(reopened.readFromURLError(dir / "linked.reel", &error)) << error.message;
  EXPECT_TRUE(user->panels.empty());

  // Gone from everywhere: the user is asked, cancels, and the read fails.
  std::filesystem::remove(dir / "cache/top.rwb");
  EXPECT_FALSE(reopened.readFromURLError(dir / "linked.reel", &error));
  ASSERT_EQ(user->panels.size(), 1u);
  EXPECT_EQ(user->panels[0].title, "Please locate top.rwb");
  EXPECT_EQ(error.message, "Cannot open file: " + (dir / "top.rwb").string());
  EXPECT_EQ(reopened.layers().size(), 1u);
}

// A save that fails (a full disk, a folder in the way, no folder at all)
// says why and leaves the previous file byte for byte; a save through a
// link replaces the file the link names.
TEST_F(DocumentFileTest, AFailedSaveKeepsThePreviousFileAndSaysWhy) {
  MyDocument small;
  Error error;
  ASSERT_TRUE(small.writeToURLError(dir / "doc.reel", &error));
  const std::string before = readFile(dir / "doc.reel");
  const auto big = richDocument();
  big->addLayer(cloud(20000, "Big"));
  {
    const testing::FileSizeLimit full(64 * 1024);
    EXPECT_FALSE(big->writeToURLError(dir / "doc.reel", &error));
  }
  EXPECT_EQ(error.message, "Cannot save " + (dir / "doc.reel").string() + ": " +
                               std::strerror(EFBIG));
  EXPECT_EQ(readFile(dir / "doc.reel"), before);
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(dir.path()),
                          std::filesystem::directory_iterator()),
            1);
  EXPECT_FALSE(big->writeToURLError(dir / "gone/doc.reel", &error));
  EXPECT_NE(error.message.find(std::strerror(ENOENT)), std::string::npos) << error.message;

  std::filesystem::create_symlink("doc.reel", dir / "link.reel");
  ASSERT_TRUE(big->writeToURLError(dir / "link.reel", &error)) << error.message;
  EXPECT_TRUE(std::filesystem::is_symlink(dir / "link.reel"));
  MyDocument reread;
  ASSERT_TRUE(reread.readFromURLError(dir / "doc.reel", &error)) << error.message;
  EXPECT_EQ(reread.layers().size(), 3u);
}

// A layer that draws a square of its colour, and a stack that counts its
// draws.
class Square : public Layer {
 public:
  void drawGLWithOptions(const RenderOptions&) override {
    glColor3ub(255, 0, 0);
    glRectf(-10, -10, 10, 10);
  }
};
class CountedStack : public TransformStack {
 public:
  void drawGLWithOptions(const RenderOptions&) override { ++draws; }
  int draws = 0;
};

using DocumentDrawingTest = testing::PixelTest;

TEST_F(DocumentDrawingTest, TheRootDrawsEveryLayerAndTheStacksInEditorFramesOnly) {
  MyDocument document;
  auto hidden = std::make_shared<Square>();
  hidden->setIsVisible(false);
  document.addLayer(std::make_shared<Square>());
  document.addLayer(hidden);
  auto stack = std::make_shared<CountedStack>();
  document.setTransformStacks({stack});
  RenderOptions options;
  for (const bool editor : {false, true}) {
    options.setValueForKey(editor, kRenderOptionEditor);
    const testing::Frame frame = render(64, 64, [&] { document.drawContentWithOptions(options); });
    EXPECT_TRUE(testing::pixelIs(frame, 32, 32, testing::kRed));
    EXPECT_EQ(frame.count(testing::kRed), 400);
  }
  EXPECT_EQ(stack->draws, 1);

  // The shared context is made when first asked for, and made anew.
  const auto first = document.sharedGLContext();
  ASSERT_TRUE(first);
  EXPECT_EQ(document.sharedGLContext(), first);
  document.initOpenGLContext();
  const auto second = document.sharedGLContext();
  ASSERT_TRUE(second);
  EXPECT_NE(second->id(), first->id());
}

}  // namespace
}  // namespace cloudreel
