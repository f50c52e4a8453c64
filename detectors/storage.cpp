#include "detectors/storage.h"

namespace {

// Everything that sets these boxes apart from MessoaPro cameras: the key, the swapped
// motion and input numbers, and the ";" the box writes after the value.
const AlarmStatusForm kStorageStatus = {"alarm_status", 1, 2, ValueForm::kFirstSemicolonDropped};

}  // namespace

StorageMD::StorageMD(Camera* camera, CameraAPI* api) : AlarmStatusMD(camera, api, kStorageStatus) {}

StorageMD::~StorageMD() { StopIfStarted(); }

StorageEID::StorageEID(Camera* camera, CameraAPI* api, int inputs)
    : AlarmStatusEID(camera, api, inputs, kStorageStatus) {}

StorageEID::~StorageEID() { StopIfStarted(); }
