// Camera record: what the host knows of one camera (address, credentials, channel, motion
// settings). Built once from a plain CameraRecord that the daemon fills; immutable after
// that, so any number of threads may call its getters at once. Detectors hold a Camera*
// they do not own; the host keeps the Camera alive while they run.

#ifndef EVWATCH_FRAMEWORK_HOST_CAMERA_H_
#define EVWATCH_FRAMEWORK_HOST_CAMERA_H_

#include <string>
#include <vector>

// One motion-detection region, in the 0..10000 space of the frame on each axis.
class MotionRegion {
 public:
  MotionRegion();
  MotionRegion(std::string name, int left, int top, int right, int bottom);

  const std::string& Name() const { return name_; }
  int Left() const { return left_; }
  int Top() const { return top_; }
  int Right() const { return right_; }
  int Bottom() const { return bottom_; }

 private:
  std::string name_;
  int left_, top_, right_, bottom_;
};

// The camera's motion-detection regions.
class MotionDetection {
 public:
  MotionDetection() = default;
  explicit MotionDetection(std::vector<MotionRegion> regions);

  int RegionCount() const;
  // The region at index; an empty region (all zero) when index is out of range.
  MotionRegion GetRegion(int index) const;

 private:
  std::vector<MotionRegion> regions_;
};

// Plain data the daemon (or a test) fills to make a Camera.
struct CameraRecord {
  std::string host;
  int port = 80;
  std::string username;
  std::string password;
  int id = 0;
  std::string channel = "1";
  int stream_type = 0;
  int video_type = 0;
  int sensitivity = 90;
  int threshold = 10;
  std::vector<MotionRegion> regions;
};

class Camera {
 public:
  explicit Camera(CameraRecord record);

  std::string GetHost() const { return record_.host; }
  int GetPort() const { return record_.port; }
  std::string GetUsername() const { return record_.username; }
  std::string GetPassword() const { return record_.password; }
  int GetId() const { return record_.id; }
  std::string GetCH() const { return record_.channel; }
  int GetStmType() const { return record_.stream_type; }
  int GetVideoType() const { return record_.video_type; }
  const MotionDetection& GetMotionDet() const { return motion_; }
  int GetSensitivity() const { return record_.sensitivity; }
  int GetThreshold() const { return record_.threshold; }

 private:
  const CameraRecord record_;
  const MotionDetection motion_;
};

#endif  // EVWATCH_FRAMEWORK_HOST_CAMERA_H_
