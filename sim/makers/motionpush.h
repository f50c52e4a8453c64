// Motion data as the Axis family (Axis, AVIPC, Zavio, AirLive) and IQeye cameras push it: a
// multipart stream of text parts, one per period, each with one line per detection window
// giving the window's current level and its threshold. Window 0 follows the camera's motion
// level; window 1 watches a quiet corner and stays at 0. Each maker's emulation gives its
// own line format and scale.
//
// Threads: called on server connection threads, several at once; it only reads the state.

#ifndef EVWATCH_SIM_MAKERS_MOTIONPUSH_H_
#define EVWATCH_SIM_MAKERS_MOTIONPUSH_H_

#include <chrono>
#include <functional>
#include <string>
#include <string_view>

#include "sim/camstate.h"
#include "sim/net/httpserver.h"

namespace evsim {

struct MotionDataStyle {
  // One line without its line end, for window number `window` (0 or 1; a maker that
  // counts windows from 1 adds one).
  std::function<std::string(int window, int level, int threshold)> line;
  int scale = 1;       // camera level per percent of motion (10 for cameras counting to 1000)
  int threshold = 20;  // in percent
  std::chrono::milliseconds period{200};
};

// Serves the stream until the peer goes, the server stops or the camera falls silent (the
// stream then ends; the simulator holds later requests unanswered while it stays silent).
void ServeMotionData(HttpConnection& connection, const CameraState& state,
                     const MotionDataStyle& style);

// When the request is a GET of `path` (without its query), serves the stream as above and
// returns true; returns false, writing nothing, for any other request.
bool ServeMotionDataAt(HttpConnection& connection, const CameraState& state, std::string_view path,
                       const MotionDataStyle& style);

// The Axis-family line: "group=W;level=L;threshold=T;".
std::string GroupLine(int window, int level, int threshold);

}  // namespace evsim

#endif  // EVWATCH_SIM_MAKERS_MOTIONPUSH_H_
