#include "apps/evwatch/registry.h"

#include <algorithm>
#include <cctype>
#include <type_traits>

#include "detectors/acti/actidetector.h"
#include "detectors/airlive.h"
#include "detectors/arecont.h"
#include "detectors/avipc.h"
#include "detectors/axis.h"
#include "detectors/brickcom.h"
#include "detectors/canon.h"
#include "detectors/compro.h"
#include "detectors/dlink.h"
#include "detectors/edimax.h"
#include "detectors/etrovision.h"
#include "detectors/hikvision.h"
#include "detectors/ipux.h"
#include "detectors/iqeye.h"
#include "detectors/jvc.h"
#include "detectors/levelone.h"
#include "detectors/panasonic.h"
#include "detectors/pixord.h"
#include "detectors/media/jpegmd.h"
#include "detectors/media/jpghdrdetector.h"
#include "detectors/media/rtphdrdetector.h"
#include "detectors/messoa.h"
#include "detectors/messoapro.h"
#include "detectors/mobotix.h"
#include "detectors/onvif.h"
#include "detectors/psia.h"
#include "detectors/sanyo.h"
#include "detectors/sony.h"
#include "detectors/storage.h"
#include "detectors/vivotek.h"
#include "detectors/ycam.h"
#include "detectors/zavio.h"
#include "framework/host/camera.h"
#include "framework/host/cameraapi.h"
#include "framework/host/hosttypes.h"
#include "framework/host/streambuffer.h"

namespace evwatch {
namespace {

// Constructor argument kinds. Each names the configuration field that supplies it, how the
// constructor's signature shows it, and where its value comes from.
struct Cam {
  static constexpr unsigned kField = 0;
  static constexpr const char* kText = "Camera*";
  static Camera* Get(const DetectorArgs& a) { return a.camera; }
};
struct Api {
  static constexpr unsigned kField = kFieldApi;
  static constexpr const char* kText = "CameraAPI*";
  static CameraAPI* Get(const DetectorArgs& a) { return a.api; }
};
struct Buf {
  static constexpr unsigned kField = kFieldStreamBuffer;
  static constexpr const char* kText = "StreamBuffer*";
  static StreamBuffer* Get(const DetectorArgs& a) { return a.stream_buffer; }
};
struct Inputs {
  static constexpr unsigned kField = kFieldInputs;
  static constexpr const char* kText = "int";
  static int Get(const DetectorArgs& a) { return a.inputs; }
};
// An input count: the class watches inputs 1..N (or 0..N-1), so a count of 0 or below
// watches none.
struct InputCount : Inputs {};
struct VivoGroup {
  static constexpr unsigned kField = kFieldFunctionGroup;
  static constexpr const char* kText = "VIVO_FUNC_GR";
  static VIVO_FUNC_GR Get(const DetectorArgs& a) { return static_cast<VIVO_FUNC_GR>(a.function_group); }
};
struct PanaGroup {
  static constexpr unsigned kField = kFieldFunctionGroup;
  static constexpr const char* kText = "PANA_FUNC_GR";
  static PANA_FUNC_GR Get(const DetectorArgs& a) { return static_cast<PANA_FUNC_GR>(a.function_group); }
};
struct DetType {
  static constexpr unsigned kField = kFieldType;
  static constexpr const char* kText = "EVENT_DET_TYPE";
  static EVENT_DET_TYPE Get(const DetectorArgs& a) { return static_cast<EVENT_DET_TYPE>(a.type); }
};

// One registry row. The argument kinds give the constructor call, its shown signature and
// the fields it takes all at once, so the three cannot disagree.
template <class T, class... Args>
DetectorClass Row(const char* name, const char* maker, DetectorKind kind, const char* how) {
  std::string signature = std::string(name) + "(";
  const char* texts[] = {Args::kText...};
  for (size_t i = 0; i < sizeof...(Args); ++i) signature += (i ? ", " : "") + std::string(texts[i]);
  signature += ")";
  return DetectorClass{name, maker, kind, signature, (0u | ... | Args::kField), how,
                       [](const DetectorArgs& a) -> std::unique_ptr<EventDetector> {
                         return std::make_unique<T>(Args::Get(a)...);
                       },
                       (false || ... || std::is_same_v<Args, InputCount>)};
}

}  // namespace

const char* KindName(DetectorKind kind) {
  switch (kind) {
    case DetectorKind::kMotion: return "motion";
    case DetectorKind::kInput: return "input";
    case DetectorKind::kInputLevel: return "input (level)";
    case DetectorKind::kBoth: return "motion+input";
    case DetectorKind::kBothLevel: return "motion+input (level)";
  }
  return "?";
}

const std::vector<DetectorClass>& DetectorClasses() {
  using K = DetectorKind;
  static const std::vector<DetectorClass> table = {
      Row<ACTiEID, Cam, InputCount>("ACTiEID", "ACTi", K::kInput,
                                "GET /cgi-bin/cmd/mpeg4?DIO_STATUS once a second; active while "
                                "bit N of the hex value (two lowest bits) is 0"),
      Row<ACTiMD, Cam>("ACTiMD", "ACTi", K::kMotion,
                       "binary control connection to the port that /cgi-bin/cmd/system?"
                       "PORT_CONTROL gives; motion for each motion record (type 65593)"),
      Row<AIRLIVEV1EID, Cam, InputCount>("AIRLIVEV1EID", "AirLive", K::kInput,
                                     "GET /io/input.cgi?checkactive=N once a second for N = 1.."
                                     "inputs, up to the first line inputN=active"),
      Row<AirliveV1MD, Cam>("AirliveV1MD", "AirLive", K::kMotion,
                            "motion data pushed at /motion/motiondata.cgi; motion while a line "
                            "group=N;level=L;threshold=T; has L > T"),
      Row<JpegDiffMD, Cam, Buf, Api>("JpegDiffMD", "Any", K::kMotion,
                                     "JPEG frames of the frame buffer (attached from shared memory "
                                     "by the camera's id when not given), compared by the motion "
                                     "engine at the bound interval; level: % of the watched area "
                                     "that changed"),
      Row<ARECONTMD, Cam, Api>("ARECONTMD", "Arecont", K::kMotion,
                               "GET the API's stream path (on the camera's port) once a second; "
                               "motion while the answer's mdresult does not contain \"no\""),
      Row<AVIPCEID, Cam, InputCount>("AVIPCEID", "AVIPC", K::kInput,
                                 "GET /cgi-bin/io/input.cgi?checkactive=N once a second for N = "
                                 "1..inputs, up to the first line inputN=active"),
      Row<AvipcMD, Cam, Api>("AvipcMD", "AVIPC", K::kMotion,
                             "motion data pushed at the API's stream path; motion while a line "
                             "group=G;level=L;threshold=T; has L > T"),
      Row<AXISEID, Cam, InputCount>("AXISEID", "Axis", K::kInput,
                                "GET /axis-cgi/io/input.cgi?checkactive=N once a second for N = "
                                "1..inputs, up to the first line inputN=active"),
      Row<AxisMD, Cam, Api>("AxisMD", "Axis", K::kMotion,
                            "motion data pushed at the API's stream path; motion while a line "
                            "group=G;level=L;threshold=T; has L > T"),
      Row<BrickcomEID, Cam, Api, InputCount>("BrickcomEID", "Brickcom", K::kInput,
                                         "GET /cgi-bin/gpio.cgi?action=get on the camera's port for "
                                         "di1.status, di2.status, ... up to the first that reads 0 "
                                         "(active); passes back to back, no pacing timer"),
      Row<CanonMD, Cam>("CanonMD", "Canon", K::kMotion,
                        "GET /-wvhttp-01-/info.cgi once a second; motion while a line says m.1:=1"),
      Row<CanonEID, Cam, Inputs>("CanonEID", "Canon", K::kInput,
                                 "GET /-wvhttp-01-/info.cgi once a second; active while any line "
                                 "i.N:=1 (N >= 1)"),
      Row<COMPROMD, Cam>("COMPROMD", "COMPRO", K::kMotion,
                         "GET /cgi-bin/view/list_param.cgi?Action=List&Group=MotionDetect once a "
                         "second; motion while the first line begins Region:0"),
      Row<DLinkMD, Cam>("DLinkMD", "D-Link", K::kMotion,
                        "GET /config/notify.cgi once per interval; motion while md1=on, level "
                        "the camera's mdv1 value"),
      Row<DLINKEID, Cam, InputCount>("DLINKEID", "D-Link", K::kInput,
                                 "GET /config/notify.cgi once a second per input N = 1..inputs, "
                                 "up to the first whose line says inputN=on"),
      Row<EDIMAXMD, Cam, Api>("EDIMAXMD", "Edimax", K::kMotion,
                              "event stream at the API's stream path on the camera's own port; "
                              "motion (level 100) while a part's header lines say "
                              "motion-event: 1"),
      Row<ETROVISIONMD, Cam, Api>("ETROVISIONMD", "Etrovision", K::kMotion,
                                  "event stream at the API's stream path and port; motion (level "
                                  "100) while a line begins md1=on (any case)"),
      Row<ETROVISIONEID, Cam, Api, Inputs>("ETROVISIONEID", "Etrovision", K::kInput,
                                           "event stream at the API's stream path and port; "
                                           "active while a line inputN=on has N <= inputs"),
      Row<HikVisionMD, Cam>("HikVisionMD", "HikVision", K::kMotion,
                            "alert stream /Event/notification/alertStream, every fourth record; "
                            "motion when a VMD record's activePostCount changed"),
      Row<HikVisionEID, Cam, Inputs>("HikVisionEID", "HikVision", K::kInput,
                                     "alert stream /Event/notification/alertStream, every fourth "
                                     "record; active when an IO record says eventState active"),
      Row<IPuxEID, Cam, Api, Inputs, Buf>("IPuxEID", "IPux", K::kInput,
                                          "status records pushed at the API's stream (video "
                                          "type, inputs), or from the frame buffer, one per 16 ms "
                                          "pass; active while bit 0 of byte 27 is set"),
      Row<IPuxMD, Cam, Api, Buf>("IPuxMD", "IPux", K::kMotion,
                                 "status records pushed at the API's stream (video type, 2), or "
                                 "from the frame buffer, one per 16 ms pass; motion while the "
                                 "level of byte 24 exceeds the API's threshold"),
      Row<IQeyeV1MD, Cam>("IQeyeV1MD", "IQeye", K::kMotion,
                          "server push at /now.jpg?snap=spush&pragma=motion; motion while the "
                          "Pragma: trigger= line after a picture names motion"),
      Row<IQeyeV2EID, Cam, Inputs>("IQeyeV2EID", "IQeye", K::kInput,
                                   "server push at /now.jpg?snap=spush&pragma=trigger&noimage, "
                                   "one part a second; active while the Pragma: trigger= line "
                                   "names an input (any input)"),
      Row<IQeyeV2MD, Cam>("IQeyeV2MD", "IQeye", K::kMotion,
                          "motion data pushed at /now.motiondata; motion while a line "
                          "window=N;level=L;threshold=T has L > T"),
      Row<JVCEID, Cam, Inputs>("JVCEID", "JVC", K::kInput,
                               "GET /api/param?peripheral.input_pin.pin(N).status once a second "
                               "for N = 1..inputs, up to the first line ...=make&200"),
      Row<JVCJpgMD, Cam, Buf, Api>("JVCJpgMD", "JVC", K::kMotion,
                                   "JPEG frames of the API's stream (1, 2) or the frame buffer; "
                                   "motion while byte 233 of the COM segment is '1'"),
      Row<LevelOneGr2MD, Cam>("LevelOneGr2MD", "LevelOne", K::kMotion,
                              "GET /cgi-bin/admin/param?action=list&group=Motion, then one line "
                              "R1=..,R2=..,R3=.. from TCP port 19999, once per interval; motion "
                              "while an enabled window's reading exceeds its threshold"),
      Row<LevelOneGr1EID, Cam, Inputs>("LevelOneGr1EID", "LevelOne", K::kInput,
                                       "GET /io/query_io.cgi once per interval for each input N = "
                                       "1..inputs; the reading is the last input's line "
                                       "input_N=1"),
      Row<MessoaMD, Cam>("MessoaMD", "Messoa", K::kMotion,
                          "GET /cgi-bin/admin/param.cgi?type=Get&group=AlarmStatus once per "
                          "interval; motion while Mode (after the [section] line) is 2 or 3"),
      Row<MessoaEID, Cam, Inputs>("MessoaEID", "Messoa", K::kInput,
                                  "GET /cgi-bin/admin/param.cgi?type=Get&group=AlarmStatus once "
                                  "per interval; active while Mode (after the [section] line) is "
                                  "1 or 3"),
      Row<MessoaProMD, Cam, Api>("MessoaProMD", "MessoaPro", K::kMotion,
                                 "GET the API's stream path and port once per interval; motion "
                                 "while the answer's Alarm.Status is 2 or 3"),
      Row<MessoaProEID, Cam, Api, Inputs>("MessoaProEID", "MessoaPro", K::kInput,
                                          "GET the API's stream path and port once per interval; "
                                          "active while Alarm.Status is 1 or 3 (inputs unused)"),
      Row<MobotixMD, Cam, DetType>("MobotixMD", "Mobotix", K::kBothLevel,
                                   "GET /control/event.jpg?output=alarmupdate&filter=VM (type 0) "
                                   "or filter=SI (type 1) once per interval; an event while the "
                                   "first line's alarmcounter moved since the last reading"),
      Row<OnvifMD, Cam>("OnvifMD", "ONVIF", K::kMotion,
                        "POST /onvif/device_service and the event service it names: a pull-point "
                        "subscription read as a long poll; motion (level 100) while "
                        "CellMotionDetector IsMotion or MotionAlarm State of video source GetCH()"),
      Row<OnvifEID, Cam, Inputs>("OnvifEID", "ONVIF", K::kInput,
                                 "as OnvifMD; active while DigitalInput LogicalState of input "
                                 "number `inputs` (the camera's Nth input token) is true"),
      Row<PanaJpgED, Cam, Api, DetType, PanaGroup>(
          "PanaJpgED", "Panasonic", K::kBoth,
          "JPEG frames of the API's stream (1, 2); COM segment: motion while byte 12 < byte 13 "
          "(level byte 13 x 5), inputs from bits 7 and 6 of byte 0 by function group"),
      Row<PanaMD, Cam, Api>("PanaMD", "Panasonic", K::kMotion,
                            "status lines pushed at the API's stream (time-out 20 s); motion "
                            "(level 100) while a line says motiondetect T (channel 1) or "
                            "motiondetect chNT (channel N)"),
      Row<PanaEID, Cam, Api, Inputs>("PanaEID", "Panasonic", K::kInput,
                                     "status lines pushed at the API's stream (time-out 20 s; "
                                     "without one, an empty path on port 80); active while a "
                                     "line terminalN I L has N in 1..inputs"),
      Row<PIXORDMD, Cam, Api>("PIXORDMD", "Pixord", K::kMotion,
                              "motion data pushed at the API's stream path; motion while a line "
                              "group=G;level=L;sensitivity=S; has L > the API's threshold "
                              "(md_params, second value, read at start; signed)"),
      Row<PIXORDEID, Cam, Inputs>("PIXORDEID", "Pixord", K::kInput,
                                  "GET /cgi-bin/admin/sm.cgi?actions=listgroup&Input once a "
                                  "second per input N = 0..inputs-1, up to the first line "
                                  "Input.I0N.Status=high"),
      Row<PSIAMD, Cam>("PSIAMD", "PSIA", K::kMotion,
                       "alert stream /PSIA/Custom/Event/notification/alertStream, every fourth "
                       "record; motion when a VMD record's activePostCount changed"),
      Row<PSIAEID, Cam, Inputs>("PSIAEID", "PSIA", K::kInput,
                                "alert stream /PSIA/Custom/Event/notification/alertStream, every "
                                "fourth record; active when an IO record says eventState active"),
      Row<SanyoMD, Cam, Api>("SanyoMD", "Sanyo", K::kMotion,
                             "GET the API's stream path once a second: a 48-byte status record; "
                             "motion while bit 1 of byte 34 is set"),
      Row<SanyoEID, Cam, Api, InputCount>("SanyoEID", "Sanyo", K::kInputLevel,
                                      "GET the API's stream path once a second: a 48-byte status "
                                      "record; active (level 100) while a bit 0..inputs-1 of byte "
                                      "33 is set"),
      Row<SONYMD, Cam>("SONYMD", "Sony", K::kMotion,
                       "alarm data pushed at /command/alarmdata.cgi?interval=1; motion (level "
                       "100) while a line OdWinN=V has the value 1"),
      Row<SONYEID, Cam, Inputs>("SONYEID", "Sony", K::kInput,
                                "alarm data pushed at /command/alarmdata.cgi?interval=1, one "
                                "part a second; active while a line SensorN=1 has N <= inputs"),
      Row<StorageMD, Cam, Api>("StorageMD", "Storage", K::kMotion,
                               "GET the API's stream path and port once per interval; motion "
                               "while the answer's alarm_status (its first ';' dropped) is 1 or 3"),
      Row<StorageEID, Cam, Api, Inputs>("StorageEID", "Storage", K::kInput,
                                        "GET the API's stream path and port once per interval; "
                                        "active while alarm_status is 2 or 3 (inputs unused)"),
      Row<VivotekEID, Cam, VivoGroup, Inputs>(
          "VivotekEID", "Vivotek", K::kInput,
          "GET /cgi-bin/getdi.cgi?diN for N = 1..inputs (function group 0, 1; line DIN=H) or "
          "/cgi-bin/dido/getdi.cgi?diN for N = 0..inputs-1 (2, 3; line diN=1) once per interval, "
          "up to the first active input; other groups fail"),
      Row<VivotekJpgMD, Cam, Buf, Api, VivoGroup>(
          "VivotekJpgMD", "Vivotek", K::kMotion,
          "JPEG frames of the API's stream (1, 2) or the frame buffer; motion flag and level in "
          "the APP0 record (function group 0) or the APP2 record after \"jpeg\" (other groups)"),
      Row<VivotekMp4MD, Cam, Api, VivoGroup>(
          "VivotekMp4MD", "Vivotek", K::kMotion,
          "RTP header extensions of the API's stream (video type, 1) over RTSP, for a camera of "
          "stream type 1; motion flag and 7-bit level in the record after \"mp4v\""),
      Row<YCAMMD, Cam>("YCAMMD", "Y-cam", K::kMotion,
                       "GET /stream.arm once per interval: 8 bytes, four area levels and their "
                       "flags; level the largest up to the first flagged area"),
      Row<ZavioEID, Cam, InputCount>("ZavioEID", "Zavio", K::kInput,
                                 "GET /cgi-bin/admin/input?checkactive=N once a second for N = "
                                 "1..inputs, up to the first line inputN=active"),
      Row<ZavioMD, Cam, Api>("ZavioMD", "Zavio", K::kMotion,
                             "motion data pushed at the API's stream path; motion while a line "
                             "group=G;level=L;threshold=T; has L > T (API zaviovga: level / 10)"),
  };
  return table;
}

const DetectorClass* FindDetectorClass(std::string_view name) {
  for (const DetectorClass& c : DetectorClasses()) {
    if (c.name == name) return &c;
  }
  return nullptr;
}

int EditDistance(std::string_view a, std::string_view b) {
  // Optimal string alignment: insertions, deletions, substitutions and swaps of two
  // neighbours (the commonest typo) each cost one.
  auto same = [](char x, char y) {
    return std::tolower(static_cast<unsigned char>(x)) == std::tolower(static_cast<unsigned char>(y));
  };
  const size_t n = a.size(), m = b.size();
  std::vector<std::vector<int>> d(n + 1, std::vector<int>(m + 1));
  for (size_t i = 0; i <= n; ++i) d[i][0] = static_cast<int>(i);
  for (size_t j = 0; j <= m; ++j) d[0][j] = static_cast<int>(j);
  for (size_t i = 1; i <= n; ++i) {
    for (size_t j = 1; j <= m; ++j) {
      d[i][j] = std::min({d[i - 1][j] + 1, d[i][j - 1] + 1, d[i - 1][j - 1] + (same(a[i - 1], b[j - 1]) ? 0 : 1)});
      if (i > 1 && j > 1 && same(a[i - 1], b[j - 2]) && same(a[i - 2], b[j - 1])) {
        d[i][j] = std::min(d[i][j], d[i - 2][j - 2] + 1);
      }
    }
  }
  return d[n][m];
}

std::string NearestName(std::string_view name, const std::vector<std::string>& candidates) {
  std::string best;
  int best_distance = 0;
  for (const std::string& c : candidates) {
    int d = EditDistance(name, c);
    if (best.empty() || d < best_distance) {
      best = c;
      best_distance = d;
    }
  }
  return best;
}

}  // namespace evwatch
