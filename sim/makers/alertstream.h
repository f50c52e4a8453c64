// The alert stream of HikVision cameras and of cameras that follow the PSIA event model: an
// endless multipart response whose parts are XML EventNotificationAlert records, in the
// record namespace of the maker.
//
// The camera repeats a cycle of records, one per period: four VMD (motion) records, four IO
// (alarm input) records, then a heartbeat-like videoloss record that is always inactive. A VMD
// record's activePostCount goes up by one with every VMD record sent while the camera sees
// motion and stays as it is otherwise (eventState active or inactive to match). The IO
// records name the active inputs in turn with eventState active, or, with no input active,
// inputs 1 to 4 with eventState inactive. Four records of a kind in a row means that a
// reader looking at every fourth record always sees one of each kind per cycle.
//
// Threads: called on server connection threads, several at once; it only reads the state.

#ifndef EVWATCH_SIM_MAKERS_ALERTSTREAM_H_
#define EVWATCH_SIM_MAKERS_ALERTSTREAM_H_

#include <chrono>
#include <string>

#include "sim/camstate.h"
#include "sim/net/httpserver.h"

namespace evsim {

struct AlertStreamStyle {
  std::string xml_namespace;  // the default namespace of every record
  std::string mac;            // the camera's MAC address as records give it
  std::chrono::milliseconds period{50};
};

// Serves the stream until the peer goes, the server stops or the camera falls silent (the
// stream then ends; the simulator holds later requests unanswered while it stays silent).
void ServeAlertStream(HttpConnection& connection, const CameraState& state,
                      const AlertStreamStyle& style);

}  // namespace evsim

#endif  // EVWATCH_SIM_MAKERS_ALERTSTREAM_H_
