// Detectors of cameras that put their event state into the header extension of the RTP
// packets of their video stream: RtpHdrDetector opens its own RTP session to the camera
// (RtpFetch, on the stream path that the camera API gives for the camera's video type), takes
// the extension data of each packet and hands it to the maker's IsEventDetected: VivotekMp4MD
// (Vivotek MPEG-4). One report per packet with extension data, at frame pace (16 ms); a packet
// without extension is followed by a one-second pause and no report; a failed or missing
// stream is reported as a reading of the last extension data, or (false, 0) after a back-off
// of up to 5 s when there has been none.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor and owns the RtpFetch. The Camera and CameraAPI are the host's and must
// outlive the detector's run. DoED, GetExtDataLen and FetchExtData keep no state.

#ifndef EVWATCH_DETECTORS_MEDIA_RTPHDRDETECTOR_H_
#define EVWATCH_DETECTORS_MEDIA_RTPHDRDETECTOR_H_

#include <string>

#include "framework/detector.h"
#include "framework/host/hosttypes.h"

class Camera;
class CameraAPI;
class RtpFetch;

class RtpHdrDetector : public DetectorBase {
 public:
  // clientName goes unchanged to every RtpFetch (it is the session's User-Agent). Both
  // pointers are required: without either the loop reports (false, 0) once and ends.
  RtpHdrDetector(Camera* camera, CameraAPI* api, std::string clientName);

  int EventDetecor() override;

  // The next packet's extension length into length: 0, or -1 when the read fails or the
  // reader is null (length is then left as it was).
  int GetExtDataLen(RtpFetch* fetch, unsigned int& length);
  // Copies length bytes of the current packet's extension into buffer: 0, or -1 on
  // failure. With no buffer or a length of 0 the packet is skipped and the result is -1;
  // a null reader gives -1.
  int FetchExtData(RtpFetch* fetch, char* buffer, unsigned int length);
  // The subclass's verdict on `length` bytes of extension data.
  bool DoED(char* data, unsigned int length, unsigned int& level);

  virtual bool IsEventDetected(char* data, unsigned int length, unsigned int& level) = 0;

 private:
  Camera* camera_;                // not owned; required
  CameraAPI* api_;                // not owned; required
  const std::string client_name_;
};

// Vivotek MPEG-4: the record after the tag "mp4v" (and a zero byte one further): valid and
// trigger bits and a 7-bit level (0..127). The function group is kept but reads the same.
class VivotekMp4MD : public RtpHdrDetector {
 public:
  VivotekMp4MD(Camera* camera, CameraAPI* api, VIVO_FUNC_GR group);
  ~VivotekMp4MD() override;

  bool IsEventDetected(char* data, unsigned int length, unsigned int& level) override;

 private:
  VIVO_FUNC_GR group_;  // as configured; the MPEG-4 record has one form
};

#endif  // EVWATCH_DETECTORS_MEDIA_RTPHDRDETECTOR_H_
