// Axis network cameras and those of the makers that copied their interface (AVIPC, AirLive,
// Zavio). The digital inputs are asked one at a time at <input CGI>?checkactive=N, answered
// with one line inputN=active or inputN=inactive. Motion data is pushed as a multipart
// stream: a part every 200 ms with a line "group=G;level=L;threshold=T;" per window.
//
// The makers differ only in their paths, the media type of the input answer, whether the
// camera's API names the motion stream (AirLive's is at a fixed path on the camera's own
// port) and, for Zavio's VGA model (API "zaviovga"), levels counted from 0 to 1000.

#include "sim/emulation.h"
#include "sim/makers/inputquery.h"
#include "sim/makers/motionpush.h"

namespace evsim {
namespace {

struct FamilyMaker {
  const char* key;
  const char* maker;
  const char* input_class;
  const char* motion_class;
  const char* input_path;
  const char* input_type;  // media type of the input answer
  const char* motion_path;
  bool api_names_stream;   // false: the stream is at motion_path on the camera's port
  const char* api_name;    // the API's name, "" for none
  int scale;               // camera level per percent of motion
};

constexpr FamilyMaker kAxis{
    "axis", "Axis", "AXISEID", "AxisMD", "/axis-cgi/io/input.cgi", "text/plain",
    "/axis-cgi/motion/motiondata.cgi", true, "", 1};
constexpr FamilyMaker kAvipc{
    "avipc", "AVIPC", "AVIPCEID", "AvipcMD", "/cgi-bin/io/input.cgi", "text/plain",
    "/cgi-bin/motion/motiondata.cgi", true, "", 1};
constexpr FamilyMaker kAirLive{
    "airlive", "AirLive", "AIRLIVEV1EID", "AirliveV1MD", "/io/input.cgi", "text/html",
    "/motion/motiondata.cgi", false, "", 1};
constexpr FamilyMaker kZavio{
    "zavio", "Zavio", "ZavioEID", "ZavioMD", "/cgi-bin/admin/input", "text/html",
    "/cgi-bin/motion/motiondata.cgi", true, "zaviovga", 10};

Emulation FamilyEmulation(const FamilyMaker& m) {
  auto handle = [&m](HttpConnection& connection, CameraState& state) {
    MotionDataStyle style;
    style.line = GroupLine;
    style.scale = m.scale;
    if (ServeMotionDataAt(connection, state, m.motion_path, style)) return;
    if (AnswerInputQuery(connection, state, m.input_path, m.input_type)) return;
    AnswerNotFound(connection);
  };
  Emulation e = MakeEmulation(m.key, m.maker, handle,
                              {
                                  {m.input_class, "inputs", {{"inputs", 2}}},
                                  {m.motion_class, "motion", nullptr},
                              });
  if (m.api_names_stream) e.api = StreamApi(m.motion_path, m.api_name);
  return e;
}

}  // namespace

Emulation AxisEmulation() { return FamilyEmulation(kAxis); }
Emulation AVIPCEmulation() { return FamilyEmulation(kAvipc); }
Emulation AirLiveEmulation() { return FamilyEmulation(kAirLive); }
Emulation ZavioEmulation() { return FamilyEmulation(kZavio); }

}  // namespace evsim
