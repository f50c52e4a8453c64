// COMPRO network cameras. /cgi-bin/view/list_param.cgi?Action=List&Group=MotionDetect lists
// the motion-detection group as Name:value lines; the first, Region, names the regions that
// see motion now ("Region:0" while region 0 does, "Region:none" while none does).

#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

constexpr char kListPath[] = "/cgi-bin/view/list_param.cgi";
constexpr char kListQuery[] = "Action=List&Group=MotionDetect";

std::string MotionList(const CameraStatus& status) {
  std::string body = "Region:" + std::string(status.motion > 0 ? "0" : "none") + "\r\n";
  body +=
      "Enable:1\r\n"
      "Sensitivity:80\r\n"
      "Window0:0,0,640,480\r\n";
  return body;
}

void HandleCompro(HttpConnection& connection, CameraState& state) {
  if (!ServesGetOf(connection, kListPath)) return;
  const HttpRequest& request = connection.Request();
  if (request.target != std::string(kListPath) + "?" + kListQuery) {
    connection.Write(MakeResponse(400, "text/plain", "unknown group\r\n"));
    return;
  }
  connection.Write(MakeResponse(200, "text/plain", MotionList(state.Get())));
}

}  // namespace

Emulation ComproEmulation() {
  return MakeEmulation("compro", "COMPRO", HandleCompro,
                       {
                           {"COMPROMD", "motion", nullptr},
                       });
}

}  // namespace evsim
