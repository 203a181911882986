// The document file: the whole scene as one keyed archive whose top level
// holds exactly nine keys, and the reading that upgrades older files by the
// keys they lack. No version number is stored; a file is told apart only by
// which keys are present.

#include <algorithm>
#include <array>
#include <cstring>

#include "camera/camera_path.h"
#include "camera/scene_camera.h"
#include "camera/transform_stack.h"
#include "platform/atomic_file.h"
#include "platform/keyed_archiver.h"
#include "platform/keyed_unarchiver.h"
#include "platform/log.h"
#include "scene/layer.h"
#include "scene/light_source.h"
#include "scene/my_document.h"
#include "scene/point_layer.h"
#include "timeline/timeline.h"

namespace cloudreel {

namespace {

constexpr std::array<std::string_view, 9> kDocumentKeys = {
    "layers",         "cameraPaths",     "transformStacks",
    "timeline",       "sceneCamera",     "viewBookmarks",
    "overrideBuckets", "bucketOverrideFraction", "lightSource"};

bool corrupt(Error* error) {
  setError(error, std::string(kDocumentErrorDomain), kDocumentCorruptCode,
           std::string(kDocumentCorruptMessage));
  return false;
}

// Everything a document file holds, decoded before any of it replaces what
// the document has, so a read that fails half way changes nothing.
struct DecodedDocument {
  std::vector<std::shared_ptr<Layer>> layers;
  std::vector<std::shared_ptr<CameraPath>> cameraPaths;
  std::vector<std::shared_ptr<TransformStack>> transformStacks;
  std::shared_ptr<Timeline> timeline;
  std::shared_ptr<SceneCamera> sceneCamera;
  std::optional<MyDocument::Bookmarks> viewBookmarks;
  std::optional<bool> overrideBuckets;
  std::optional<float> bucketOverrideFraction;
  std::shared_ptr<LightSource> lightSource;
};

DecodedDocument decode(KeyedUnarchiver& coder) {
  DecodedDocument d;
  d.layers = coder.decodeListOfClassForKey<Layer>("layers").value_or(d.layers);
  d.cameraPaths = coder.decodeListOfClassForKey<CameraPath>("cameraPaths").value_or(d.cameraPaths);
  // Missing in files written before the stacks existed: an empty list.
  d.transformStacks =
      coder.decodeListOfClassForKey<TransformStack>("transformStacks").value_or(d.transformStacks);
  d.timeline = coder.decodeObjectOfClassForKey<Timeline>("timeline");
  // Any other value than a scene camera (files written before there was
  // one) is left for the upgrade below.
  d.sceneCamera = std::dynamic_pointer_cast<SceneCamera>(coder.decodeObjectForKey("sceneCamera"));
  d.viewBookmarks = coder.decodeDictionaryOfClassForKey<SceneCamera>("viewBookmarks");
  if (coder.typeOfValueForKey("overrideBuckets") != ArchiveValueType::Null) {
    d.overrideBuckets = coder.decodeBoolForKey("overrideBuckets");
  }
  if (coder.typeOfValueForKey("bucketOverrideFraction") != ArchiveValueType::Null) {
    d.bucketOverrideFraction = coder.decodeFloatForKey("bucketOverrideFraction");
  }
  d.lightSource = coder.decodeObjectOfClassForKey<LightSource>("lightSource");
  return d;
}

}  // namespace

bool MyDocument::writeToStream(OutputStream& out, Error* error) {
  // Linked point files are brought up to date first; a layer that cannot
  // write its file says so itself, and the document is saved all the same.
  const std::vector<std::shared_ptr<Layer>> layers = layers_;
  for (const auto& layer : layers) {
    if (auto points = std::dynamic_pointer_cast<PointLayer>(layer);
        points && points->isModified() && points->fileStoredAsLink()) {
      points->saveLinkedLayer();
    }
  }
  KeyedArchiver coder(out);
  coder.encodeList(layers_, "layers");
  coder.encodeList(cameraPaths_, "cameraPaths");
  coder.encodeList(transformStacks_, "transformStacks");
  coder.encodeObject(timeline_, "timeline");
  coder.encodeObject(sceneCamera_, "sceneCamera");
  if (viewBookmarks_) {
    coder.encodeDictionary(*viewBookmarks_, "viewBookmarks");
  } else {
    coder.encodeObject(nullptr, "viewBookmarks");
  }
  if (overrideBuckets_) {
    coder.encodeBool(*overrideBuckets_, "overrideBuckets");
  } else {
    coder.encodeObject(nullptr, "overrideBuckets");
  }
  if (bucketOverrideFraction_) {
    coder.encodeFloat(*bucketOverrideFraction_, "bucketOverrideFraction");
  } else {
    coder.encodeObject(nullptr, "bucketOverrideFraction");
  }
  coder.encodeObject(lightSource_, "lightSource");
  return coder.finish(error);
}

bool MyDocument::readFromStream(InputStream& in, Error* error) {
  Error reason;
  const auto coder = KeyedUnarchiver::open(in, &reason);
  // An archive that holds none of the document's keys (a settings file, a
  // colour) is no document either.
  if (!coder || std::none_of(kDocumentKeys.begin(), kDocumentKeys.end(), [&](std::string_view k) {
        return coder->containsValueForKey(k);
      })) {
    if (coder) {
      logf("not a document: the archive holds none of the document's keys");
    } else {
      logf("not a document: %s", reason.message);
    }
    return corrupt(error);
  }
  DecodedDocument d = decode(*coder);
  if (coder->hasFailed()) {
    // A layer that failed on its own account (a linked point file that is
    // gone) says what failed on which file; anything else is damage.
    const Error& failure = coder->error();
    logf("cannot read the document: %s", failure.message);
    if (failure.domain == kArchiveErrorDomain) {
      return corrupt(error);
    }
    setError(error, failure.domain, failure.code, failure.message);
    return false;
  }

  // From here on nothing can fail: the decoded contents replace the old.
  for (const auto& layer : layers_) {
    layer->removeObserversForDocument(this);
  }
  // Steps of the old contents would act on objects that are gone.
  undoManager_.removeAllActions();
  setLayers(std::move(d.layers));
  setCameraPaths(std::move(d.cameraPaths));
  if (!layers_.empty()) {
    if (ApplicationDelegate* delegate = ApplicationDelegate::shared()) {
      delegate->setCurrentLayer(layers_.front());
    }
  }
  // Only the top-level layers are attached: edits of child layers register
  // no undo, as it has always been.
  for (const auto& layer : layers_) {
    layer->addObserversForDocument(this);
  }
  setTransformStacks(std::move(d.transformStacks));
  setTimeline(std::move(d.timeline));
  if (!d.sceneCamera) {
    // Files written before the scene camera existed. This camera is made
    // plainly: neither the 15-unit distance nor the name a new document's
    // camera gets.
    logf("creating new Scene Camera for pre-r701 document");
    d.sceneCamera = std::make_shared<SceneCamera>();
  }
  setSceneCamera(std::move(d.sceneCamera));
  setViewBookmarks(std::move(d.viewBookmarks));
  setOverrideBuckets(d.overrideBuckets);
  setBucketOverrideFraction(d.bucketOverrideFraction);
  setLightSource(d.lightSource ? std::move(d.lightSource) : std::make_shared<LightSource>());
  setEnableViewUpdates(true);
  initOpenGLContext();
  return true;
}

Bytes MyDocument::dataOfTypeError(std::string_view, Error* error) {
  MemoryOutputStream out;
  if (!writeToStream(out, error)) {
    return {};
  }
  return out.takeBytes();
}

bool MyDocument::readFromDataOfTypeError(std::span<const std::uint8_t> data, std::string_view,
                                         Error* error) {
  MemoryInputStream in(data);
  return readFromStream(in, error);
}

bool MyDocument::writeToURLError(const std::filesystem::path& url, Error* error) {
  AtomicFileReplacement replacement(url);
  Error reason;
  if (auto out = FileOutputStream::create(replacement.temporaryPath(), &reason)) {
    if (!writeToStream(*out, &reason)) {
      // The stream's own failure (no space, ...) explains a failed archive.
      if (!out->error().message.empty()) {
        reason = out->error();
      }
    } else if (!out->sync() || !out->close()) {
      reason = out->error();
    } else if (replacement.commit(&reason)) {
      return true;
    }
  }
  // The replacement removes its temporary; the previous file is untouched.
  // The stream's message names the temporary, so the reason is told anew
  // for the document's own name.
  const std::string why =
      reason.domain == "CloudreelFile" && reason.code != 0 ? std::strerror(reason.code)
                                                           : reason.message;
  setError(error, reason.domain, reason.code, "Cannot save " + url.string() + ": " + why);
  return false;
}

bool MyDocument::readFromURLError(const std::filesystem::path& url, Error* error) {
  Error reason;
  const auto in = FileInputStream::open(url, &reason);
  if (!in) {
    setError(error, reason.domain, reason.code, reason.message);
    return false;
  }
  return readFromStream(*in, error);
}

}  // namespace cloudreel
