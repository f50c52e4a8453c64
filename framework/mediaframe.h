// Where the media-borne detectors get a frame: the payload of a frame-buffer unit, checked
// against its slot, and the two reads of a frame from a part stream. Written once for every
// detector that reads frames.
//
// Threads: the functions keep no state; the buffer, unit and fetcher belong to the caller.

#ifndef EVWATCH_FRAMEWORK_MEDIAFRAME_H_
#define EVWATCH_FRAMEWORK_MEDIAFRAME_H_

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

#endif  // EVWATCH_FRAMEWORK_MEDIAFRAME_H_
