#include "detectors/avipc.h"

namespace {

const char kInputPath[] = "cgi-bin/io/input.cgi?checkactive=";

}  // namespace

AVIPCEID::AVIPCEID(Camera* camera, int inputs)
    : InputQueryEID(camera, inputs, kInputPath, InputAnswerCheck::kKeyValue) {}

AVIPCEID::~AVIPCEID() { StopIfStarted(); }

AvipcMD::AvipcMD(Camera* camera, CameraAPI* api) : MotionDataMD(camera, api, {MotionLineFormat::kGroupChar, IdleLevel::kLastLine, nullptr}) {}

AvipcMD::~AvipcMD() { StopIfStarted(); }
