#include "scene/core_classes.h"

#include "camera/bundler_camera.h"
#include "camera/camera.h"
#include "camera/camera_field.h"
#include "camera/discrete_camera_path.h"
#include "camera/rw_trackball.h"
#include "camera/scene_camera.h"
#include "camera/slerp_camera_path.h"
#include "camera/source_camera.h"
#include "camera/transform_stack.h"
#include "camera/zxy_camera_path.h"
#include "geometry/geometry_classes.h"
#include "import/bundler_file.h"
#include "import/ply_file.h"
#include "platform/class_registry.h"
#include "scene/animated_card.h"
#include "scene/layer.h"
#include "scene/light_source.h"
#include "scene/ocean_fft.h"
#include "scene/point_3d.h"
#include "scene/point_layer.h"
#include "scene/sphere.h"
#include "timeline/affine_clip.h"
#include "timeline/affine_track.h"
#include "timeline/float_clips.h"
#include "timeline/float_value_track.h"
#include "timeline/spline.h"
#include "timeline/timeline.h"
#include "timeline/timeline_track.h"
#include "timeline/vector_clips.h"

namespace cloudreel {

void registerCoreClasses(ClassRegistry& registry) {
  registerGeometryClasses(registry);
  registry.registerClass<Layer>("Layer");
  registry.registerClass<AnimatedLayer>("AnimatedLayer");
  registry.registerClass<AnimatedCard>("AnimatedCard");
  registry.registerClass<LightSource>("LightSource");
  registry.registerClass<Sphere>("Sphere");
  registry.registerClass<Point3D>("Point3D");
  registry.registerClass<PointLayer>("PointLayer");
  registry.registerClass<PLYFile>("PLYFile");
  registry.registerClass<BundlerFile>("BundlerFile");
  registry.registerClass<OceanFFT>("OceanFFT");
  registry.registerClass<Camera>("Camera");
  registry.registerClass<SceneCamera>("SceneCamera");
  registry.registerClass<SourceCamera>("SourceCamera");
  registry.registerClass<BundlerCamera>("BundlerCamera");
  registry.registerClass<RWTrackball>("RWTrackball");
  registry.registerClass<DiscreteCameraPath>("DiscreteCameraPath");
  registry.registerClass<ZXYCameraPath>("ZXYCameraPath");
  registry.registerClass<SLERPCameraPath>("SLERPCameraPath");
  registry.registerClass<CameraField>("CameraField");
  registry.registerClass<TransformStack>("TransformStack");
  registry.registerClass<TransformStackMember>("TransformStackMember");
  registry.registerClass<SplinePoint>("SplinePoint");
  registry.registerClass<Spline>("Spline");
  registry.registerClass<TimelineClip>("TimelineClip");
  registry.registerClass<SingleValueClip>("SingleValueClip");
  registry.registerClass<AnimatedValueClip>("AnimatedValueClip");
  registry.registerClass<TweenClip>("TweenClip");
  registry.registerClass<SlerpClip>("SlerpClip");
  registry.registerClass<Vector3Clip>("Vector3Clip");
  registry.registerClass<AffineClip>("AffineClip");
  registry.registerClass<TimelineTrack>("TimelineTrack");
  registry.registerClass<TimecodeTrack>("TimecodeTrack");
  registry.registerClass<FloatValueTrack>("FloatValueTrack");
  registry.registerClass<AffineTrack>("AffineTrack");
  registry.registerClass<Timeline>("Timeline");
}

}  // namespace cloudreel
