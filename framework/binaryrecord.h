// A status record that a camera CGI answers as a fixed number of binary bytes, the request
// form of the Y-cam and Sanyo modules. Called from detector threads, several at once; each
// call uses only its own client.

#ifndef EVWATCH_FRAMEWORK_BINARYRECORD_H_
#define EVWATCH_FRAMEWORK_BINARYRECORD_H_

#include <string>

class Camera;

// GETs path (time-out 10 s) and reads `size` bytes of an application/octet-stream answer
// into record. 0 on success; -1 on any failure, a different media type or fewer bytes.
int GetBinaryRecord(Camera* camera, const std::string& path, unsigned char* record, int size);

#endif  // EVWATCH_FRAMEWORK_BINARYRECORD_H_
