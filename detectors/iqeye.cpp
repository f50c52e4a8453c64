#include "detectors/iqeye.h"

namespace {

const char kMotionDataPath[] = "now.motiondata";

}  // namespace

IQeyeV2MD::IQeyeV2MD(Camera* camera) : MotionDataMD(camera, nullptr, {MotionLineFormat::kWindowNumber, IdleLevel::kLastLine, kMotionDataPath}) {}

IQeyeV2MD::~IQeyeV2MD() { StopIfStarted(); }
