#include "framework/binaryrecord.h"

#include "framework/host/httpclient.h"
#include "framework/httpreq.h"

namespace {

const int kTimeout = 10;

}  // namespace

int GetBinaryRecord(Camera* camera, const std::string& path, unsigned char* record, int size) {
  CgiRequest request(camera, path, kTimeout);
  if (!request.ContentTypeIs("application/octet-stream")) return -1;
  const int read = request.Client().ReadData(reinterpret_cast<char*>(record), size);
  return read < size ? -1 : 0;
}
