#include "detectors/axis.h"

namespace {

const char kInputPath[] = "axis-cgi/io/input.cgi?checkactive=";

}  // namespace

AXISEID::AXISEID(Camera* camera, int inputs)
    : InputQueryEID(camera, inputs, kInputPath, InputAnswerCheck::kLine) {}

AXISEID::~AXISEID() { StopIfStarted(); }

AxisMD::AxisMD(Camera* camera, CameraAPI* api) : MotionDataMD(camera, api, {MotionLineFormat::kGroupChar, IdleLevel::kLastLine, nullptr}) {}

AxisMD::~AxisMD() { StopIfStarted(); }
