#include "framework/host/camera.h"

#include <utility>

MotionRegion::MotionRegion() : left_(0), top_(0), right_(0), bottom_(0) {}

MotionRegion::MotionRegion(std::string name, int left, int top, int right, int bottom)
    : name_(std::move(name)), left_(left), top_(top), right_(right), bottom_(bottom) {}

MotionDetection::MotionDetection(std::vector<MotionRegion> regions)
    : regions_(std::move(regions)) {}

int MotionDetection::RegionCount() const { return static_cast<int>(regions_.size()); }

MotionRegion MotionDetection::GetRegion(int index) const {
  if (index < 0 || index >= RegionCount()) return MotionRegion();
  return regions_[static_cast<size_t>(index)];
}

Camera::Camera(CameraRecord record)
    : record_(std::move(record)), motion_(record_.regions) {}
