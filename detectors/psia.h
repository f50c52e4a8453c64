// Cameras that follow the PSIA event interface: motion (PSIAMD) and alarm inputs (PSIAEID)
// from the alert stream at /PSIA/Custom/Event/notification/alertStream on the camera's own
// port. They are the HikVision machines (hikvision.h) on this path: the same parts judged,
// the same records, the same reports.
//
// Threads: as for the HikVision classes.

#ifndef EVWATCH_DETECTORS_PSIA_H_
#define EVWATCH_DETECTORS_PSIA_H_

#include "detectors/hikvision.h"

class PSIAMD : public HikVisionMD {
 public:
  explicit PSIAMD(Camera* camera);
  ~PSIAMD() override;
};

class PSIAEID : public HikVisionEID {
 public:
  // `input` is kept but selects nothing, as for HikVisionEID.
  PSIAEID(Camera* camera, int input);
  ~PSIAEID() override;
};

#endif  // EVWATCH_DETECTORS_PSIA_H_
