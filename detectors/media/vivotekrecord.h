// The Vivotek event record that both of the maker's media forms carry (the APP2 segment of
// its JPEG frames and the RTP header extension of its MPEG-4 stream): a four-character tag;
// 15 bytes after the tag's start a record count; then the first record's valid bit, trigger
// bit and 7-bit level, most significant bit first. Written once for both detectors.
//
// Threads: a pure function.

#ifndef EVWATCH_DETECTORS_MEDIA_VIVOTEKRECORD_H_
#define EVWATCH_DETECTORS_MEDIA_VIVOTEKRECORD_H_

// Finds `tag` (four bytes) at the first start position from 0 to length - 5 (a tag that
// starts later is not found); with zeroAfterTag the byte at the tag's start + 5 must also
// be 0. Then reads the record: false when there is no tag, the count is 0 or the valid bit
// is clear; otherwise level gets the 7-bit level (0..127) and the result is the trigger bit.
// level is written only once the valid bit is found set. The record is not compared with
// the length, but bytes past `length` read as 0: a record cut short is read as far as it
// goes and never past the caller's buffer.
// REQUIRES: data holds at least length bytes.
bool ReadVivotekRecord(const unsigned char* data, unsigned int length, const char* tag,
                       bool zeroAfterTag, unsigned int& level);

#endif  // EVWATCH_DETECTORS_MEDIA_VIVOTEKRECORD_H_
