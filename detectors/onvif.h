// Cameras that announce motion and alarm inputs through the standard event service: one
// pull-point subscription per detector, read as a long poll.
//
// OnvifMD reports motion of the camera's video source number GetCH() (1 = the first source
// the camera announces) from the cell motion detector's IsMotion or the video source's
// MotionAlarm State, whichever the camera offers (either one active is motion; level 100).
// OnvifEID(camera, input) reports digital input number `input` (1 = the first input token
// the camera announces); its value is the validity flag. The state each subscription starts
// with (the camera's Initialized messages) is reported at once; a message for another
// source or topic does not change the reading.
//
// Lifecycle: DetectorBase's. The worker thread subscribes, pulls, renews; after a failure
// it reports (false, 0) and subscribes again after a back-off that doubles up to 30 s. Stop()
// ends a long poll or a back-off in progress at once, and the loop unsubscribes before its
// final (false, 0). The camera is not owned and must outlive the detector.

#ifndef EVWATCH_DETECTORS_ONVIF_H_
#define EVWATCH_DETECTORS_ONVIF_H_

#include <map>
#include <string>
#include <vector>

#include "framework/detector.h"
#include "framework/host/camera.h"
#include "framework/host/onvifevents.h"

class OnvifDetector : public DetectorBase {
 public:
  // Unsubscribes what direct readings left subscribed.
  ~OnvifDetector() override;
  int Start() override;
  int Stop() override;
  int EventDetecor() override;

  // Settings of the subscription, to be changed before Start: the event service's path
  // (empty: ask the camera), how long one PullMessages may wait (seconds), how many messages
  // it may bring, and how long a subscription lives unless renewed (seconds).
  // REQUIRES: not started.
  void SetEventPath(const std::string& path);
  void SetPullTimeout(int seconds);
  void SetMessageLimit(int messages);
  void SetTermination(int seconds);

  // The client's last failure, for logs (never holds the password).
  std::string LastError() const { return client_ ? client_->LastError() : ""; }

 protected:
  // input: 0 for motion, else the input number.
  OnvifDetector(Camera* camera, int input);
  // One reading: subscribes when needed and pulls once. 0 and the state on success; -1 on
  // a failure and after Stop.
  int Read(bool& state);

 private:
  // The state by source, and the sources in the order the camera first named them.
  struct TopicStates {
    std::vector<std::string> order;
    std::map<std::string, bool> state;
    // Whether source number `index` (from 1) is known and active.
    bool Active(int index) const;
  };
  void Reconnect();

  Camera* camera_;     // not owned
  const int input_;    // 0: motion
  int source_;         // the video source number of a motion detector, from 1
  OnvifSettings settings_;
  std::unique_ptr<OnvifEventClient> client_;  // used by the reading thread; Interrupt by any
  TopicStates cell_, alarm_, inputs_;         // reset on each subscription
};

class OnvifMD : public OnvifDetector {
 public:
  explicit OnvifMD(Camera* camera);
  ~OnvifMD() override;
  // 0 with motion and its level (100 or 0) on success; -1 with (false, 0) on a failure.
  int DoMD(bool& motion, unsigned int& level);
};

class OnvifEID : public OnvifDetector {
 public:
  OnvifEID(Camera* camera, int input);
  ~OnvifEID() override;
  // 0 with the input's state on success; -1 with false on a failure.
  int DoEID(bool& active);
};

#endif  // EVWATCH_DETECTORS_ONVIF_H_
