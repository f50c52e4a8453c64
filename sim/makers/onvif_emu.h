// A device that announces its events through the standard event service: device service
// (clock, capabilities, services), event service (pull-point subscriptions) and the
// subscriptions themselves (PullMessages as a long poll, Renew, Unsubscribe), with a
// WS-Security UsernameToken password digest checked on every call but the clock's.
//
// Motion comes from the camera state as the cell motion detector's IsMotion, the video
// source's MotionAlarm State, or both; inputs 1..inputs as DigitalInput LogicalState of
// tokens "DigitalInput_1", ... Each new subscription first gets the Initialized message of
// every property, then a Changed message for each change.
//
// Threads: Handle runs on server connection threads, several at once; the test hooks may
// be called from any thread.

#ifndef EVWATCH_SIM_MAKERS_ONVIF_EMU_H_
#define EVWATCH_SIM_MAKERS_ONVIF_EMU_H_

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <map>
#include <mutex>
#include <string>
#include <vector>

#include "sim/camstate.h"
#include "sim/net/httpserver.h"

namespace evsim {

struct OnvifDeviceOptions {
  std::string user;            // empty: no UsernameToken asked for
  std::string password;
  int64_t clock_offset = 0;    // seconds the device's clock runs ahead of the true time
  bool cell_motion = true;     // announce RuleEngine/CellMotionDetector/Motion
  bool motion_alarm = false;   // announce VideoSource/MotionAlarm
  int inputs = 2;              // digital inputs announced
  // A second video source whose motion is always the opposite of the first's (a camera with
  // two sensors), to show which source a reading follows.
  bool second_source = false;
  bool capabilities = true;    // false: GetCapabilities fails (GetServices must be used)
  // Write answers with unusual namespace prefixes, declared deep in the message, and add a
  // decoy message whose "tns1" prefix names another namespace.
  bool unusual_prefixes = false;
  std::string padding;         // written into every PullMessagesResponse (large answers)
  // Serve every subscription at one path, told apart by a reference parameter that the
  // client must echo in its header.
  bool reference_parameters = false;
};

class OnvifDevice {
 public:
  static constexpr char kDevicePath[] = "/onvif/device_service";
  static constexpr char kEventPath[] = "/onvif/event_service";
  static constexpr char kPullPointPath[] = "/onvif/pullpoint";
  static constexpr size_t kKeptBodies = 256;

  // REQUIRES: state outlives the device.
  OnvifDevice(OnvifDeviceOptions options, CameraState* state);
  OnvifDevice(const OnvifDevice&) = delete;
  OnvifDevice& operator=(const OnvifDevice&) = delete;

  void Handle(HttpConnection& connection);

  // Forgets every subscription: their next call gets a fault.
  void DropSubscriptions();
  // Calls answered so far by operation name ("PullMessages", "Renew", ...), and calls
  // refused for a bad token.
  int Count(const std::string& operation) const;
  int Refused() const;
  int LiveSubscriptions() const;
  // The latest request bodies seen (at most kKeptBodies), in order.
  std::vector<std::string> Bodies() const;

 private:
  struct Subscription {
    std::chrono::steady_clock::time_point expires;
    bool initialized = false;                 // Initialized messages sent
    std::map<std::string, bool> sent;         // property -> last state sent
  };

  bool TokenValid(const std::string& body) const;
  std::string Time() const;
  void PullMessages(HttpConnection& connection, int id, const std::string& body);
  std::vector<std::pair<std::string, bool>> Properties() const;
  std::string Notification(const std::string& property, bool state, bool initialized) const;

  const OnvifDeviceOptions options_;
  CameraState* state_;
  mutable std::mutex mutex_;
  std::map<int, Subscription> subscriptions_;  // guarded by mutex_
  int next_id_ = 1;                             // guarded by mutex_
  std::map<std::string, int> counts_;           // guarded by mutex_
  int refused_ = 0;                             // guarded by mutex_
  std::vector<std::string> bodies_;             // guarded by mutex_; the latest kKeptBodies
};

}  // namespace evsim

#endif  // EVWATCH_SIM_MAKERS_ONVIF_EMU_H_
