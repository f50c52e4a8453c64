// Software motion detection for cameras that report none: JpegDiffMD feeds the JPEG frames
// that the host holds for the camera (its StreamBuffer, attached from shared memory by the
// camera's id when none is given) to the host's motion engine through MD, a wrapper that
// fixes the engine's defaults and maps its results. Regions, sensitivity and threshold come
// from the camera's motion settings. One report per pass, at the bound interval.
//
// Threads: the host thread constructs, binds, starts, stops and deletes; the worker thread
// runs EventDetecor and is the only user of the engine while started. The Camera and the
// StreamBuffer are the host's and must outlive the detector's run.

#ifndef EVWATCH_DETECTORS_MEDIA_JPEGMD_H_
#define EVWATCH_DETECTORS_MEDIA_JPEGMD_H_

#include <memory>

#include "framework/detector.h"
#include "framework/host/mdengine.h"

class Camera;
class CameraAPI;
class FetcherBase;
class StreamBuffer;

// The engine functions MD calls. Tests hand MD their own table to watch the calls.
struct MDEngineCalls {
  int (*create)(MD_DETECTION*);
  int (*finish)(MD_DETECTION*);
  int (*set_sensitivity)(MD_DETECTION*, int);
  int (*set_threshold)(MD_DETECTION*, int);
  int (*enable_fast)(MD_DETECTION*, int);
  int (*set_range)(MD_DETECTION*, const MD_RECT*);
  int (*detect)(MD_DETECTION*, const char*, int, int*);
  int (*get_sensitivity)(MD_DETECTION*, int*);
  int (*get_threshold)(MD_DETECTION*, int*);
};

// The host's engine (framework/host/mdengine.h).
const MDEngineCalls& HostMDEngine();

class MD {
 public:
  // Sets the engine up with sensitivity 90, threshold 10 and fast mode on.
  MD();
  // The same with another engine. REQUIRES: calls outlives the object.
  explicit MD(const MDEngineCalls* calls);
  MD(const MD&) = delete;
  MD& operator=(const MD&) = delete;
  ~MD();

  // Adds one watched range. 0, or -1 when the engine refused it.
  int AddRect(_tag_MD_RECT& rect);
  // The range as top, left, right, bottom, 0: the first two arguments trade places.
  int AddRect(int left, int top, int right, int bottom);

  // The low 8 bits of the value go to the engine. 0, or -1 when the engine refused.
  int SetSensitivity(int sensitivity);
  int SetThreshold(int threshold);
  // 0, or -1 when the engine could not give the value.
  int GetSensitivity(int& sensitivity);
  int GetThreshold(int& threshold);

  // Judges the next frame: 3 for motion, 4 for none (also for a frame that became the
  // engine's reference); any other engine result is returned as it is, after the frame
  // sequence has been reset. Null data resets the sequence and gives 4. level is set to 0
  // first, then to the engine's level.
  int Detect(char* data, int length, int& level);

 private:
  void ResetSequence();

  const MDEngineCalls* calls_;  // never null
  MD_DETECTION state_;          // the engine's state, set up by the constructor
};

// Hands the camera's motion settings to the engine: its sensitivity and threshold, then its
// regions, or the whole frame when it has none. 0, or -1 when either argument is null.
int ApplyMotionConfig(Camera* camera, MD* engine);

class JpegDiffMD : public DetectorBase {
 public:
  // A null buffer makes the loop attach the camera's buffer from shared memory.
  JpegDiffMD(Camera* camera, StreamBuffer* buffer, CameraAPI* api);
  // The same on another engine (see MD). REQUIRES: engine outlives the detector.
  JpegDiffMD(Camera* camera, StreamBuffer* buffer, CameraAPI* api, const MDEngineCalls* engine);
  ~JpegDiffMD() override;

  // The engine's sensitivity or threshold; -1 when it cannot be read.
  int GetSensitivity();
  int GetThreshold();
  // MD::SetSensitivity / MD::SetThreshold.
  int SetSensitivity(int sensitivity);
  int SetThreshold(int threshold);

  // The frame reads of the stream-reading detectors (framework/mediaframe.h); this class's
  // loop reads the frame buffer instead.
  int GetImageLen(FetcherBase* fetcher, int* length);
  int FetchImage(FetcherBase* fetcher, char* buffer, int length);

  int EventDetecor() override;

 private:
  std::unique_ptr<MD> engine_;  // owned; lives as long as the detector
  Camera* camera_;              // not owned; required
  StreamBuffer* buffer_;        // not owned; null: attach the shared one per run
  CameraAPI* api_;              // not owned; kept, not used
};

#endif  // EVWATCH_DETECTORS_MEDIA_JPEGMD_H_
