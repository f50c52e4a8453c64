// Detectors of cameras that put their event state into a marker segment of every JPEG frame:
// JpgHdrDetector reads frames, from the host's frame buffer (buffer mode) or from the
// camera's motion-JPEG stream (stream mode, when no buffer is given), lets libjpeg parse each
// frame's header keeping one marker's segments, and hands the first saved segment to the
// maker's IsEventDetected: PanaJpgED (Panasonic COM, motion or inputs), VivotekJpgMD
// (Vivotek APP0 or APP2) and JVCJpgMD (JVC COM). One report per pass, at frame pace (16 ms).
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor. The Camera, CameraAPI and StreamBuffer are the host's and must outlive
// the detector's run. DoED, GetImageLen and FetchImage keep no state and may be called from
// any thread.

#ifndef EVWATCH_DETECTORS_MEDIA_JPGHDRDETECTOR_H_
#define EVWATCH_DETECTORS_MEDIA_JPGHDRDETECTOR_H_

#include "framework/detector.h"
#include "framework/host/hosttypes.h"

class Camera;
class CameraAPI;
class FetcherBase;
class StreamBuffer;

class JpgHdrDetector : public DetectorBase {
 public:
  // markerCode: the marker whose saved segment carries the event data (0xFE COM, 0xE0 APP0,
  // 0xE2 APP2). A null buffer selects stream mode, which needs the camera API.
  JpgHdrDetector(Camera* camera, StreamBuffer* buffer, CameraAPI* api, int markerCode);

  int EventDetecor() override;

  // Parses the header of the `length`-byte frame at `data` and returns the subclass's
  // verdict on the first saved segment of the marker; false for a missing frame, a frame
  // without such a segment, or one the library rejects. `level` is written only by the
  // subclass. libjpeg prints nothing and keeps nothing after the call.
  bool DoED(char* data, int length, unsigned int& level);
  // Reads the next frame's part header; *length gets the body length. 0, or -1 on failure
  // or a null argument.
  int GetImageLen(FetcherBase* fetcher, int* length);
  // Reads `length` body bytes into buffer: 0, or -1 when the read fails. With no buffer or
  // a length below 1 the body is skipped and the result is -1; a null fetcher gives -1.
  int FetchImage(FetcherBase* fetcher, char* buffer, int length);

  // The verdict on one saved segment: `data` is the segment's payload after its length
  // field, `length` the bytes that the library saved.
  virtual bool IsEventDetected(char* data, unsigned int length, unsigned int& level) = 0;

 private:
  Camera* camera_;        // not owned; required
  StreamBuffer* buffer_;  // not owned; null selects stream mode
  CameraAPI* api_;        // not owned; required in stream mode
  int marker_code_;       // marker whose segments are saved and judged
};

// Panasonic: COM segment. Motion: byte 12 < byte 13, level byte 13 x 5 (at most 100).
// Inputs (level 1): group 0 active on bit 7 of byte 0; group 1 active unless bits 7 and 6
// of byte 0 are both set. Always stream mode.
class PanaJpgED : public JpgHdrDetector {
 public:
  PanaJpgED(Camera* camera, CameraAPI* api, EVENT_DET_TYPE type, PANA_FUNC_GR group);
  ~PanaJpgED() override;

  bool IsEventDetected(char* data, unsigned int length, unsigned int& level) override;

 private:
  EVENT_DET_TYPE type_;  // motion or input
  PANA_FUNC_GR group_;   // input-bit layout
};

// Vivotek: group 0 reads the APP0 record (motion on bit 0 of byte 6, level from byte 7),
// any other group the APP2 record after the tag "jpeg" (valid and trigger bits, 7-bit
// level).
class VivotekJpgMD : public JpgHdrDetector {
 public:
  VivotekJpgMD(Camera* camera, StreamBuffer* buffer, CameraAPI* api, VIVO_FUNC_GR group);
  ~VivotekJpgMD() override;

  bool IsEventDetected(char* data, unsigned int length, unsigned int& level) override;

 private:
  VIVO_FUNC_GR group_;  // which record form the frames carry
};

// JVC: COM segment whose byte 233 is '1' while there is motion (level 100).
class JVCJpgMD : public JpgHdrDetector {
 public:
  JVCJpgMD(Camera* camera, StreamBuffer* buffer, CameraAPI* api);
  ~JVCJpgMD() override;

  bool IsEventDetected(char* data, unsigned int length, unsigned int& level) override;
};

#endif  // EVWATCH_DETECTORS_MEDIA_JPGHDRDETECTOR_H_
