// IPux cameras: motion (IPuxMD) and the alarm input (IPuxEID), read from the fixed-layout
// status records that the camera pushes as the parts of a multipart stream, or from the
// host's frame buffer when one is given. A pass every 16 ms, one record per pass.
//
// Record layout used: byte 24 is the motion sensitivity reading (0..255, see SenStrToInt),
// bit 0 of byte 27 the input. A record shorter than 29 bytes carries neither.
//
// Stream choice: IPuxMD prepares the camera API's stream (video type, 2); IPuxEID prepares
// (video type, its int constructor argument), so the int picks the camera API's stream of
// input records (1 in the usual set-up).
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera, CameraAPI and StreamBuffer are the host's and must outlive
// the detector's run.

#ifndef EVWATCH_DETECTORS_IPUX_H_
#define EVWATCH_DETECTORS_IPUX_H_

#include "framework/detector.h"

class Camera;
class CameraAPI;
class MultipartFetch;
class StreamBuffer;

// The percentage of a raw sensitivity byte x: (x + 1) * 99 / 256 + 0.5, truncated
// (0 gives 0, 255 gives 99).
int SenStrToInt(int x);

class IPuxMD : public DetectorBase {
 public:
  // With a buffer the records come from it and no stream is opened.
  IPuxMD(Camera* camera, CameraAPI* api, StreamBuffer* buffer);
  ~IPuxMD() override;

  // Motion when the record's level (SenStrToInt of byte 24, at most 100) exceeds the
  // threshold. A record shorter than 29 bytes gives false and leaves level untouched.
  bool IsMotionDetected(char* record, int length, unsigned int& level);
  // Reads the next record of reader: 0 with the reading, -1 (false, 0) when no part could
  // be read (its body is skipped; the reader is kept).
  int DoMD(MultipartFetch* reader, bool& state, unsigned int& level);
  int EventDetecor() override;

  // The threshold in use: 90 until the loop reads the camera API's (at least 1). Read it
  // while the detector is stopped: the worker thread writes it.
  int Threshold() const { return threshold_; }

 private:
  // Reads the threshold from the camera API; below 1 counts as 1.
  void RefreshThreshold();

  int threshold_;         // motion threshold; written by the worker thread only
  Camera* camera_;        // not owned
  CameraAPI* api_;        // not owned
  StreamBuffer* buffer_;  // not owned; null: records come from the camera's stream
};

class IPuxEID : public DetectorBase {
 public:
  // `stream` is the second value handed to CameraAPI::PrepareStream (after the camera's
  // video type). With a buffer the records come from it and no stream is opened.
  IPuxEID(Camera* camera, CameraAPI* api, int stream, StreamBuffer* buffer);
  ~IPuxEID() override;

  // input := bit 0 of byte 27 when the record is longer than 28 bytes, else false.
  void QueryCamera(char* record, int length, bool& input);
  // Reads the next record of reader: 0 with the reading, -1 (false) when no part could be
  // read (its body is skipped; the reader is kept).
  int DoEID(MultipartFetch* reader, bool& input);
  int EventDetecor() override;

 private:
  Camera* camera_;        // not owned
  CameraAPI* api_;        // not owned
  int stream_;            // second PrepareStream value
  StreamBuffer* buffer_;  // not owned; null: records come from the camera's stream
};

#endif  // EVWATCH_DETECTORS_IPUX_H_
