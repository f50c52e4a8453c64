#include "detectors/airlive.h"

namespace {

const char kInputPath[] = "io/input.cgi?checkactive=";
const char kMotionDataPath[] = "motion/motiondata.cgi";

}  // namespace

AIRLIVEV1EID::AIRLIVEV1EID(Camera* camera, int inputs)
    : InputQueryEID(camera, inputs, kInputPath, InputAnswerCheck::kKeyValue) {}

AIRLIVEV1EID::~AIRLIVEV1EID() { StopIfStarted(); }

AirliveV1MD::AirliveV1MD(Camera* camera) : MotionDataMD(camera, nullptr, {MotionLineFormat::kGroupNumber, IdleLevel::kLastLine, kMotionDataPath}) {}

AirliveV1MD::~AirliveV1MD() { StopIfStarted(); }
