#include "detectors/messoapro.h"

namespace {

const AlarmStatusForm kMessoaProStatus = {"Alarm.Status", 2, 1, ValueForm::kAsFound};

}  // namespace

MessoaProMD::MessoaProMD(Camera* camera, CameraAPI* api) : AlarmStatusMD(camera, api, kMessoaProStatus) {}

MessoaProMD::~MessoaProMD() { StopIfStarted(); }

MessoaProEID::MessoaProEID(Camera* camera, CameraAPI* api, int inputs)
    : AlarmStatusEID(camera, api, inputs, kMessoaProStatus) {}

MessoaProEID::~MessoaProEID() { StopIfStarted(); }
