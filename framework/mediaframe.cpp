#include "framework/mediaframe.h"

#include <chrono>
#include <thread>

#include "framework/detector.h"
#include "framework/host/fetcher.h"
#include "framework/host/streambuffer.h"

namespace {

const int kHeaderSize = 128;  // part-header scratch buffer handed to the fetcher
const int kBackOffSeconds = 5;

}  // namespace

char* UnitFrame(const StreamBuffer& buffer, const DataUnit& unit, int* length) {
  if (unit.skip > unit.length || unit.length > buffer.SlotCapacity()) return nullptr;
  *length = static_cast<int>(unit.FrameLength());
  // The detectors only read the frame; their interfaces take it unqualified.
  return const_cast<char*>(unit.Frame());
}

int ReadFrameLength(FetcherBase* fetcher, int* length) {
  if (fetcher == nullptr || length == nullptr) return -1;
  char header[kHeaderSize];
  return fetcher->ReadPartHeader(length, header, kHeaderSize) == 0 ? 0 : -1;
}

int ReadFrameBody(FetcherBase* fetcher, char* buffer, int length) {
  if (fetcher == nullptr) return -1;
  if (buffer == nullptr || length <= 0) {
    fetcher->SkipContent(buffer, length);
    return -1;
  }
  return fetcher->ReadPartBody(buffer, length) == 0 ? 0 : -1;
}

void BackOffMediaStream(DetectorBase& detector) {
  for (int i = 0; i < kBackOffSeconds && detector.IsStarted() == 1; ++i) {
    std::this_thread::sleep_for(std::chrono::seconds(1));
  }
}
