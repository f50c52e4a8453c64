// HikVision network cameras: motion (HikVisionMD) and alarm inputs (HikVisionEID), both read
// from the camera's alert stream, /Event/notification/alertStream on the camera's own port:
// an endless multipart response whose parts are XML EventNotificationAlert records. Only
// every fourth part is judged; the others are read and dropped unseen. Motion is a VMD
// record whose activePostCount differs from that of the last VMD record judged; an input is
// active when an IO record's eventState is "active", whatever input it names. The PSIA
// classes (psia.h) are these same machines on the PSIA path.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera is the host's and must outlive the detector's run. Records
// are parsed under XmlLock(), so any number of these detectors can run in one process.

#ifndef EVWATCH_DETECTORS_HIKVISION_H_
#define EVWATCH_DETECTORS_HIKVISION_H_

#include "framework/detector.h"

class Camera;
class MultipartFetch;

// Results of DoMD/DoEID and of judging a record:
//   0  no part could be read (no fetcher, or its header read failed): the loop reports
//      (false, 0);
//   1  nothing judged (a pass whose turn it is not, a failed body read, unparsable XML,
//      another eventType, a missing element): the loop reports nothing;
//   2  a record of the watched type without an event: state false;
//   3  a record of the watched type with an event: state true.
// The loop reports nothing on its first pass, whatever that pass found, except a 0.

class HikVisionMD : public DetectorBase {
 public:
  explicit HikVisionMD(Camera* camera);
  ~HikVisionMD() override;

  // One part: judged when the pass counter modulo 4 is 1. On 3 motion is true and the
  // level 100; otherwise false and 0.
  int DoMD(MultipartFetch* fetch, bool& motion, unsigned int& level);
  // Judges one record (text up to its first zero byte or `length`): 3 when it is a VMD
  // record whose activePostCount (a number as strtol reads it) differs from the stored
  // one, which it then becomes; 2 when it is the same; 1 otherwise.
  int IsMotionDetected(char* body, int length);
  int EventDetecor() override;

  // The pass counter, a test seam: a test can start it near its wrap at 2147483647 without
  // making 2^31 passes. SetPartCounter REQUIRES: not started; 0 <= count < 2147483647.
  int PartCounter() const { return part_counter_; }
  void SetPartCounter(int count) { part_counter_ = count; }

 protected:
  // The same machine on another alert-stream path (a string literal).
  HikVisionMD(Camera* camera, const char* path);

 private:
  Camera* camera_;                // not owned
  const char* path_;              // the alert stream's path
  unsigned int last_post_count_;  // activePostCount of the last VMD record judged; 0 at first
  int part_counter_;              // passes made, 0 .. 2147483646; selects the parts judged
};

class HikVisionEID : public DetectorBase {
 public:
  // `input` is kept but selects nothing: the stream carries every input's records and any
  // IO record sets the state.
  HikVisionEID(Camera* camera, int input);
  ~HikVisionEID() override;

  // One part: judged when the pass counter modulo 4 is 0 (so the first pass judges, and
  // the loop does not report it). On 3 active is true; otherwise false.
  int DoEID(MultipartFetch* fetch, bool& active);
  // Judges one record: 3 for an IO record whose eventState is exactly "active", 2 for one
  // with any other state, 1 otherwise.
  int IsEventDetected(char* body, int length);
  int EventDetecor() override;

  // As HikVisionMD's.
  int PartCounter() const { return part_counter_; }
  void SetPartCounter(int count) { part_counter_ = count; }

 protected:
  HikVisionEID(Camera* camera, int input, const char* path);

 private:
  Camera* camera_;    // not owned
  [[maybe_unused]] int input_;  // as given; unused by design
  const char* path_;  // the alert stream's path
  int part_counter_;  // as HikVisionMD's
};

#endif  // EVWATCH_DETECTORS_HIKVISION_H_
