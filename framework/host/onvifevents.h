// Client of a camera's standard event service: finds the service, keeps a pull-point
// subscription alive and pulls its notification messages as a long poll.
//
// One client belongs to one worker thread: Subscribe, Pull and Unsubscribe are called from
// it only. Interrupt() and ClearInterrupt() may be called from any thread: they end a Pull
// or a WaitInterruptible in progress at once (a detector's Stop uses it so that a stop never
// waits out a long poll). Unsubscribe is not interrupted, so a stopping detector still tells
// the camera to drop its subscription.
//
// Credentials go as a WS-Security UsernameToken with a password digest whose creation time
// follows the camera's own clock (read from the camera first), and answer an HTTP Basic or
// Digest challenge when the camera asks for one. Errors (LastError) never hold the password.
// Answers are bounded (kMaxAnswerBytes): a longer one is a failure, never a crash.

#ifndef EVWATCH_FRAMEWORK_HOST_ONVIFEVENTS_H_
#define EVWATCH_FRAMEWORK_HOST_ONVIFEVENTS_H_

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

struct OnvifSettings {
  std::string host;
  int port = 80;
  std::string user;
  std::string password;
  std::string device_path = "/onvif/device_service";
  std::string event_path;        // the event service's path; empty: ask the camera
  int pull_timeout = 10;         // seconds a PullMessages may wait for a message, >= 1
  int message_limit = 32;        // messages per PullMessages, >= 1
  int termination = 60;          // seconds a subscription lives unless renewed, >= 2
  int io_timeout = 10;           // seconds for connecting and for each answer beyond the poll
};

// One property change (or initial value) that the client understood.
struct OnvifEvent {
  enum class Topic { kCellMotion, kMotionAlarm, kDigitalInput };
  Topic topic;
  std::string source;   // the source token: video source (configuration) or input token
  bool state = false;
  bool initialized = false;  // PropertyOperation="Initialized": the state at subscription
};

class OnvifEventClient {
 public:
  static constexpr size_t kMaxAnswerBytes = 8u << 20;

  explicit OnvifEventClient(OnvifSettings settings);
  OnvifEventClient(const OnvifEventClient&) = delete;
  OnvifEventClient& operator=(const OnvifEventClient&) = delete;
  // Does not unsubscribe: the owner calls Unsubscribe when it stops.
  ~OnvifEventClient();

  // Reads the camera's clock, finds the event service and creates a pull-point
  // subscription. 0 on success; -1 on any failure (LastError says which step).
  int Subscribe();
  // One PullMessages (renewing the subscription first when it is due). Appends what came
  // to events. 0 on success (no message is a success after the time-out); -1 on a failure,
  // after which the subscription is dropped and Subscribe must be called again, or on an
  // Interrupt, which keeps the subscription (for Unsubscribe).
  int Pull(std::vector<OnvifEvent>& events);
  // Asks the camera to end the subscription (best effort) and forgets it.
  void Unsubscribe();
  bool Subscribed() const;

  // Waits up to millis, or until Interrupt(). False when interrupted.
  bool WaitInterruptible(int millis);
  void Interrupt();
  void ClearInterrupt();
  bool Interrupted() const;

  // The camera's clock minus ours, in seconds, from its last GetSystemDateAndTime.
  int64_t ClockOffset() const;
  // What the last failure was, for logs; empty after a success.
  std::string LastError() const;

 private:
  struct Impl;
  std::unique_ptr<Impl> impl_;
};

#endif  // EVWATCH_FRAMEWORK_HOST_ONVIFEVENTS_H_
