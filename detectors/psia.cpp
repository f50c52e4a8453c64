#include "detectors/psia.h"

namespace {

const char kAlertStreamPath[] = "/PSIA/Custom/Event/notification/alertStream";

}  // namespace

PSIAMD::PSIAMD(Camera* camera) : HikVisionMD(camera, kAlertStreamPath) {}

PSIAMD::~PSIAMD() { StopIfStarted(); }

PSIAEID::PSIAEID(Camera* camera, int input) : HikVisionEID(camera, input, kAlertStreamPath) {}

PSIAEID::~PSIAEID() { StopIfStarted(); }
