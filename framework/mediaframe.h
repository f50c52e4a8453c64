// Where the media-borne detectors get a frame: the payload of a frame-buffer unit, checked
// against its slot, the two reads of a frame from a part stream, and the pace and back-off of
// the detectors that read media. Written once for every detector that reads frames.
//
// Threads: the functions keep no state; the buffer, unit and fetcher belong to the caller.
// BackOffMediaStream runs on the detector's worker thread.

#ifndef EVWATCH_FRAMEWORK_MEDIAFRAME_H_
#define EVWATCH_FRAMEWORK_MEDIAFRAME_H_

class DetectorBase;
class FetcherBase;
class StreamBuffer;
struct DataUnit;

// The frame of a unit that `buffer` returned, and its length in *length; null when the
// unit's record does not fit its slot (the buffer may be shared with other processes, so
// its record is checked, not trusted). The frame stays valid until the unit is released.
char* UnitFrame(const StreamBuffer& buffer, const DataUnit& unit, int* length);

// Reads the next frame's part header; *length gets the body length. 0, or -1 on failure or
// a null argument.
int ReadFrameLength(FetcherBase* fetcher, int* length);
// Reads `length` body bytes into buffer: 0, or -1 when the read fails. With no buffer or a
// length below 1 the body is skipped and the result is -1; a null fetcher gives -1.
int ReadFrameBody(FetcherBase* fetcher, char* buffer, int length);

// The pace of the detectors that read a camera's media, in microseconds: frame pace, not
// the one-second pace of the polled detectors.
inline constexpr int kMediaPeriod = 16000;

// Gives a camera that refused or dropped its stream time before the next attempt: up to
// five one-second sleeps, ending early once the detector is stopped.
void BackOffMediaStream(DetectorBase& detector);

#endif  // EVWATCH_FRAMEWORK_MEDIAFRAME_H_
