#include "scene/application_commands.h"

#include <gtest/gtest.h>

#include <limits>

#include "camera/discrete_camera_path.h"
#include "camera/scene_camera.h"
#include "camera/slerp_camera_path.h"
#include "camera/zxy_camera_path.h"
#include "import/bundler_file.h"
#include "import/ply_file.h"
#include "platform/file_location.h"
#include "platform/notification_center.h"
#include "platform/run_loop.h"
#include "scene/point_3d.h"
#include "scene/point_layer.h"
#include "scene/sphere.h"
#include "support/memory_defaults.h"
#include "support/ply_text.h"
#include "support/scripted_user_interaction.h"
#include "support/temp_dir.h"

namespace cloudreel {
namespace {

using testing::writeFile;

class FakeWindow : public DocumentWindowController {
 public:
  explicit FakeWindow(std::shared_ptr<MyDocument> d) : doc(std::move(d)) {}
  std::shared_ptr<MyDocument> document() const override { return doc; }
  void zoomIn() override { ++zoomIns; }
  void zoomOut() override { ++zoomOuts; }
  std::shared_ptr<MyDocument> doc;
  int zoomIns = 0, zoomOuts = 0;
};

// A user who also notes which options view each import command's open
// panel showed, with nothing selected and then with a PLY file selected.
class PanelWatchingUser : public testing::ScriptedUserInteraction {
 public:
  std::optional<std::string> runOpenPanel(const OpenPanel& panel) override {
    if (commands->importPanelRunning()) {
      views.emplace_back(commands->openPanelOptionsView(), commands->openPanelOptionsView("s.ply"));
    }
    return ScriptedUserInteraction::runOpenPanel(panel);
  }
  const ApplicationCommands* commands = nullptr;
  std::vector<std::pair<ImportOptionsView, ImportOptionsView>> views;
};

class ApplicationCommandsTest : public ::testing::Test {
 protected:
  void SetUp() override {
    previousUser_ = UserInteraction::setShared(user);
    user->commands = &commands;
    commands.documentWindowDidActivate(&window);
  }
  void TearDown() override { UserInteraction::setShared(previousUser_); }

  MyDocument& doc() { return *window.doc; }
  std::shared_ptr<Layer> lastLayer() {
    return doc().layers().empty() ? nullptr : doc().layers().back();
  }
  // A point file of n points whose luck is 7.
  std::filesystem::path pointFile(const std::string& name, int n = 3) {
    PointLayer layer;
    layer.allocatePointArrayWithSize(n);
    layer.setNPoints(n);
    for (color_point& p : layer.colorPoints()) {
      p = {1, 2, 3, 10, 20, 30, 7};
    }
    Error error;
    EXPECT_FALSE(layer.savePointsToURLError(dir / name, &error)) << error.message;
    return dir / name;
  }
  std::filesystem::path plyFile(const std::string& name, int vertices) {
    testing::PlyElement vertex{"vertex", testing::kPlyXyzRgb, {}};
    for (int i = 0; i < vertices; ++i) {
      vertex.instances.push_back({double(i), 0, 0, 255, 0, 0});
    }
    return writeFile(dir / name, testing::plyText({vertex}, "ascii"));
  }
  std::filesystem::path bundleFile() {
    const std::string camera = "500 0 0\n1 0 0\n0 1 0\n0 0 1\n0 0 -5\n";
    return writeFile(dir / "bundle/bundle.out", "# Bundle file v0.3\n1 2\n" + camera +
                                                    "1 2 3\n255 0 0\n0\n4 5 6\n0 255 0\n0\n");
  }
  void import(void (ApplicationCommands::*command)(), const std::filesystem::path& url) {
    user->answerOpenPanelWith(url.string());
    (commands.*command)();
  }

  testing::MemoryDefaults defaults;
  testing::TempDir dir;
  std::shared_ptr<PanelWatchingUser> user = std::make_shared<PanelWatchingUser>();
  FakeWindow window{std::make_shared<MyDocument>()};
  ApplicationCommands commands;

 private:
  std::shared_ptr<UserInteraction> previousUser_;
};

TEST(PointFileKind, ExtensionsAreComparedExactlyAndChooseTheOptionsView) {
  struct Case {
    const char* file;
    PointFileKind kind;
    ImportOptionsView view;
  };
  const Case cases[] = {
      {"a.rwb", PointFileKind::PointFile, ImportOptionsView::PointFile},
      {"dir.d/bundle.out", PointFileKind::Bundler, ImportOptionsView::Bundler},
      {"scan.ply", PointFileKind::Ply, ImportOptionsView::Ply},
      {"scan.PLY", PointFileKind::Unknown, ImportOptionsView::None},
      {"scan.ply.txt", PointFileKind::Unknown, ImportOptionsView::None},
      {"rwb", PointFileKind::Unknown, ImportOptionsView::None},
      {"", PointFileKind::Unknown, ImportOptionsView::None},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(pointFileKindForPath(c.file), c.kind) << c.file;
    EXPECT_EQ(importOptionsViewForFile(c.file), c.view) << c.file;
  }
}

TEST_F(ApplicationCommandsTest, ImportPointFileChoosesTheReaderAndOptionsByExtension) {
  ImportOptions options;
  options.openRWBFileAsReference = true;
  options.openPointFileAsReference = false;
  options.openPLYDownsample = true;
  options.openPLYDownsampleFactor = 2;
  options.saveToDefaults(UserDefaults::standardUserDefaults());

  import(&ApplicationCommands::importPointFile, pointFile("cloud.rwb", 5));
  auto rwb = std::dynamic_pointer_cast<PointLayer>(lastLayer());
  ASSERT_TRUE(rwb);
  EXPECT_EQ(rwb->className(), "PointLayer");
  EXPECT_EQ(rwb->nPoints(), 5);
  EXPECT_TRUE(rwb->fileStoredAsLink());
  EXPECT_EQ(rwb->name(), "cloud.rwb");
  EXPECT_EQ(doc().selectedLayer(), rwb);
  EXPECT_EQ(doc().undoManager().undoActionName(), "New Layer");

  import(&ApplicationCommands::importPointFile, bundleFile());
  auto bundle = std::dynamic_pointer_cast<BundlerFile>(lastLayer());
  ASSERT_TRUE(bundle);
  EXPECT_EQ(bundle->nPoints(), 2);
  EXPECT_FALSE(bundle->fileStoredAsLink());
  EXPECT_TRUE(doc().storedCameraPaths().empty());  // only importBundler adds the cameras

  import(&ApplicationCommands::importPointFile, plyFile("scan.ply", 4));
  auto ply = std::dynamic_pointer_cast<PLYFile>(lastLayer());
  ASSERT_TRUE(ply);
  EXPECT_EQ(ply->nPoints(), 2);
  EXPECT_EQ(doc().layers().size(), 3u);
  EXPECT_TRUE(user->alerts.empty());
  EXPECT_TRUE(user->errors.empty());
}

TEST_F(ApplicationCommandsTest, UnknownFormatsCancelsAndFailuresAddNothing) {
  // The comparison is exact: an upper-case PLY is refused.
  import(&ApplicationCommands::importPointFile, plyFile("scan.PLY", 4));
  ASSERT_EQ(user->alerts.size(), 1u);
  EXPECT_EQ(user->alerts[0].messageText, "Unknown file format");
  EXPECT_EQ(user->alerts[0].informativeText, "Cannot determine file type, or unsupported");
  EXPECT_EQ(user->alerts[0].buttons, std::vector<std::string>{"OK"});

  user->answerOpenPanelWith(std::nullopt);
  commands.importPointFile();
  // A corrupt point file: its error names it.
  import(&ApplicationCommands::importPointFile, writeFile(dir / "bad.rwb", "RWBX0000"));
  ASSERT_EQ(user->errors.size(), 1u);
  EXPECT_NE(user->errors[0].message.find((dir / "bad.rwb").string()), std::string::npos);
  // A file gone since the panel: no search, no locate panel, an error.
  import(&ApplicationCommands::importRWB, dir / "gone.rwb");
  ASSERT_EQ(user->errors.size(), 2u);
  EXPECT_EQ(user->errors[1].message, "Cannot open file: " + (dir / "gone.rwb").string());
  // A PLY file that is no PLY: logged by its reader, nothing presented.
  import(&ApplicationCommands::importPointFile, writeFile(dir / "junk.ply", "not ply"));
  EXPECT_EQ(user->errors.size(), 2u);

  EXPECT_EQ(user->panels.size(), 5u);
  EXPECT_TRUE(doc().layers().empty());
  EXPECT_FALSE(doc().undoManager().canUndo());

  // Without a front document nothing is even asked.
  commands.documentWindowDidDeactivate();
  import(&ApplicationCommands::importPointFile, pointFile("cloud.rwb"));
  EXPECT_FALSE(commands.importPLY());
  commands.importBundler();
  EXPECT_EQ(user->panels.size(), 5u);
}

TEST_F(ApplicationCommandsTest, EachImportCommandUsesItsOwnOptionsAndViews) {
  ImportOptions options;
  options.openPointFileAsReference = true;  // importRWB links by this one
  options.saveToDefaults(UserDefaults::standardUserDefaults());

  import(&ApplicationCommands::importRWB, pointFile("cloud.rwb"));
  EXPECT_TRUE(std::static_pointer_cast<PointLayer>(lastLayer())->fileStoredAsLink());

  import(&ApplicationCommands::importBundler, bundleFile());
  auto bundle = std::dynamic_pointer_cast<BundlerFile>(lastLayer());
  ASSERT_TRUE(bundle);
  EXPECT_TRUE(bundle->fileStoredAsLink());
  ASSERT_EQ(doc().storedCameraPaths().size(), 1u);
  EXPECT_EQ(std::static_pointer_cast<Layer>(doc().storedCameraPaths()[0]),
            bundle->childLayers().front());

  import(&ApplicationCommands::importCameraPath,
         writeFile(dir / "path.txt", "2\n0 0 10 0 0 0\n0 0 20 0 0 0\n"));
  ASSERT_TRUE(std::dynamic_pointer_cast<ZXYCameraPath>(lastLayer()));
  import(&ApplicationCommands::importMatrixPath,
         writeFile(dir / "m.txt", "1\n1 0 0 0 0 1 0 0 0 0 1 0 0 0 0 1\n"));
  auto matrices = std::dynamic_pointer_cast<DiscreteCameraPath>(lastLayer());
  ASSERT_TRUE(matrices);
  EXPECT_EQ(matrices->className(), "DiscreteCameraPath");
  ASSERT_EQ(doc().storedCameraPaths().size(), 3u);
  EXPECT_EQ(std::static_pointer_cast<Layer>(doc().storedCameraPaths()[2]), lastLayer());

  import(&ApplicationCommands::importPointFile, pointFile("again.rwb"));

  using V = ImportOptionsView;
  const std::vector<std::pair<V, V>> shown = {{V::Bundler, V::Bundler},
                                              {V::None, V::None},
                                              {V::None, V::None},
                                              {V::None, V::None},
                                              {V::None, V::Ply}};
  EXPECT_EQ(user->views, shown);
  EXPECT_FALSE(commands.importPanelRunning());
  EXPECT_EQ(commands.openPanelOptionsView("s.ply"), ImportOptionsView::None);
}

TEST_F(ApplicationCommandsTest, PLYImportWaitsForItsSheetAndTakesItsDownsampling) {
  user->answerOpenPanelWith(std::nullopt);
  EXPECT_FALSE(commands.importPLY());
  commands.endPLYOptionsSheet();  // no file pending: nothing
  EXPECT_TRUE(doc().layers().empty());

  user->answerOpenPanelWith(plyFile("a.ply", 6).string());
  ASSERT_TRUE(commands.importPLY());
  EXPECT_TRUE(doc().layers().empty());
  commands.setPLYDownsample(3);
  commands.setPLYShallDownsample(true);
  commands.endPLYOptionsSheet();
  EXPECT_EQ(std::static_pointer_cast<PointLayer>(lastLayer())->nPoints(), 2);

  user->answerOpenPanelWith(plyFile("b.ply", 6).string());
  ASSERT_TRUE(commands.importPLY());
  commands.setPLYShallDownsample(false);
  commands.endPLYOptionsSheet();
  commands.endPLYOptionsSheet();  // a second end adds nothing more
  EXPECT_EQ(std::static_pointer_cast<PointLayer>(lastLayer())->nPoints(), 6);
  EXPECT_EQ(doc().layers().size(), 2u);
}

TEST_F(ApplicationCommandsTest, DownsampleFactorsFromTheDefaultsAreSafe) {
  struct Case {
    std::int64_t stored;
    std::int32_t read;
    int points;  // of 4 vertices: the reader keeps 4 / factor of them
  };
  const Case cases[] = {
      {std::numeric_limits<std::int64_t>::max(), std::numeric_limits<std::int32_t>::max(), 0},
      {-5, -5, 4},
      {0, 0, 4},
      {std::numeric_limits<std::int64_t>::min(), std::numeric_limits<std::int32_t>::min(), 4}};
  auto& userDefaults = UserDefaults::standardUserDefaults();
  userDefaults.setObjectForKey(true, kOpenPLYDownsampleKey);
  for (const Case& c : cases) {
    userDefaults.setObjectForKey(c.stored, kOpenPLYDownsampleFactorKey);
    EXPECT_EQ(ImportOptions::fromDefaults(userDefaults).openPLYDownsampleFactor, c.read);
    import(&ApplicationCommands::importPointFile, plyFile("s.ply", 4));
    EXPECT_EQ(std::static_pointer_cast<PointLayer>(lastLayer())->nPoints(), c.points) << c.stored;
  }
}

TEST_F(ApplicationCommandsTest, AddCommandsAddTheirKindsAndTheSLERPPathIsStored) {
  commands.addPoint();
  EXPECT_TRUE(std::dynamic_pointer_cast<Point3D>(lastLayer()));
  commands.addPrimitive();
  EXPECT_TRUE(std::dynamic_pointer_cast<Sphere>(lastLayer()));
  EXPECT_TRUE(doc().storedCameraPaths().empty());
  commands.addSLERP();
  EXPECT_TRUE(std::dynamic_pointer_cast<SLERPCameraPath>(lastLayer()));
  ASSERT_EQ(doc().storedCameraPaths().size(), 1u);
  EXPECT_EQ(doc().selectedLayer(), lastLayer());
}

TEST_F(ApplicationCommandsTest, LayerStepsAndTheirMenuItemsFollowTheSelection) {
  commands.addPoint();
  commands.addPrimitive();
  commands.addPoint();
  const auto layers = doc().layers();
  struct Case {
    std::shared_ptr<Layer> selected;
    bool previousOn, nextOn;
    std::shared_ptr<Layer> afterPrevious, afterNext;
  };
  const Case cases[] = {
      {layers[0], false, true, layers[0], layers[1]},
      {layers[1], true, true, layers[0], layers[2]},
      {layers[2], true, false, layers[1], layers[2]},
      // No selection: Previous stays on but does nothing.
      {nullptr, true, false, nullptr, nullptr},
  };
  for (const Case& c : cases) {
    doc().setSelectedLayer(c.selected);
    EXPECT_EQ(commands.validateMenuItem(menu_action::kLayerPrevious), c.previousOn);
    EXPECT_EQ(commands.validateMenuItem(menu_action::kLayerNext), c.nextOn);
    commands.menuLayerPrevious();
    EXPECT_EQ(doc().selectedLayer(), c.afterPrevious);
    doc().setSelectedLayer(c.selected);
    commands.menuLayerNext();
    EXPECT_EQ(doc().selectedLayer(), c.afterNext);
  }
  EXPECT_TRUE(commands.validateMenuItem("showTimelineWindow:"));
  // No document: the same as no selection.
  commands.documentWindowDidDeactivate();
  EXPECT_FALSE(commands.validateMenuItem(menu_action::kLayerNext));
  EXPECT_TRUE(commands.validateMenuItem(menu_action::kLayerPrevious));
  EXPECT_FALSE(commands.validateMenuItem(menu_action::kReSaveLayer));
  commands.menuLayerPrevious();
  commands.menuLayerNext();
}

TEST_F(ApplicationCommandsTest, ReSaveIsForExactlyALinkedPointLayerAndWritesItBack) {
  auto linkedPoints = PointLayer::initWithURLShouldLink(pointFile("linked.rwb", 4), true);
  auto inlinePoints = std::make_shared<PointLayer>();
  auto linkedBundle = BundlerFile::initWithURLShouldLink(bundleFile(), true);
  auto sphere = std::make_shared<Sphere>();
  struct Case {
    std::shared_ptr<Layer> layer;
    bool reSaveOn, reRandomizeOn;
  };
  const Case cases[] = {{linkedPoints, true, true},
                        {inlinePoints, false, true},
                        {linkedBundle, false, true},
                        {sphere, false, false}};
  for (const Case& c : cases) {
    doc().addLayer(c.layer);
    EXPECT_EQ(commands.validateMenuItem(menu_action::kReSaveLayer), c.reSaveOn)
        << c.layer->className();
    EXPECT_EQ(commands.validateMenuItem(menu_action::kReRandomizeBuckets), c.reRandomizeOn)
        << c.layer->className();
  }

  doc().setSelectedLayer(linkedPoints);
  ASSERT_TRUE(commands.menuReRandomizeBuckets());
  commands.endReRandomizeOptionsSheet(0, 0.0f);  // exponent 0: every luck 255
  commands.menuReSaveLayer();
  PointLayer reread;
  Error error;
  (void)reread.loadPointsFromURLError(dir / "linked.rwb", &error);
  ASSERT_TRUE(error.message.empty()) << error.message;
  for (const color_point& p : reread.colorPoints()) {
    EXPECT_EQ(p.luck, 255);
  }
  // A bundle file is never written; an inline layer is told it cannot be.
  doc().setSelectedLayer(linkedBundle);
  commands.menuReSaveLayer();
  EXPECT_TRUE(user->alerts.empty());
  doc().setSelectedLayer(inlinePoints);
  commands.menuReSaveLayer();
  ASSERT_EQ(user->alerts.size(), 1u);
  EXPECT_EQ(user->alerts[0].messageText, "Cannot save");
}

TEST_F(ApplicationCommandsTest, ReRandomizingNeedsAPointLayerAndTheSheetsFirstButton) {
  import(&ApplicationCommands::importRWB, pointFile("c.rwb", 50));
  auto layer = std::static_pointer_cast<PointLayer>(lastLayer());
  auto lucks = [&] {
    std::vector<int> out;
    for (const color_point& p : layer->colorPoints()) out.push_back(p.luck);
    return out;
  };
  ASSERT_TRUE(commands.menuReRandomizeBuckets());
  commands.endReRandomizeOptionsSheet(1, 0.0f);
  EXPECT_EQ(lucks(), std::vector<int>(50, 7));
  commands.endReRandomizeOptionsSheet(0, 0.0f);  // the sheet has ended already
  EXPECT_EQ(lucks(), std::vector<int>(50, 7));
  ASSERT_TRUE(commands.menuReRandomizeBuckets());
  commands.endReRandomizeOptionsSheet(0, std::numeric_limits<float>::quiet_NaN());
  EXPECT_EQ(lucks(), std::vector<int>(50, 0));  // a NaN exponent stores 0

  commands.addPrimitive();
  EXPECT_FALSE(commands.menuReRandomizeBuckets());
  commands.endReRandomizeOptionsSheet(0, 0.0f);
  EXPECT_EQ(lucks(), std::vector<int>(50, 0));
}

TEST_F(ApplicationCommandsTest, BakeAsksAndChangesNothingWhicheverButton) {
  commands.addPrimitive();
  const auto before = doc().layers().front()->bbox();
  user->answerAlertsWith({0, 1});
  commands.bakeTransformation();
  commands.bakeTransformation();
  ASSERT_EQ(user->alerts.size(), 2u);
  EXPECT_EQ(user->alerts[0].messageText, "Warning");
  EXPECT_EQ(user->alerts[0].buttons, (std::vector<std::string>{"Bake", "Cancel"}));
  EXPECT_EQ(doc().layers().size(), 1u);
  EXPECT_EQ(doc().layers().front()->bbox(), before);
  EXPECT_EQ(doc().undoManager().undoActionName(), "New Layer");
}

TEST_F(ApplicationCommandsTest, BookmarksReplaceByTitleAndRecallTheStoredCamera) {
  int changes = 0;
  Observer watcher;
  NotificationCenter::defaultCenter().addObserver(watcher, std::string(kDocumentChangeNotification),
                                                  &doc(), [&](const Notification&) { ++changes; });
  doc().sceneCamera()->setFieldOfView(20);
  commands.menuBookmarkCamera("One");
  doc().sceneCamera()->setFieldOfView(40);
  commands.menuBookmarkCamera("One");  // replaces
  doc().sceneCamera()->setFieldOfView(60);
  ASSERT_EQ(doc().viewBookmarks()->size(), 1u);
  const auto stored = doc().viewBookmarks()->at("One");
  EXPECT_NE(stored, doc().sceneCamera());
  EXPECT_EQ(stored->fieldOfView(), 40);

  commands.menuRecallCamera("One");
  EXPECT_EQ(doc().sceneCamera(), stored);  // the stored object itself
  EXPECT_EQ(changes, 1);
  commands.menuRecallCamera("Missing");
  EXPECT_EQ(doc().sceneCamera(), stored);
  EXPECT_EQ(changes, 2);

  doc().setViewBookmarks(std::nullopt);  // a document read without them
  commands.menuRecallCamera("One");
  commands.menuBookmarkCamera("Two");
  EXPECT_EQ(doc().viewBookmarks()->count("Two"), 1u);
  NotificationCenter::defaultCenter().removeObserver(watcher);
}

TEST_F(ApplicationCommandsTest, FrontDocumentFollowsTheWindowNotifications) {
  auto otherWindow = FakeWindow(std::make_shared<MyDocument>());
  commands.applicationDidFinishLaunching(&window);
  EXPECT_EQ(ApplicationDelegate::shared(), &commands);
  auto& center = NotificationCenter::defaultCenter();
  const DocumentWindowController* other = &otherWindow;
  center.postNotificationName(std::string(kDocumentActivateNotification), other);
  EXPECT_EQ(commands.theDocument(), otherWindow.doc);
  commands.menuZoomIn();
  commands.menuZoomOut();
  commands.menuZoomOut();
  EXPECT_EQ(otherWindow.zoomIns, 1);
  EXPECT_EQ(otherWindow.zoomOuts, 2);

  center.postNotificationName(std::string(kDocumentDeactivateNotification), other);
  EXPECT_FALSE(commands.currentDocumentIsValid());
  commands.menuZoomIn();
  commands.addPoint();
  commands.menuBookmarkCamera("x");
  commands.bakeTransformation();
  EXPECT_EQ(otherWindow.zoomIns, 1);
  EXPECT_TRUE(otherWindow.doc->layers().empty());
  EXPECT_TRUE(user->alerts.empty());

  // A document that has gone counts as none.
  center.postNotificationName(std::string(kDocumentActivateNotification), other);
  otherWindow.doc.reset();
  EXPECT_FALSE(commands.currentDocumentIsValid());
  commands.addPoint();
  center.postNotificationName(std::string(kDocumentDeactivateNotification), nullptr);
}

TEST_F(ApplicationCommandsTest, CurrentLayerVisibilityIsTheSelectedLayers) {
  EXPECT_FALSE(commands.currentLayerVisible());
  commands.setCurrentLayerVisible(true);  // no selection: nothing to set
  commands.addPoint();
  commands.setCurrentLayer(lastLayer());
  EXPECT_EQ(commands.currentLayer(), lastLayer());
  EXPECT_TRUE(commands.currentLayerVisible());
  commands.setCurrentLayerVisible(false);
  EXPECT_FALSE(lastLayer()->isVisible());
  EXPECT_FALSE(std::get<bool>(commands.valueForKey("currentLayerVisible")));
}

TEST_F(ApplicationCommandsTest, ReadingOffTheMainThreadAddsOnTheCompletionLoop) {
  RunLoop loop;
  BackgroundQueue queue;
  commands.setBackgroundReading(&queue, &loop);
  std::vector<int> counts;  // the reads in progress at each change
  commands.setImportsChangedHandler([&] { counts.push_back(commands.importsInProgress()); });

  import(&ApplicationCommands::importRWB, pointFile("big.rwb", 1000));
  import(&ApplicationCommands::importRWB, dir / "missing.rwb");
  EXPECT_EQ(counts, (std::vector<int>{1, 2}));
  const std::vector<std::filesystem::path> reading = {dir / "big.rwb", dir / "missing.rwb"};
  EXPECT_EQ(commands.filesBeingRead(), reading);
  EXPECT_TRUE(doc().layers().empty());  // nothing until the loop runs
  ASSERT_TRUE(loop.runUntil([&] { return counts.size() == 4; }, std::chrono::seconds(20)));
  EXPECT_EQ(counts, (std::vector<int>{1, 2, 1, 0}));
  ASSERT_EQ(doc().layers().size(), 1u);
  EXPECT_EQ(std::static_pointer_cast<PointLayer>(lastLayer())->nPoints(), 1000);
  ASSERT_EQ(user->errors.size(), 1u);

  // The document closes while its file is read: the layer goes nowhere.
  import(&ApplicationCommands::importBundler, bundleFile());
  window.doc.reset();
  commands.documentWindowDidDeactivate();
  ASSERT_TRUE(loop.runUntil([&] { return counts.size() == 6; }, std::chrono::seconds(20)));
  EXPECT_TRUE(commands.filesBeingRead().empty());
}

TEST_F(ApplicationCommandsTest, PreferencesEditTheColoursAndFolders) {
  PreferenceController preferences;
  const auto colours = preferences.wellColors();
  const float expected[5][3] = {{0, 1, 0}, {1, 1, 0}, {0, 0, 0}, {1, 1, 0}, {1, 1, 0}};
  for (std::size_t i = 0; i < 5; ++i) {
    ASSERT_TRUE(colours[i]);
    EXPECT_EQ(colours[i]->red(), expected[i][0]);
    EXPECT_EQ(colours[i]->green(), expected[i][1]);
    EXPECT_EQ(colours[i]->blue(), expected[i][2]);
    EXPECT_EQ(colours[i]->alpha(), 1.0f);
  }

  std::vector<const void*> posts;
  Observer watcher;
  NotificationCenter::defaultCenter().addObserver(
      watcher, std::string(kGridColorChangedNotification), nullptr,
      [&](const Notification& n) { posts.push_back(n.object); });
  const auto half = Color::colorWithRGBA(0.5f, 0.25f, 0.125f, 0.5f);
  for (const auto well : PreferenceController::kWells) {
    preferences.changePrefsColorFromColorWell(*half, well);
    const auto stored =
        PreferenceController::prefsColorNamed(PreferenceController::keyForWell(well));
    ASSERT_TRUE(stored);
    EXPECT_EQ(stored->green(), 0.25f);
    EXPECT_EQ(stored->alpha(), 0.5f);  // alpha is kept
  }
  // Four posts: the point colour applies only to layers made later.
  EXPECT_EQ(posts, std::vector<const void*>(4, &preferences));
  NotificationCenter::defaultCenter().removeObserver(watcher);

  auto& userDefaults = UserDefaults::standardUserDefaults();
  user->answerOpenPanelWith((dir / "images").string());
  preferences.changeImagePath();
  user->answerOpenPanelWith(std::nullopt);
  preferences.changePointProxyPath();
  EXPECT_TRUE(user->views.empty());  // folder choosers show no import options
  EXPECT_EQ(userDefaults.stringForKey(kImageSavePathKey), (dir / "images").string());
  EXPECT_EQ(userDefaults.stringForKey(kPointCachePathKey), homeDirectory().string() + "/rw_points");
  ASSERT_EQ(user->panels.size(), 2u);
  EXPECT_FALSE(user->panels[0].canChooseFiles);
  EXPECT_TRUE(user->panels[0].canChooseDirectories);
}

}  // namespace
}  // namespace cloudreel
