// MessoaPro cameras and the storage boxes of the StorageMD/StorageEID classes. Both answer
// their status CGI, whose path the device's API block names, with text entries
// "key=value", one a line, among which one alarm-status number: 3 while motion and input 1
// are both on, and one bit for each alone. The two differ in the key, in which bit stands
// for what (MessoaPro: 1 input, 2 motion; Storage: 1 motion, 2 input), and in the ";"
// that the boxes write after every value.

#include <string>

#include "sim/emulation.h"

namespace evsim {
namespace {

struct AlarmStatusMaker {
  const char* key;
  const char* maker;
  const char* motion_class;
  const char* input_class;
  const char* path;          // the status CGI, without its query
  const char* query;
  const char* status_key;
  int motion_bit;
  int input_bit;
  const char* value_end;     // written after every value
  const char* other_entry;   // an entry before the status, without its value end
};

constexpr AlarmStatusMaker kMessoaPro{
    "messoapro", "MessoaPro", "MessoaProMD", "MessoaProEID", "/cgi-bin/status.cgi", "group=Alarm",
    "Alarm.Status", 2, 1, "", "Alarm.Enable=1"};
constexpr AlarmStatusMaker kStorage{
    "storage", "Storage", "StorageMD", "StorageEID", "/cgi-bin/alarm.cgi", "action=status",
    "alarm_status", 1, 2, ";", "disk_status=ok"};

std::string StatusBody(const AlarmStatusMaker& m, const CameraStatus& status) {
  const int number = (status.motion > 0 ? m.motion_bit : 0) | (status.Input(1) ? m.input_bit : 0);
  return std::string(m.other_entry) + m.value_end + "\n" + m.status_key + "=" + std::to_string(number) +
         m.value_end + "\n";
}

Emulation AlarmStatusEmulation(const AlarmStatusMaker& m) {
  auto handle = [&m](HttpConnection& connection, CameraState& state) {
    if (!ServesGetOf(connection, m.path)) return;
    connection.Write(MakeResponse(200, "text/plain", StatusBody(m, state.Get())));
  };
  Emulation e = MakeEmulation(m.key, m.maker, handle,
                              {
                                  {m.motion_class, "motion", nullptr},
                                  {m.input_class, "input", {{"inputs", 1}}},
                              });
  e.api = StreamApi(std::string(m.path) + "?" + m.query);
  return e;
}

}  // namespace

Emulation MessoaProEmulation() { return AlarmStatusEmulation(kMessoaPro); }
Emulation StorageEmulation() { return AlarmStatusEmulation(kStorage); }

}  // namespace evsim
